// Following a refresh of users and groups to its end.

#ifndef VORN_APPLIANCE_TOOLS_VORNCTL_REFRESH_WATCH_H
#define VORN_APPLIANCE_TOOLS_VORNCTL_REFRESH_WATCH_H

#include <chrono>
#include <string>

#include "appliance/tools/vornctl/command.h"

namespace appliance::ctl {

class RefreshWatch {
public:
    // `task` is the id of the refresh; empty: one that somebody else started.
    RefreshWatch(Context& context, std::string task);

    // Shows the progress until the refresh ends, says how it ended, and returns the exit code. Throws Failure.
    int Follow();

private:
    enum class Wish { GoOn, Stop, Leave };

    // Asks the server. True when the refresh is over, with the last answer in `last_`.
    bool IsOver();
    bool TaskIsOver();
    bool OtherIsOver();
    void ShowProgress();
    Wish AskWish();
    int Stop();
    int Report();
    void PrintLists();

    Context& context_;
    std::string task_;
    Answer last_;
    Json::Value progress_;
    std::chrono::steady_clock::time_point silentSince_;
    bool silent_ = false;
};

}  // namespace appliance::ctl

#endif
