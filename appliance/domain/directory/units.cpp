#include "appliance/domain/directory/units.h"

#include <json/reader.h>
#include <json/writer.h>

#include <algorithm>
#include <charconv>
#include <sstream>

#include "appliance/base/file.h"
#include "appliance/base/log.h"
#include "appliance/base/paths.h"
#include "appliance/base/text.h"
#include "appliance/domain/directory/fetch_source.h"
#include "appliance/domain/directory/utf8.h"
#include "appliance/domain/directory/worker.h"
#include "appliance/domain/membership/samba.h"

namespace appliance {

namespace {

constexpr std::size_t kLongestList = std::size_t{32} << 20;
constexpr mode_t kFolderMode = 0700;
constexpr mode_t kMode = 0600;
constexpr std::chrono::milliseconds kAnswerTime{10000};
constexpr Patience kPatience{std::chrono::seconds(20), std::chrono::seconds(60)};
constexpr char kAttribute[] = "distinguishedName: ";

void Save(const Membership& membership, const std::vector<Unit>& units) {
    Json::Value value;
    value["domain"] = membership.domain;
    value["units"] = Json::Value(Json::arrayValue);
    for (const Unit& unit : units) {
        Json::Value item;
        item["name"] = unit.name;
        item["dn"] = unit.distinguishedName;
        value["units"].append(item);
    }
    Json::StreamWriterBuilder form;
    form["indentation"] = "";
    std::error_code error = MakeFolder(Path(kState), kFolderMode);
    if (!error) {
        error = ReplaceFile(Path(kUnitList), Json::writeString(form, value) + "\n", kMode);
    }
    if (error) {
        Log(LOG_ERR, "cannot write " + Path(kUnitList) + ": " + error.message());
    }
}

// The units at these places in the order of their names, those left out whose names can't be shown.
std::vector<Unit> UnitsAt(const std::vector<std::string>& places) {
    std::vector<Unit> units;
    for (const std::string& place : places) {
        const std::optional<std::string> name = NameOfUnit(place);
        if (name && !HasControlBytes(place)) {
            units.push_back({*name, place});
        }
    }
    if (units.size() < places.size()) {
        Log(LOG_WARNING, std::to_string(places.size() - units.size()) +
                             " organisational units have names that can't be shown and are left out");
    }
    std::sort(units.begin(), units.end(), [](const Unit& first, const Unit& second) {
        const std::string one = FoldCase(first.name);
        const std::string other = FoldCase(second.name);
        return one != other ? one < other : first.distinguishedName < second.distinguishedName;
    });
    return units;
}

int HexDigit(char letter) {
    const char* digits = "0123456789abcdef";
    const char small = letter >= 'A' && letter <= 'F' ? static_cast<char>(letter - 'A' + 'a') : letter;
    const char* place = small == '\0' ? nullptr : std::find(digits, digits + 16, small);
    return place == nullptr || place == digits + 16 ? -1 : static_cast<int>(place - digits);
}

}  // namespace

std::optional<std::vector<Unit>> RefreshUnits(const Membership& membership, std::chrono::milliseconds deadline) {
    std::vector<Unit> units;
    if (membership.kind == DomainKind::ActiveDirectory) {
        SambaCall call;
        call.arguments = {"ads", "search", "-P", "(objectClass=organizationalUnit)", "distinguishedName"};
        call.deadline = deadline;
        Command command = SambaCommand(kNet, call);
        command.outputLimit = kLongestList;
        const CommandResult result = Run(command);
        std::optional<std::vector<Unit>> found;
        if (result.Succeeded()) {
            found = ParseUnits(result.output);
        }
        if (!found) {
            Log(LOG_WARNING, "the organisational units of " + membership.domain + " can't be listed: net ads search " +
                                 (result.Succeeded() ? "gave a damaged list" : result.Describe()));
            return std::nullopt;
        }
        units = std::move(*found);
    }
    Save(membership, units);
    return units;
}

std::optional<std::vector<Unit>> FetchUnits(const Membership& membership) {
    std::vector<Unit> units;
    if (membership.kind == DomainKind::ActiveDirectory) {
        try {
            const Json::Value found = RunWorker(kPatience, [&membership](ProgressReport& report) {
                FetchDomain domain;
                domain.name = membership.domain;
                domain.dns = Lower(membership.realm);
                domain.own = true;
                std::string controller;
                const std::unique_ptr<LdapSession> session =
                    OpenSession(domain, membership, kAnswerTime, report, controller);
                Json::Value places(Json::arrayValue);
                session->Search(
                    {BaseOfDomain(domain.dns), true, "(objectClass=organizationalUnit)", {"distinguishedName"}},
                    [&](const LdapEntry& entry) {
                        places.append(entry.First("distinguishedName"));
                        report.Tell(places.size());
                    });
                return places;
            });
            std::vector<std::string> places;
            for (const Json::Value& place : found) {
                places.push_back(place.asString());
            }
            units = UnitsAt(places);
        } catch (const DirectoryError& error) {
            Log(LOG_ERR, "the organisational units of " + membership.domain + " can't be listed: " + error.what());
            return std::nullopt;
        }
    }
    Save(membership, units);
    return units;
}

std::optional<std::vector<Unit>> LoadUnits(const Membership& membership) {
    if (membership.kind != DomainKind::ActiveDirectory) {
        return std::vector<Unit>();
    }
    std::string text;
    if (ReadFile(Path(kUnitList), text, kLongestList)) {
        return std::nullopt;
    }
    Json::Value value;
    Json::CharReaderBuilder form;
    std::istringstream stream(text);
    if (!Json::parseFromStream(form, stream, &value, nullptr) || !value.isObject() || !value["domain"].isString() ||
        !EqualIgnoringCase(value["domain"].asString(), membership.domain) || !value["units"].isArray()) {
        return std::nullopt;
    }
    std::vector<Unit> units;
    for (const Json::Value& item : value["units"]) {
        if (item.isObject() && item["name"].isString() && item["dn"].isString()) {
            units.push_back({item["name"].asString(), item["dn"].asString()});
        }
    }
    return units;
}

// Got 2 replies
//
// distinguishedName: OU=Sales,DC=lab,DC=test
//
// distinguishedName: OU=Domain Controllers,DC=lab,DC=test
std::optional<std::vector<Unit>> ParseUnits(const std::string& text) {
    const std::vector<std::string> lines = Lines(text);
    std::size_t announced = 0;
    bool counted = false;
    std::vector<std::string> places;
    for (const std::string& line : lines) {
        if (!counted && StartsWith(line, "Got ")) {
            const char* begin = line.data() + 4;
            counted = std::from_chars(begin, line.data() + line.size(), announced).ec == std::errc();
        } else if (StartsWith(line, kAttribute)) {
            places.push_back(line.substr(sizeof(kAttribute) - 1));
        }
    }
    if (!counted || places.size() != announced) {
        return std::nullopt;
    }
    return UnitsAt(places);
}

std::optional<std::string> NameOfUnit(const std::string& distinguishedName) {
    const std::size_t equals = distinguishedName.find('=');
    if (equals == std::string::npos || !EqualIgnoringCase(distinguishedName.substr(0, equals), "OU")) {
        return std::nullopt;
    }
    std::string name;
    for (std::size_t place = equals + 1; place < distinguishedName.size(); ++place) {
        const char letter = distinguishedName[place];
        if (letter == ',') {
            break;
        }
        if (letter != '\\') {
            name += letter;
            continue;
        }
        if (place + 1 >= distinguishedName.size()) {
            return std::nullopt;
        }
        const int high = HexDigit(distinguishedName[place + 1]);
        const int low = place + 2 < distinguishedName.size() ? HexDigit(distinguishedName[place + 2]) : -1;
        if (high >= 0 && low >= 0) {
            name += static_cast<char>(high * 16 + low);
            place += 2;
        } else {
            name += distinguishedName[place + 1];
            place += 1;
        }
    }
    if (!IsListableName(name)) {
        return std::nullopt;
    }
    return name;
}

}  // namespace appliance
