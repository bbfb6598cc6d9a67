// The data that the cheap platform answers from.

#include <strings.h>

#include <cctype>
#include <cstdint>
#include <functional>

#include "bench/cheap_platform.h"

namespace cheap {

namespace {

std::string Address(int first, int number) {
    return std::to_string(first) + "." + std::to_string(number / 65536 % 256) + "." +
           std::to_string(number / 256 % 256) + "." + std::to_string(number % 256);
}

std::string NicName(int number) {
    return "eth" + std::to_string(number);
}

// Texts are made first and pointed to after that, because a growing vector moves them.
void AddTexts(State& state, int count, const std::string& prefix) {
    for (int i = 0; i < count; ++i) {
        state.texts.push_back(prefix + std::to_string(i));
    }
}

void MakeLists(State& state) {
    const Sizes& sizes = state.sizes;
    for (int i = 0; i < sizes.dnsServers; ++i) {
        state.dnsTexts.push_back(Address(10, i));
    }
    AddTexts(state, sizes.domains, "DOMAIN");
    AddTexts(state, sizes.units, "Unit ");
    AddTexts(state, sizes.units, "ou=Unit ");
    AddTexts(state, sizes.keys, "some option ");
    std::string nics;
    for (int i = 0; i < sizes.nics; ++i) {
        nics += (i == 0 ? "" : ",") + NicName(i);
    }
    state.texts.push_back(nics);

    for (const std::string& server : state.dnsTexts) {
        state.dnsServers.push_back(server.c_str());
    }
    auto text = state.texts.cbegin();
    for (int i = 0; i < sizes.domains; ++i) {
        state.domains.push_back((text++)->c_str());
    }
    for (int i = 0; i < sizes.units; ++i) {
        state.units.push_back((text++)->c_str());
    }
    for (int i = 0; i < sizes.units; ++i) {
        state.unitValues.push_back((text++)->c_str());
    }
    for (int i = 0; i < sizes.keys; ++i) {
        state.section.emplace(*text++, "some value");
    }
    state.section.emplace("register nic", text->c_str());
    state.section.emplace("advanced_domain_option", "yes");
    state.section.emplace("server signing", "yes");
    state.section.emplace("winbind expand groups", "2");
}

void MakeTasks(State& state) {
    Json::Value ids(Json::arrayValue);
    for (int i = 0; i < state.sizes.tasks; ++i) {
        ids.append("DomainUpdate_" + std::to_string(i));
    }
    state.tasks = Json::Value(Json::objectValue);
    state.tasks["admin"] = std::move(ids);
    state.taskStatus = Json::Value(Json::objectValue);
    state.taskStatus["finish"] = true;
    state.taskStatus["success"] = true;
    state.taskStatus["data"]["status"] = "finish";
    Json::Value schedule;
    schedule["date_type"] = 0;
    schedule["week_name"] = "0,6";
    schedule["hour"] = 3;
    schedule["min"] = 30;
    state.schedule = Json::Value(Json::objectValue);
    state.schedule["schedule"] = schedule;
}

}  // namespace

std::size_t KeyHash::operator()(std::string_view key) const {
    std::uint64_t hash = 14695981039346656037U;
    for (const char letter : key) {
        // Folds the case of letters; that it also folds some other characters is the comparison's to tell apart.
        hash = (hash ^ (static_cast<unsigned char>(letter) | 0x20U)) * 1099511628211U;
    }
    return std::hash<std::uint64_t>()(hash);
}

bool KeyEqual::operator()(std::string_view left, std::string_view right) const {
    return left.size() == right.size() && strncasecmp(left.data(), right.data(), left.size()) == 0;
}

State& TheState() {
    static State state;
    return state;
}

void Configure(const Sizes& sizes, const Answers& answers) {
    State& state = TheState();
    state = State();
    state.sizes = sizes;
    state.answers = answers;
    MakeLists(state);
    MakeTasks(state);
}

Json::Value NicNames(int count) {
    Json::Value names(Json::arrayValue);
    for (int i = 0; i < count; ++i) {
        names.append(NicName(i));
    }
    return names;
}

std::string DnsText(int count) {
    std::string text;
    for (int i = 0; i < count; ++i) {
        text += (i == 0 ? "" : ",") + Address(11, i);
    }
    return text;
}

std::vector<const char*>& Trace() {
    static std::vector<const char*> names;
    return names;
}

}  // namespace cheap
