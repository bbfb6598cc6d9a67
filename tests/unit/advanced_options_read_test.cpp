// The advanced domain options, read from the two files of the file-sharing service.

#include <string>
#include <vector>

#include "src/domain.h"
#include "tests/unit/handler_step.h"

namespace {

using ::testing::ElementsAre;
using ::testing::IsEmpty;
using unit::FromJson;
using unit::kSmbConfPath;
using unit::kSmbInfoPath;
using unit::Logs;

constexpr const char* kDefaults =
    R"({"enable_advance_option": false, "kdc": "", "netbios_name": "", "fqdn_name": "", "register_nics": []})";
constexpr const char* kNothingStored =
    R"({"enable_advance_option": false, "kdc": "", "netbios_name": "", "fqdn_name": "", "register_nics": ["all"]})";

class AdvancedOptionsRead : public unit::ModuleTest {
protected:
    // Loads the options and expects that it worked.
    Json::Value Load() {
        Json::Value data;
        Step step;
        EXPECT_TRUE(step.handler.LoadDomainAdvData(data));
        EXPECT_EQ(step.handler.error, 2600);
        return data;
    }

    void StoreAll() {
        state.keyValueFiles[kSmbInfoPath]["global"] = {{"advanced_domain_option", "yes"},
                                                       {"register nic", "eth0,eth1"}};
        state.keyValueFiles[kSmbConfPath]["global"] = {
            {"password server", "10.0.0.1"}, {"workgroup", "LAB"}, {"realm", "lab.test"}};
    }

    using Step = unit::Step<DomainServiceHandler>;
};

TEST_F(AdvancedOptionsRead, DefaultsAreTextsWithoutContentAndNoInterfaces) {
    Json::Value data;
    Step().handler.InitDomainAdvData(data);
    EXPECT_EQ(data, FromJson(kDefaults));
    EXPECT_THAT(appliance.CallTexts(), IsEmpty());
}

TEST_F(AdvancedOptionsRead, DefaultsReplaceTheFiveMembersOnly) {
    Json::Value data = FromJson(R"({"enable_advance_option": true, "kdc": "a", "netbios_name": "b", "fqdn_name": "c",
                                    "register_nics": ["d"], "other": 1})");
    Json::Value expected = FromJson(kDefaults);
    expected["other"] = 1;
    Step().handler.InitDomainAdvData(data);
    EXPECT_EQ(data, expected);
}

TEST_F(AdvancedOptionsRead, ComeFromBothFiles) {
    StoreAll();
    EXPECT_EQ(Load(), FromJson(R"({"enable_advance_option": true, "kdc": "10.0.0.1", "netbios_name": "LAB",
                                   "fqdn_name": "lab.test", "register_nics": ["eth0", "eth1"]})"));
    EXPECT_THAT(appliance.Logs(), IsEmpty());
}

TEST_F(AdvancedOptionsRead, AskThePlatformInThisOrder) {
    StoreAll();
    Load();
    EXPECT_THAT(
        appliance.CallTexts(),
        ElementsAre("VLIBCSzHashAlloc(1024)", R"(VLIBCFileGetSection("/usr/vorn/etc/smbinfo.conf", "global", hash))",
                    R"(VLIBCSzHashGetValue(hash, "advanced_domain_option"))",
                    R"(VLIBCFileGetKeyValue("/usr/vorn/etc/smb.conf", "password server", size 128, 0))",
                    R"(VLIBCFileGetKeyValue("/usr/vorn/etc/smb.conf", "workgroup", size 128, 0))",
                    R"(VLIBCFileGetKeyValue("/usr/vorn/etc/smb.conf", "realm", size 128, 0))",
                    R"(VLIBCSzHashGetValue(hash, "register nic"))", "VLIBCSzHashFree(hash)"));
}

TEST_F(AdvancedOptionsRead, AreOffOnAllInterfacesWithoutTheFiles) {
    EXPECT_EQ(Load(), FromJson(kNothingStored));
    EXPECT_THAT(appliance.Logs(), IsEmpty());
}

TEST_F(AdvancedOptionsRead, AreTheSameFromAHashThatStaysWhereItIs) {
    StoreAll();
    const Json::Value replaced = Load();
    state.sectionLoaderReplacesHash = false;
    EXPECT_EQ(Load(), replaced);
}

TEST_F(AdvancedOptionsRead, ReplaceWhatTheCallerHad) {
    Json::Value data = FromJson(R"({"enable_advance_option": true, "kdc": "a", "netbios_name": "b", "fqdn_name": "c",
                                    "register_nics": ["d"]})");
    EXPECT_TRUE(Step().handler.LoadDomainAdvData(data));
    EXPECT_EQ(data, FromJson(kNothingStored));
}

