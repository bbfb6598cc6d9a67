// vornctl steps

#include "appliance/tools/vornctl/steps.h"

namespace appliance::ctl {

namespace {

std::string ResultText(const Json::Value& record) {
    if (MemberOf(record, "finished").isNull()) {
        return "still running";
    }
    return FlagOf(record, "success") ? "done" : "failed";
}

int RunSteps(Context& context) {
    Answer answer;
    int exitCode = kDone;
    if (!CallAndReport(context, methods::JoinSteps(), Json::Value(Json::objectValue), answer, exitCode) ||
        context.json) {
        return exitCode;
    }
    const Json::Value& record = answer.data;
    Output& out = context.out;
    if (TextOf(record, "id").empty()) {
        context.err.Line("No join and no leave is recorded since the appliance was started.");
        return kDone;
    }
    const Json::Value& finished = MemberOf(record, "finished");
    std::vector<std::pair<std::string, std::string>> facts = {
        {"What", TextOf(record, "action") + " " + TextOf(record, "domain")},
        {"Started", TimeText(MemberOf(record, "started"))},
        {"Ended", finished.isNull() ? "-" : TimeText(finished)},
        {"Result", ResultText(record)}};
    if (const std::string message = TextOf(record, "message"); !message.empty()) {
        facts.emplace_back("Status", message);
    }
    for (const Json::Value& leftover : ListOf(record, "leftovers")) {
        if (leftover.isString()) {
            facts.emplace_back("Left behind", leftover.asString());
        }
    }
    out.Facts(facts);
    for (const Json::Value& step : ListOf(record, "steps")) {
        PrintStep(out, step);
    }
    return kDone;
}

}  // namespace

Runner SetUpSteps(Arguments arguments) {
    arguments.Footer(
        "Each step with the server that was asked, how it ended and how long it took.\n"
        "Useful after a join that failed, or to look at one that is running.");
    return RunSteps;
}

}  // namespace appliance::ctl
