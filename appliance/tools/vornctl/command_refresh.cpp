// vornctl refresh

#include <memory>

#include "appliance/tools/vornctl/refresh_watch.h"

namespace appliance::ctl {

namespace {

constexpr int kRefreshRunning = 2626;

struct RefreshOptions {
    std::string domain;
    bool noWait = false;
};

int StartRefresh(Context& context, const RefreshOptions& options) {
    Json::Value request(Json::objectValue);
    if (!options.domain.empty()) {
        request["domain_name"] = options.domain;
    }
    const Answer answer = context.client.Call(methods::UpdateStart(), request);
    const bool runsAlready = !answer.success && answer.code == kRefreshRunning;
    if (!answer.success && !runsAlready) {
        if (context.json) {
            PrintJson(context, answer);
            return kRefused;
        }
        return ReportRefusal(context, answer);
    }
    const std::string task = TextOf(answer.data, "task_id");
    if (answer.success && task.empty()) {
        throw Failure(kNoAnswer, "The refresh was started, but the answer names no task to follow.");
    }
    if (options.noWait) {
        if (context.json) {
            PrintJson(context, answer);
        } else if (runsAlready) {
            context.out.Line("A refresh is running already.");
        } else {
            context.out.Line("The refresh has been started; its task is " + Escape(task) + ".");
        }
        return kDone;
    }
    if (runsAlready && !context.json) {
        context.err.Line("A refresh is running already; following that one.");
    }
    RefreshWatch watch(context, task);
    return watch.Follow();
}

}  // namespace

Runner SetUpRefresh(Arguments arguments) {
    const auto options = std::make_shared<RefreshOptions>();
    arguments.Text("--domain", options->domain, "refresh this domain only (NetBIOS name); without it, all domains")
        .TypeName("NAME");
    arguments.Flag("--no-wait", options->noWait, "start the refresh and return at once");
    arguments.Footer(
        "Fetches the users and groups of the domains into the appliance's own lists.\n"
        "Ctrl-C asks whether to stop the refresh or to leave it running. Only one runs at\n"
        "a time: one that is running already is followed to its end.");
    return [options](Context& context) { return StartRefresh(context, *options); };
}

}  // namespace appliance::ctl
