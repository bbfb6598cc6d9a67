// vornctl events

#include <memory>

#include "appliance/platform/system/event_text.h"
#include "appliance/tools/vornctl/command.h"

namespace appliance::ctl {

namespace {

constexpr int kPage = 50;
constexpr int kLargestPage = 1000;

struct EventOptions {
    int offset = 0;
    int limit = kPage;
};

std::string KindText(const Json::Value& kind) {
    return kind.isInt() ? EventKindName(kind.asInt()) : "-";
}

std::string LevelText(const Json::Value& level) {
    return level.isInt() ? EventLevelName(level.asInt()) : "-";
}

std::string CodeText(const Json::Value& code) {
    char text[32];
    std::snprintf(text, sizeof(text), "0x%08llx",
                  static_cast<unsigned long long>(code.isUInt64() ? code.asUInt64() : 0));
    return text;
}

int RunEvents(Context& context, const EventOptions& options) {
    Json::Value request;
    request["offset"] = options.offset;
    request["limit"] = options.limit;
    Answer answer;
    int exitCode = kDone;
    if (!CallAndReport(context, methods::Events(), request, answer, exitCode) || context.json) {
        return exitCode;
    }
    std::vector<std::vector<std::string>> rows;
    for (const Json::Value& event : ListOf(answer.data, "events")) {
        rows.push_back({TimeText(MemberOf(event, "time")), KindText(MemberOf(event, "kind")),
                        LevelText(MemberOf(event, "level")), CodeText(MemberOf(event, "code")), TextOf(event, "text")});
    }
    if (!rows.empty()) {
        context.out.Table({"TIME", "KIND", "LEVEL", "CODE", "EVENT"}, rows);
    }
    context.err.Line(std::to_string(rows.size()) + " of " + std::to_string(NumberOf(answer.data, "total")) +
                     " events.");
    return kDone;
}

}  // namespace

Runner SetUpEvents(Arguments arguments) {
    const auto options = std::make_shared<EventOptions>();
    arguments.Number("--offset", options->offset, "pass over so many, the newest first")
        .TypeName("N")
        .Between(0, 2147483647);
    arguments.Number("--limit", options->limit, "show so many at most, 1 to 1000; 50 without it")
        .TypeName("N")
        .Between(1, kLargestPage);
    arguments.Footer("What happened to the membership, newest first.");
    return [options](Context& context) { return RunEvents(context, *options); };
}

}  // namespace appliance::ctl
