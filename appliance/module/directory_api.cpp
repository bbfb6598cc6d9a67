#include "appliance/module/directory_api.h"

#include <optional>
#include <string>
#include <system_error>

#include "appliance/base/text.h"
#include "appliance/domain/directory/directory_store.h"
#include "appliance/domain/membership/membership.h"

namespace appliance {
namespace {

constexpr std::int64_t kMostEntries = 1000;
constexpr std::int64_t kUsualEntries = 100;
constexpr std::int64_t kHighestOffset = std::int64_t{1} << 40;
constexpr std::size_t kLongestDomain = 64;
constexpr std::size_t kLongestSearch = 256;

std::string DomainOf(const Parameters& parameters) {
    if (const std::optional<std::string> named = parameters.Text("domain", kLongestDomain)) {
        if (!IsListDomain(*named)) {
            throw CallFailure(AnswerCode::BadParameter, "parameter domain is no NetBIOS name");
        }
        return Upper(*named);
    }
    Membership membership;
    if (const std::error_code error = ReadMembership(membership)) {
        throw CallFailure(AnswerCode::SystemError, "the membership can't be read: " + error.message());
    }
    if (!membership.DomainMode()) {
        throw CallFailure(AnswerCode::NotMember, "no domain is named, and this is no member of one");
    }
    return Upper(membership.domain);
}

Json::Value ShowEntry(const DirectoryEntry& entry) {
    Json::Value shown(Json::objectValue);
    shown["name"] = entry.name;
    shown["id"] = entry.id ? Json::Value(Json::Int64{*entry.id}) : Json::Value();
    shown["display"] = entry.display;
    return shown;
}

Json::Value Page(EntryKind kind, const Parameters& parameters) {
    const std::string domain = DomainOf(parameters);
    const std::int64_t offset = parameters.Integer("offset", 0, kHighestOffset, 0);
    const std::int64_t limit = parameters.Integer("limit", 1, kMostEntries, kUsualEntries);
    const std::string search = parameters.Text("search", kLongestSearch).value_or("");
    Json::Value answer(Json::objectValue);
    answer["domain"] = domain;
    answer["offset"] = Json::Int64{offset};
    answer["total"] = 0;
    answer["fetched"] = Json::Value();
    answer["entries"] = Json::Value(Json::arrayValue);
    if (const std::optional<EntryPage> page = ReadEntries(kind, domain, offset, limit, search)) {
        answer["total"] = Json::Int64{page->total};
        answer["fetched"] = Json::Int64{page->list.fetched};
        for (const DirectoryEntry& entry : page->entries) {
            answer["entries"].append(ShowEntry(entry));
        }
    }
    return answer;
}

}  // namespace

Json::Value Users(const Parameters& parameters) {
    return Page(EntryKind::User, parameters);
}

Json::Value Groups(const Parameters& parameters) {
    return Page(EntryKind::Group, parameters);
}

Json::Value Domains(const Parameters& /*parameters*/) {
    Json::Value answer(Json::objectValue);
    answer["domains"] = Json::Value(Json::arrayValue);
    for (const ListInfo& list : FindLists()) {
        Json::Value shown(Json::objectValue);
        shown["domain"] = list.domain;
        shown["kind"] = KindName(list.kind);
        shown["count"] = Json::Int64{list.count};
        shown["fetched"] = Json::Int64{list.fetched};
        answer["domains"].append(shown);
    }
    return answer;
}

}  // namespace appliance