TEST_F(AdvancedOptionsRead, AreSwitchedOnByExactlyYes) {
    for (const std::string& text : unit::NearlyYes()) {
        state.keyValueFiles[kSmbInfoPath]["global"] = {{"advanced_domain_option", text}};
        EXPECT_EQ(Load()["enable_advance_option"], false) << text;
    }
    state.keyValueFiles[kSmbInfoPath]["global"] = {{"advanced_domain_option", "yes"}};
    EXPECT_EQ(Load()["enable_advance_option"], true);
}

TEST_F(AdvancedOptionsRead, TakeTheSwitchFromItsSectionAndFileOnly) {
    state.keyValueFiles[kSmbInfoPath]["other"] = {{"advanced_domain_option", "yes"}, {"register nic", "eth0"}};
    state.keyValueFiles[kSmbConfPath]["global"] = {{"advanced_domain_option", "yes"}, {"register nic", "eth0"}};
    EXPECT_EQ(Load(), FromJson(kNothingStored));
}

TEST_F(AdvancedOptionsRead, TakeTextsOfOneCharacter) {
    state.keyValueFiles[kSmbConfPath]["global"] = {{"password server", "a"}, {"workgroup", "b"}, {"realm", "c"}};
    const Json::Value data = Load();
    EXPECT_EQ(data["kdc"], "a");
    EXPECT_EQ(data["netbios_name"], "b");
    EXPECT_EQ(data["fqdn_name"], "c");
}

TEST_F(AdvancedOptionsRead, HaveAnEmptyTextForAnEmptyKey) {
    state.keyValueFiles[kSmbConfPath]["global"] = {{"password server", ""}, {"workgroup", ""}, {"realm", ""}};
    EXPECT_EQ(Load(), FromJson(kNothingStored));
}

TEST_F(AdvancedOptionsRead, HaveAnEmptyTextForTheKeyThatCannotBeRead) {
    const std::vector<std::string> members = {"kdc", "netbios_name", "fqdn_name"};
    for (std::size_t failing = 0; failing < members.size(); ++failing) {
        for (const int result : {-1, 0}) {
            SCOPED_TRACE(members[failing] + " " + std::to_string(result));
            Restart();
            StoreAll();
            appliance.FailNth("VLIBCFileGetKeyValue", static_cast<int>(failing) + 1, fake::Fault::Result(result));
            const Json::Value data = Load();
            EXPECT_EQ(data["kdc"], failing == 0 ? "" : "10.0.0.1");
            EXPECT_EQ(data["netbios_name"], failing == 1 ? "" : "LAB");
            EXPECT_EQ(data["fqdn_name"], failing == 2 ? "" : "lab.test");
            EXPECT_THAT(appliance.Logs(), IsEmpty());
        }
    }
}

TEST_F(AdvancedOptionsRead, CutTextsAt127Characters) {
    for (const std::size_t length : {126U, 127U, 128U, 300U}) {
        const std::string kdc(length, 'k');
        const std::string workgroup(length, 'w');
        const std::string realm(length, 'r');
        state.keyValueFiles[kSmbConfPath]["global"] = {
            {"password server", kdc}, {"workgroup", workgroup}, {"realm", realm}};
        const Json::Value data = Load();
        EXPECT_EQ(data["kdc"].asString(), kdc.substr(0, 127));
        EXPECT_EQ(data["netbios_name"].asString(), workgroup.substr(0, 127));
        EXPECT_EQ(data["fqdn_name"].asString(), realm.substr(0, 127));
    }
}

TEST_F(AdvancedOptionsRead, TakeARealmOfAStarForNone) {
    state.keyValueFiles[kSmbConfPath]["global"] = {{"realm", "*"}};
    EXPECT_EQ(Load()["fqdn_name"], "");
    for (const char* realm : {"**", " *", "* ", "*.lab.test", "lab.*", "+"}) {
        state.keyValueFiles[kSmbConfPath]["global"] = {{"realm", realm}};
        EXPECT_EQ(Load()["fqdn_name"], realm);
    }
}

TEST_F(AdvancedOptionsRead, TakeAStarInTheOtherTextsAsItIs) {
    state.keyValueFiles[kSmbConfPath]["global"] = {{"password server", "*"}, {"workgroup", "*"}};
    const Json::Value data = Load();
    EXPECT_EQ(data["kdc"], "*");
    EXPECT_EQ(data["netbios_name"], "*");
}

