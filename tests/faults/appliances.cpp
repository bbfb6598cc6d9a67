#include "tests/faults/appliances.h"

#include <json/reader.h>

#include <sstream>
#include <stdexcept>

#include "tests/double/appliance.h"

namespace sweep {

Json::Value FromJson(const std::string& text) {
    std::istringstream stream(text);
    Json::Value value;
    std::string errors;
    if (!Json::parseFromStream(Json::CharReaderBuilder(), stream, &value, &errors)) {
        throw std::invalid_argument(errors);
    }
    return value;
}

fake::State Workgroup() {
    fake::State state;
    state.dnsServers = {"10.0.0.1", "10.0.0.2"};
    state.trustSetting = 1;
    state.files = {kJoinStatus};
    state.joinStatus = fake::JoinStatus{"kdc", "Invalid KDC ip."};
    state.onJoin = [](const _tag_VORN_WIN2_&) { fake::TheAppliance().state.files.insert(kJoinStatus); };
    Global(state, kSmbConf) = {{"workgroup", "WORKGROUP"}};
    Global(state, kSmbInfo) = {{"server signing", "yes"}};
    Global(state, kSettings) = {{"timezone", "UTC"}};
    return state;
}

fake::State Member() {
    fake::State state = Workgroup();
    state.domainName = "LAB";
    state.workgroup = "LAB";
    state.ownDomain = "LAB";
    state.firstFlag = 1;
    state.secondFlag = 1;
    state.joinedFlag = 1;
    state.adsJoined = 1;
    state.domains = {"LAB", "EAST", "WEST"};
    state.fqdns = {{"LAB", "lab.test"}, {"EAST", "east.test"}, {"WEST", "west.test"}};
    state.unitNames = {"Sales", "Staff"};
    state.unitValues = {"ou=sales", "ou=staff"};
    Global(state, kSmbConf) = {
        {"security", "ads"}, {"password server", "10.0.0.5"}, {"workgroup", "LAB"}, {"realm", "LAB.TEST"}};
    Global(state, kSmbInfo) = {
        {"server signing", "yes"}, {"advanced_domain_option", "yes"}, {"register nic", "eth0,eth1"}};
    Global(state, kSettings) = {{"timezone", "UTC"}, {"domain_dns", "10.0.0.1"}};
    return state;
}

std::string Quoted(const std::string& text) {
    return "\"" + text + "\"";
}

fake::Section& Global(fake::State& state, const std::string& path) {
    return state.keyValueFiles[path]["global"];
}

const std::string* FindGlobal(const fake::State& state, const std::string& path, const std::string& key) {
    const auto file = state.keyValueFiles.find(path);
    if (file == state.keyValueFiles.end()) {
        return nullptr;
    }
    const auto section = file->second.find("global");
    return section == file->second.end() ? nullptr : fake::FindKey(section->second, key);
}

}  // namespace sweep
