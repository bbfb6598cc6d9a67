#include "fuzz/answers.h"

#include "fuzz/request.h"

namespace fuzz {

namespace {

const std::vector<std::string> kAddresses = {"10.0.0.1", "10.0.0.2", "fe80::1", ""};
const std::vector<std::string> kDomains = {"LAB", "lab.test", "OTHER", "WORKGROUP", ""};
const std::vector<std::string> kYesNo = {"yes", "no", "YES", "", "yes "};
const std::vector<std::string> kValues = {"yes", "no", "ads", "domain", "ADS", "*", "", "eth0,eth1", "eth0,", "150"};
const std::vector<std::string> kKeys = {"security",
                                        "password server",
                                        "workgroup",
                                        "realm",
                                        "vorn sync dctime",
                                        "advanced_domain_option",
                                        "register nic",
                                        "server signing",
                                        "enable nt4 enum",
                                        "disable domain admins",
                                        "winbind expand groups",
                                        "other"};
const std::vector<std::string> kCommands = {"/usr/vorn/sbin/vornwin -updateDomain", "/bin/true",
                                            "/usr/vorn/sbin/vornwin -updateDomain ", ""};
const std::vector<std::string> kJoinMessages = {
    "Error System.",
    "Invalid KDC ip.",
    "Invalid workgroup name.",
    "Neither LDAP server nor PDC can be found.",
    "Wbinfo fail. It might be domain name error.",
    "Client not found in Kerberos database while getting initial credentials",
    "Unable to join domain LAB",
    "Could not connect to server DC1",
    "something else",
    "",
};

fake::Section DecodeSection(Input& input) {
    fake::Section section(input.BackByte() % 6U);
    for (auto& [key, value] : section) {
        key = input.BackText(kKeys);
        value = input.BackText(kValues, 250);
    }
    return section;
}

void DecodeMembership(Input& input, fake::State& state) {
    if (input.BackBool()) {
        state.capabilities["supportdomain"] = input.BackText(kYesNo);
    }
    state.settings["enableduserhome"] = input.BackText(kYesNo);
    state.supports["supporttrustdomain"] = input.BackBool() ? 0 : 1;
    state.domainName = input.BackText(kDomains);
    state.workgroup = input.BackText(kDomains);
    state.ownDomain = input.BackText(kDomains);
    state.firstFlag = input.BackInt();
    state.secondFlag = input.BackInt();
    state.joinedFlag = input.BackInt();
    state.adsJoined = input.BackInt();
    state.testJoinResult = input.BackInt();
    state.trustSetting = input.BackInt();
    state.ldapBound = input.BackInt();
    state.joinResult = input.BackInt();
    if (input.BackBool()) {
        state.joinStatus = fake::JoinStatus{input.BackText({"status"}, 23), input.BackText(kJoinMessages, 250)};
    }
    state.systemResult = input.BackInt();
}

void DecodeLists(Input& input, fake::State& state) {
    state.domains = input.BackTexts(kDomains);
    state.unitNames = input.BackTexts(kDomains);
    state.unitValues = input.BackTexts(kDomains);
    state.dnsServers = input.BackTexts(kAddresses);
    for (const auto& domain : state.domains) {
        if (domain && input.BackBool()) {
            state.fqdns[*domain] = input.BackText(kDomains);
        }
    }
    if (input.BackBool()) {
        state.enabledServices.insert("webdav-httpd-pure");
    }
}

void DecodeFiles(Input& input, fake::State& state) {
    state.keyValueFiles["/usr/vorn/etc/smb.conf"]["global"] = DecodeSection(input);
    if (input.BackBool()) {
        state.keyValueFiles["/usr/vorn/etc/smbinfo.conf"]["global"] = DecodeSection(input);
    }
    state.keyValueFiles["/etc/vorninfo.conf"][""] = {{"domain_dns", "10.0.0.1"}};
    for (const char* path : {"/var/log/winlock.state", "/usr/vorn/etc/smbinfo.conf.tmp", "/tmp/domain_updating"}) {
        if (input.BackBool()) {
            state.files.insert(path);
        }
    }
    for (const char* path : {"/tmp/domain_user.pid", "/tmp/domain_group.pid"}) {
        if (input.BackBool()) {
            state.pidFiles[path] = input.BackInt();
        }
    }
}

void DecodeTasks(Input& input, fake::State& state) {
    for (int left = input.BackByte() % 4; left > 0; --left) {
        fake::BackgroundTask task;
        task.id = "DomainUpdate" + std::to_string(left);
        task.group = input.BackText({"admin", "users"});
        task.prefix = "DomainUpdate";
        task.record = input.BackBool() ? Json::Value(Json::objectValue) : DecodeValue(input, 3);
        if (task.record.isObject()) {
            task.record["finish"] = input.BackBool();
            task.record["success"] = input.BackBool();
            task.record["error"]["code"] = input.BackInt();
            task.record["data"]["status"] = input.BackText({"updating", "finish"});
        }
        state.tasks.push_back(task);
    }
    if (input.BackBool()) {
        state.taskList = DecodeValue(input, 3);
    }
    state.pollingError = input.BackInt();
    for (int left = input.BackByte() % 4; left > 0; --left) {
        fake::ScheduledTask task;
        task.id = input.BackInt();
        task.command = input.BackText(kCommands);
        task.schedule["date_type"] = input.BackInt();
        state.scheduledTasks.push_back(task);
    }
    state.taskScheduleConvertible = !input.BackBool();
}

// The values are those that the calls can fail by, and any number as a result.
void DecodeFaults(Input& input, fake::Appliance& appliance) {
    for (int left = input.BackByte() % 6; left > 0; --left) {
        const std::size_t index = input.BackByte();
        const bool sticky = input.BackBool();
        switch (input.BackByte() % 4U) {
            case 0:
                appliance.FailCallAt(index, fake::Fault::Result(input.BackInt()), sticky);
                break;
            case 1:
                appliance.FailCallAt(index, fake::Fault::Null(), sticky);
                break;
            case 2:
                appliance.FailCallAt(index, fake::Fault::False(), sticky);
                break;
            default:
                appliance.FailCallAt(index, fake::Fault::Throw(), sticky);
                break;
        }
    }
}

}  // namespace

void DecodeAnswers(Input& input, fake::Appliance& appliance) {
    DecodeFaults(input, appliance);
    DecodeMembership(input, appliance.state);
    DecodeLists(input, appliance.state);
    DecodeFiles(input, appliance.state);
    DecodeTasks(input, appliance.state);
    appliance.state.sectionLoaderReplacesHash = !input.BackBool();
    appliance.state.listGrowthReplacesList = !input.BackBool();
    appliance.state.hashGrowthReplacesHash = !input.BackBool();
}

}  // namespace fuzz