TEST_F(AdvancedOptionsRead, SplitTheStoredInterfaces) {
    const std::vector<std::pair<std::string, std::string>> lists = {{"eth0,eth1", R"(["eth0", "eth1"])"},
                                                                    {"eth0,", R"(["eth0", ""])"},
                                                                    {"eth0", R"(["eth0"])"},
                                                                    {"", R"(["all"])"}};
    for (const auto& list : lists) {
        state.keyValueFiles[kSmbInfoPath]["global"] = {{"register nic", list.first}};
        EXPECT_EQ(Load()["register_nics"], FromJson(list.second)) << list.first;
    }
}

TEST_F(AdvancedOptionsRead, GoOnWhenTheSectionCannotBeLoaded) {
    StoreAll();
    appliance.FailNth("VLIBCFileGetSection", 1, fake::Fault::Result(-1));
    EXPECT_EQ(Load(), FromJson(R"({"enable_advance_option": false, "kdc": "10.0.0.1", "netbios_name": "LAB",
                                   "fqdn_name": "lab.test", "register_nics": ["all"]})"));
    EXPECT_THAT(appliance.Logs(), IsEmpty());
}

TEST_F(AdvancedOptionsRead, KeepTheDefaultsWhenNoHashIsToBeHad) {
    StoreAll();
    appliance.FailNth("VLIBCSzHashAlloc", 1, fake::Fault::Null());
    Json::Value data;
    Step step;
    EXPECT_FALSE(step.handler.LoadDomainAdvData(data));
    EXPECT_EQ(step.handler.error, 2617);
    EXPECT_EQ(data, FromJson(kDefaults));
    EXPECT_THAT(appliance.Logs(), ElementsAre(Logs("domain.cpp", "%s:%d cannot alloc memory", "cannot alloc memory")));
    EXPECT_THAT(appliance.CallTexts(fake::kLogs), ElementsAre("VLIBCSzHashAlloc(1024)"));
}

TEST_F(AdvancedOptionsRead, KeepAnEarlierErrorWhenNoHashIsToBeHad) {
    appliance.FailNth("VLIBCSzHashAlloc", 1, fake::Fault::Null());
    Json::Value data;
    Step step;
    step.handler.SetError(2621);
    EXPECT_FALSE(step.handler.LoadDomainAdvData(data));
    EXPECT_EQ(step.handler.error, 2621);
}

TEST_F(AdvancedOptionsRead, TellByThemselvesWhetherTheyAreOn) {
    EXPECT_FALSE(Step().handler.IsDomainAdvOptEnable());
    for (const std::string& text : unit::NearlyYes()) {
        state.keyValueFiles[kSmbInfoPath]["global"] = {{"advanced_domain_option", text}};
        EXPECT_FALSE(Step().handler.IsDomainAdvOptEnable()) << text;
    }
    for (const bool replaced : {true, false}) {
        state.sectionLoaderReplacesHash = replaced;
        state.keyValueFiles[kSmbInfoPath]["global"] = {{"advanced_domain_option", "yes"}};
        EXPECT_TRUE(Step().handler.IsDomainAdvOptEnable());
    }
    EXPECT_THAT(appliance.Logs(), IsEmpty());
}

TEST_F(AdvancedOptionsRead, AskOnlyForTheSwitchWhenThatIsAll) {
    Step().handler.IsDomainAdvOptEnable();
    EXPECT_THAT(
        appliance.CallTexts(),
        ElementsAre("VLIBCSzHashAlloc(1024)", R"(VLIBCFileGetSection("/usr/vorn/etc/smbinfo.conf", "global", hash))",
                    R"(VLIBCSzHashGetValue(hash, "advanced_domain_option"))", "VLIBCSzHashFree(hash)"));
}

TEST_F(AdvancedOptionsRead, AreTakenForOffWithoutAnErrorWhenNoHashIsToBeHad) {
    state.keyValueFiles[kSmbInfoPath]["global"] = {{"advanced_domain_option", "yes"}};
    appliance.FailNth("VLIBCSzHashAlloc", 1, fake::Fault::Null());
    Step step;
    EXPECT_FALSE(step.handler.IsDomainAdvOptEnable());
    EXPECT_EQ(step.handler.error, 2600);
    EXPECT_THAT(appliance.Logs(), ElementsAre(Logs("domain.cpp", "%s:%d cannot alloc memory", "cannot alloc memory")));
    EXPECT_THAT(appliance.CallTexts(fake::kLogs), ElementsAre("VLIBCSzHashAlloc(1024)"));
}

}  // namespace
