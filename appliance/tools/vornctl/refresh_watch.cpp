#include "appliance/tools/vornctl/refresh_watch.h"

#include <ctime>
#include <thread>

#include "appliance/tools/vornctl/interrupt.h"
#include "appliance/tools/vornctl/terminal.h"

namespace appliance::ctl {

namespace {

using Clock = std::chrono::steady_clock;

constexpr std::chrono::milliseconds kPause{500};  // between two looks
constexpr std::chrono::milliseconds kNap{50};     // how soon Ctrl-C is noticed
constexpr std::chrono::seconds kPatience{30};     // with a server that is being restarted
constexpr Json::Int64 kQuiet = 45;                // seconds without progress after which a fetch is given up
constexpr Json::Int64 kSettled = 2;               // seconds after which the end of one is not the beginning of the next

// Sleeps until the pause is over or a signal comes.
void Pause() {
    const Clock::time_point end = Clock::now() + kPause;
    while (Clock::now() < end && !Interrupted()) {
        std::this_thread::sleep_for(kNap);
    }
}

}  // namespace

RefreshWatch::RefreshWatch(Context& context, std::string task) : context_(context), task_(std::move(task)) {}

int RefreshWatch::Follow() {
    while (true) {
        bool over = false;
        try {
            over = IsOver();
            if (!over) {
                ShowProgress();
                Pause();
            }
        } catch (const Failure& failure) {
            if (failure.code() != kInterrupted) {
                throw;
            }
        }
        if (over) {
            return Report();
        }
        if (!Interrupted()) {
            continue;
        }
        ForgetInterrupts();
        context_.out.Transient("");
        switch (AskWish()) {
            case Wish::GoOn:
                break;
            case Wish::Stop:
                return Stop();
            case Wish::Leave:
                throw Failure(kInterrupted,
                              "The refresh goes on in the appliance; \"vornctl refresh\" follows it again.");
        }
    }
}

bool RefreshWatch::IsOver() {
    try {
        const bool over = task_.empty() ? OtherIsOver() : TaskIsOver();
        silent_ = false;
        return over;
    } catch (const Failure& failure) {
        // The refresh is a process of its own: it outlives a restart of the server.
        if (failure.code() != kNoAnswer) {
            throw;
        }
        if (!silent_) {
            silent_ = true;
            silentSince_ = Clock::now();
        }
        if (Clock::now() - silentSince_ > kPatience) {
            throw;
        }
        return false;
    }
}

bool RefreshWatch::TaskIsOver() {
    Json::Value request;
    request["task_id"] = task_;
    last_ = context_.client.Call(methods::UpdateStatus(), request);
    return !last_.success || TextOf(last_.data, "status") == "finish";
}

bool RefreshWatch::OtherIsOver() {
    last_ = context_.client.Call(methods::RefreshProgress());
    const Json::Value& data = last_.data;
    if (!last_.success || MemberOf(data, "running").isBool()) {
        return !FlagOf(data, "running");
    }
    // Groups come last.
    const bool complete =
        TextOf(data, "kind") == "group" && NumberOf(data, "domains_done") >= NumberOf(data, "domains");
    const Json::Int64 age = std::time(nullptr) - NumberOf(data, "updated");
    return age > kQuiet || (complete && age > kSettled);
}

void RefreshWatch::ShowProgress() {
    if (context_.json || !context_.out.isTerminal()) {
        return;
    }
    if (!context_.client.TryCall(methods::RefreshProgress(), Json::Value(Json::objectValue), progress_) ||
        TextOf(progress_, "kind").empty()) {
        context_.out.Transient("Refreshing ...");
        return;
    }
    const Json::Int64 domains = NumberOf(progress_, "domains");
    std::string line = "Refreshing: " + std::to_string(NumberOf(progress_, "count")) +
                       (TextOf(progress_, "kind") == "group" ? " groups of " : " users of ") +
                       Escape(TextOf(progress_, "domain"));
    if (domains > 1) {
        line += ", domain " + std::to_string(std::min(NumberOf(progress_, "domains_done") + 1, domains)) + " of " +
                std::to_string(domains);
    }
    if (const Json::Int64 started = NumberOf(progress_, "started"); started > 0) {
        line += ", " + std::to_string(std::max<Json::Int64>(0, std::time(nullptr) - started)) + " s";
    }
    context_.out.Transient(line);
}

RefreshWatch::Wish RefreshWatch::AskWish() {
    if (MustEnd() || !CanAsk()) {
        return Wish::Leave;
    }
    try {
        while (true) {
            const std::string answer =
                Ask("Stop the refresh? [s = stop it, l = leave it running, w = go on watching] ");
            if (answer == "s" || answer == "stop" || answer == "y" || answer == "yes") {
                return Wish::Stop;
            }
            if (answer == "l" || answer == "leave" || answer == "n" || answer == "no") {
                return Wish::Leave;
            }
            if (answer == "w" || answer == "watch" || answer.empty()) {
                return Wish::GoOn;
            }
        }
    } catch (const Failure&) {
        return Wish::Leave;  // a second Ctrl-C
    }
}

int RefreshWatch::Stop() {
    const Answer answer = context_.client.Call(methods::UpdateStop());
    if (!answer.success) {
        return ReportRefusal(context_, answer);
    }
    throw Failure(kInterrupted, "The refresh has been stopped. The lists are as they were before.");
}

int RefreshWatch::Report() {
    context_.out.Transient("");
    if (context_.json) {
        PrintJson(context_, last_);
        return last_.success ? kDone : kRefused;
    }
    std::vector<std::pair<std::string, std::string>> details;
    Json::Value progress;
    if (context_.client.TryCall(methods::RefreshProgress(), Json::Value(Json::objectValue), progress)) {
        for (const Json::Value& error : ListOf(progress, "errors")) {
            const std::string kind = TextOf(error, "kind") == "group" ? "groups" : "users";
            details.emplace_back("Failed", kind + " of " + TextOf(error, "domain") + ": " + TextOf(error, "reason"));
        }
    }
    if (!last_.success) {
        return ReportRefusal(context_, last_, details);
    }
    if (task_.empty()) {
        context_.out.Line("The refresh has ended.");
        for (const auto& [name, text] : details) {
            context_.err.Paragraph("  " + name + ":", 11, Escape(text));
        }
    } else {
        context_.out.Line(context_.out.Coloured(Colour::Good, "The refresh is done."));
    }
    PrintLists();
    return task_.empty() && !details.empty() ? kRefused : kDone;
}

void RefreshWatch::PrintLists() {
    Json::Value data;
    if (!context_.client.TryCall(methods::Domains(), Json::Value(Json::objectValue), data)) {
        return;
    }
    std::vector<std::vector<std::string>> rows;
    for (const Json::Value& list : ListOf(data, "domains")) {
        rows.push_back({TextOf(list, "domain"), TextOf(list, "kind") == "group" ? "groups" : "users",
                        std::to_string(NumberOf(list, "count")), TimeText(MemberOf(list, "fetched"))});
    }
    if (!rows.empty()) {
        context_.out.Table({"DOMAIN", "LIST", ">ENTRIES", "FETCHED"}, rows);
    }
}

}  // namespace appliance::ctl
