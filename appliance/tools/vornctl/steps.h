// The steps of a join or a leave, as the appliance records them.

#ifndef VORN_APPLIANCE_TOOLS_VORNCTL_STEPS_H
#define VORN_APPLIANCE_TOOLS_VORNCTL_STEPS_H

#include "appliance/tools/vornctl/command.h"

namespace appliance::ctl {

// Prints one step that is over.
void PrintStep(Output& out, const Json::Value& step);

// Runs "set" or "leave" and shows its steps while they happen. Made before the call begins.
class LiveSteps {
public:
    // With --json nothing is shown, and the record is read at the end, once, if `alsoForJson` asks for it.
    explicit LiveSteps(Context& context, bool alsoForJson = false);

    // Starts the call, shows the steps, and returns the answer. Throws Failure; after Ctrl-C the appliance goes on.
    Answer Run(const Method& method, const Json::Value& parameters, const Secret* password);

    // What is recorded of this call: null when the appliance did not record any step of it.
    const Json::Value& record() const {
        return record_;
    }

    // What a failure's report should add: the step that failed, the server, the words of the tool, what is left behind.
    std::vector<std::pair<std::string, std::string>> Details() const;

private:
    // Reads the record and, without --json, prints what is new.
    void Show();

    Context& context_;
    bool available_ = false;
    std::string oldId_;
    Json::Value record_;
    Json::ArrayIndex shown_ = 0;
};

}  // namespace appliance::ctl

#endif
