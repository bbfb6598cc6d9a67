#include "appliance/module/event_api.h"

#include "appliance/platform/system/event_log.h"

namespace appliance {
namespace {

constexpr std::int64_t kMostShown = 1000;
constexpr std::int64_t kUsuallyShown = 100;

}  // namespace

Json::Value Events(const Parameters& parameters) {
    const std::int64_t offset = parameters.Integer("offset", 0, kMostEvents, 0);
    const std::int64_t limit = parameters.Integer("limit", 1, kMostShown, kUsuallyShown);
    const EventPage page = ReadEvents(offset, limit);
    Json::Value answer(Json::objectValue);
    answer["total"] = Json::Int64{page.total};
    answer["events"] = Json::Value(Json::arrayValue);
    for (const Event& event : page.events) {
        Json::Value shown(Json::objectValue);
        shown["time"] = Json::Int64{event.time};
        shown["kind"] = event.kind;
        shown["level"] = event.level;
        shown["code"] = event.code;
        shown["text"] = event.text;
        answer["events"].append(shown);
    }
    return answer;
}

}  // namespace appliance
