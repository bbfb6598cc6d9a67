// "set" of the five domain options: what it accepts, changes and reloads. (The administrators' switch: see
// options_admins_test.cpp; the writing of the file: options_write_test.cpp.)

#include <algorithm>
#include <limits>
#include <string>
#include <vector>

#include "src/api_table.h"
#include "src/domain.h"
#include "tests/unit/handler_step.h"

namespace {

using fake::Fault;
using ::testing::ElementsAre;
using ::testing::IsEmpty;
using ::testing::Pair;
using unit::FailsWith;
using unit::FromJson;
using unit::kSmbConfPath;
using unit::kSmbInfoPath;
using unit::Logs;
using unit::Succeeds;

// In the order in which they are checked.
const std::vector<std::string> kOptions = {"enable_sync_time", "enable_server_signing", "enable_rpc_enum_usergroup",
                                           "disable_domain_admins", "domain_nested_group"};

const std::vector<std::pair<std::string, std::string>> kSwitches = {
    {"enable_server_signing", "server signing"},
    {"enable_rpc_enum_usergroup", "enable nt4 enum"},
    {"disable_domain_admins", "disable domain admins"},
};

class OptionsSet : public unit::ModuleTest {
protected:
    void Store(const fake::Section& section) {
        state.keyValueFiles[kSmbInfoPath]["global"] = section;
    }

    const fake::Section& Stored() {
        return state.keyValueFiles[kSmbInfoPath]["global"];
    }

    void StoreSyncTime(const std::string& text) {
        state.keyValueFiles[kSmbConfPath]["global"] = {{"vorn sync dctime", text}};
    }

    fake::Answer Set(const std::string& parameters) {
        return Call(DomainSetOption, FromJson(parameters));
    }

    fake::Answer Set(const std::string& option, const Json::Value& value) {
        Json::Value parameters;
        parameters[option] = value;
        return Call(DomainSetOption, parameters);
    }

    // A request that writes nothing and reloads nothing.
    void ExpectNothingDone() {
        for (const char* function :
             {"VLIBCFileAddSection", "VLIBCSysRename", "VLIBCSysRemove", "VLIBServiceReload", "VLIBServiceTypeReload",
              "VORNWinsSetSectionKey", "VORNGroupAddDomainAdminGroup"}) {
            EXPECT_EQ(appliance.CountOf(function), 0) << function;
        }
    }

    void ExpectReloaded() {
        EXPECT_THAT(state.reloadedServices, ElementsAre("samba", "nmbd", "winbindd"));
    }
};

TEST_F(OptionsSet, DoesNothingWithoutParameters) {
    EXPECT_THAT(Set("{}"), Succeeds("null"));
    EXPECT_THAT(
        appliance.CallTexts(fake::kRequestReads),
        ElementsAre("VLIBCSzHashAlloc(1024)", R"(VLIBCFileGetSection("/usr/vorn/etc/smbinfo.conf", "global", hash))",
                    "VLIBCSzHashFree(hash)", "VORN::APIResponse::SetSuccess(null)"));
    EXPECT_THAT(appliance.Logs(), IsEmpty());
}

TEST_F(OptionsSet, ChangesAllInThisOrder) {
    state.joinedFlag = 1;
    Store({{"server signing", "yes"}});
    EXPECT_THAT(Set(R"({"enable_sync_time": true, "enable_server_signing": false, "enable_rpc_enum_usergroup": true,
                        "domain_nested_group": 3, "disable_domain_admins": true})"),
                Succeeds("null"));
    EXPECT_THAT(
        appliance.CallTexts(fake::kRequestReads),
        ElementsAre(R"(VLIBCFileGetKeyValue("/usr/vorn/etc/smb.conf", "vorn sync dctime", size 64, 0))",
                    R"(VORNWinsSetSectionKey("global", "vorn sync dctime", "yes"))", "VLIBCSzHashAlloc(1024)",
                    R"(VLIBCFileGetSection("/usr/vorn/etc/smbinfo.conf", "global", hash))",
                    R"(VLIBCSzHashGetValue(hash, "server signing"))", R"(VLIBCSzHashRemoveKey(hash, "server signing"))",
                    R"(VLIBCSzHashGetValue(hash, "enable nt4 enum"))",
                    R"(VLIBCSzHashSetValue(hash, "enable nt4 enum", "yes"))",
                    R"(VLIBCSzHashGetValue(hash, "winbind expand groups"))",
                    R"(VLIBCSzHashSetValue(hash, "winbind expand groups", "3"))", "VORNWinsIsJoined()",
                    R"(VLIBCSzHashGetValue(hash, "disable domain admins"))",
                    R"(VLIBCSzHashSetValue(hash, "disable domain admins", "yes"))",
                    R"(VLIBCFileExist("/usr/vorn/etc/smbinfo.conf.tmp"))",
                    R"(VLIBCFileAddSection("/usr/vorn/etc/smbinfo.conf.tmp", "global", )"
                    R"({"enable nt4 enum": "yes", "winbind expand groups": "3", "disable domain admins": "yes"}, )"
                    R"("    %s=%s\x0a"))",
                    R"(VLIBCSysRename("/usr/vorn/etc/smbinfo.conf.tmp", "/usr/vorn/etc/smbinfo.conf"))",
                    "VORNGroupAddDomainAdminGroup()", "VLIBServiceTypeReload(8)", R"(VLIBServiceReload("samba"))",
                    R"(VLIBServiceReload("nmbd"))", R"(VLIBServiceReload("winbindd"))", "VLIBCSzHashFree(hash)",
                    "VORN::APIResponse::SetSuccess(null)"));
    EXPECT_EQ(*fake::FindKey(state.keyValueFiles[kSmbConfPath]["global"], "vorn sync dctime"), "yes");
    EXPECT_THAT(appliance.Logs(), IsEmpty());
}

TEST_F(OptionsSet, ReadsParametersWithANullFallback) {
    Set(R"({"enable_sync_time": true, "enable_server_signing": true, "enable_rpc_enum_usergroup": true,
            "domain_nested_group": 3, "disable_domain_admins": true})");
    const auto isRead = [](const fake::Call& call) { return call.function == "VORN::APIRequest::GetParam"; };
    const std::vector<std::string> reads = appliance.CallTexts(isRead);
    for (const std::string& option : kOptions) {
        EXPECT_EQ(std::count(reads.begin(), reads.end(), "VORN::APIRequest::GetParam(\"" + option + "\", null)"), 2)
            << option;
    }
    EXPECT_EQ(reads.size(), 10U);
}

TEST_F(OptionsSet, RefusesValuesOfAnotherType) {
    for (const std::string& option : kOptions) {
        const bool isSwitch = option != "domain_nested_group";
        for (const char* value : {isSwitch ? "1" : "true", isSwitch ? "0" : "false", R"("true")", R"("3")", "null",
                                  "[]", "{}", "1.5", "99999999999"}) {
            SCOPED_TRACE(option + " " + value);
            Restart();
            EXPECT_THAT(Set(option, FromJson(value)), FailsWith(2618));
            EXPECT_THAT(appliance.Logs(), ElementsAre(Logs("domain.cpp", "%s:%d wrong the paramter: %s",
                                                           "wrong the paramter: " + option)));
            EXPECT_THAT(appliance.CallTexts(fake::kRequestReads | fake::kLogs),
                        ElementsAre("VORN::APIResponse::SetError(2618, null)"));
        }
    }
}

TEST_F(OptionsSet, NamesTheFirstOfSeveralWrongValues) {
    for (std::size_t first = 0; first < kOptions.size(); ++first) {
        Restart();
        Json::Value parameters;
        for (std::size_t option = first; option < kOptions.size(); ++option) {
            parameters[kOptions[option]] = "wrong";
        }
        EXPECT_THAT(Call(DomainSetOption, parameters), FailsWith(2618));
        EXPECT_THAT(appliance.Logs(), ElementsAre(Logs("domain.cpp", "%s:%d wrong the paramter: %s",
                                                       "wrong the paramter: " + kOptions[first])));
    }
}

TEST_F(OptionsSet, SwitchesOnWithYes) {
    for (const auto& option : kSwitches) {
        for (const bool replaced : {true, false}) {
            SCOPED_TRACE(option.first);
            Restart();
            state.sectionLoaderReplacesHash = replaced;
            state.hashGrowthReplacesHash = replaced;
            Store({{"other", "kept"}});
            EXPECT_THAT(Set(option.first, true), Succeeds("null"));
            EXPECT_THAT(Stored(), ElementsAre(Pair("other", "kept"), Pair(option.second, "yes")));
            ExpectReloaded();
        }
    }
}

TEST_F(OptionsSet, SwitchesOnOverWhateverIsNotYes) {
    for (const auto& option : kSwitches) {
        for (const std::string& text : unit::NearlyYes()) {
            Store({{option.second, text}});
            Set(option.first, true);
            EXPECT_THAT(Stored(), ElementsAre(Pair(option.second, "yes"))) << text;
        }
    }
}

TEST_F(OptionsSet, SwitchesOffByRemovingTheKey) {
    for (const auto& option : kSwitches) {
        SCOPED_TRACE(option.first);
        Restart();
        Store({{"other", "kept"}, {option.second, "yes"}});
        EXPECT_THAT(Set(option.first, false), Succeeds("null"));
        EXPECT_THAT(Stored(), ElementsAre(Pair("other", "kept")));
        ExpectReloaded();
    }
}

TEST_F(OptionsSet, DoesNothingForASwitchThatStandsRight) {
    for (const auto& option : kSwitches) {
        Store({{option.second, "yes"}});
        EXPECT_THAT(Set(option.first, true), Succeeds("null"));
        state.keyValueFiles.clear();
        EXPECT_THAT(Set(option.first, false), Succeeds("null"));
        for (const std::string& text : unit::NearlyYes()) {
            Store({{option.second, text}});
            EXPECT_THAT(Set(option.first, false), Succeeds("null"));
            EXPECT_THAT(Stored(), ElementsAre(Pair(option.second, text)));
        }
    }
    ExpectNothingDone();
}

TEST_F(OptionsSet, StoresAnyDepth) {
    for (const int depth :
         {3, 1, 0, -5, 99, 100, 150, std::numeric_limits<int>::max(), std::numeric_limits<int>::min()}) {
        for (const char* before : {"2", "03", "3 ", "abc", ""}) {
            Store({{"winbind expand groups", before}});
            state.reloadedServices.clear();
            EXPECT_THAT(Set("domain_nested_group", depth), Succeeds("null"));
            EXPECT_THAT(Stored(), ElementsAre(Pair("winbind expand groups", std::to_string(depth))));
            ExpectReloaded();
        }
        Store({});
        EXPECT_THAT(Set("domain_nested_group", depth), Succeeds("null"));
        EXPECT_THAT(Stored(), ElementsAre(Pair("winbind expand groups", std::to_string(depth))));
    }
}

TEST_F(OptionsSet, StoresADepthThatGetShowsAs1) {
    Set("domain_nested_group", 150);
    EXPECT_THAT(Stored(), ElementsAre(Pair("winbind expand groups", "150")));
    EXPECT_EQ(Call(DomainGetOption).data["domain_nested_group"], 1);
}

TEST_F(OptionsSet, DoesNothingForTheDepthThatIsStored) {
    for (const int depth : {3, 0, -5, 150}) {
        Store({{"winbind expand groups", std::to_string(depth)}});
        EXPECT_THAT(Set("domain_nested_group", depth), Succeeds("null"));
    }
    ExpectNothingDone();
}

TEST_F(OptionsSet, WritesTheFileForOneChangeAmongOthersThatAreNone) {
    const std::vector<std::pair<fake::Section, const char*>> changes = {{{{"winbind expand groups", "3"}}, "first"},
                                                                        {{{"server signing", "yes"}}, "last"}};
    for (const auto& change : changes) {
        SCOPED_TRACE(change.second);
        Restart();
        Store(change.first);
        EXPECT_THAT(Set(R"({"enable_server_signing": true, "enable_rpc_enum_usergroup": false,
                            "domain_nested_group": 3, "disable_domain_admins": false})"),
                    Succeeds("null"));
        EXPECT_EQ(appliance.CountOf("VLIBCSysRename"), 1);
        EXPECT_EQ(Stored().size(), 2U);
        ExpectReloaded();
    }
}

TEST_F(OptionsSet, Answers2617WhenNoHashIsToBeHad) {
    appliance.FailNth("VLIBCSzHashAlloc", 1, Fault::Null());
    EXPECT_THAT(Set(R"({"enable_server_signing": true})"), FailsWith(2617));
    EXPECT_THAT(appliance.Logs(), ElementsAre(Logs("domain.cpp", "%s:%d Cannot alloc memory", "Cannot alloc memory")));
    EXPECT_THAT(appliance.CallTexts(fake::kRequestReads | fake::kLogs),
                ElementsAre("VLIBCSzHashAlloc(1024)", "VORN::APIResponse::SetError(2617, null)"));
}

TEST_F(OptionsSet, DoesNotLookAtTheLoader) {
    Store({{"other", "lost"}});
    appliance.FailNth("VLIBCFileGetSection", 1, Fault::Result(-1));
    EXPECT_THAT(Set(R"({"enable_server_signing": true})"), Succeeds("null"));
    EXPECT_THAT(Stored(), ElementsAre(Pair("server signing", "yes")));
}

TEST_F(OptionsSet, TakesAChangeThatTheHashRefusesForMade) {
    for (const char* parameters : {R"({"enable_server_signing": true})", R"({"enable_rpc_enum_usergroup": false})",
                                   R"({"domain_nested_group": 3})", R"({"disable_domain_admins": true})"}) {
        SCOPED_TRACE(parameters);
        Restart();
        Store({{"enable nt4 enum", "yes"}});
        appliance.FailNth("VLIBCSzHashSetValue", 1, Fault::Result(-1));
        appliance.FailNth("VLIBCSzHashRemoveKey", 1, Fault::Result(-1));
        EXPECT_THAT(Set(parameters), Succeeds("null"));
        EXPECT_THAT(Stored(), ElementsAre(Pair("enable nt4 enum", "yes")));
        EXPECT_EQ(appliance.CountOf("VLIBCSysRename"), 1);
        EXPECT_THAT(appliance.Logs(), IsEmpty());
        ExpectReloaded();
    }
}

TEST_F(OptionsSet, Answers2617AndReloadsNothingWhenTheFileCannotBeWritten) {
    const std::vector<std::pair<const char*, int>> failures = {
        {"VLIBCFileAddSection", 0}, {"VLIBCSysRename", -1}, {"VLIBCSysRename", 1}};
    for (const auto& failure : failures) {
        SCOPED_TRACE(failure.first);
        Restart();
        appliance.FailNth(failure.first, 1, Fault::Result(failure.second));
        EXPECT_THAT(Set(R"({"enable_sync_time": true, "enable_server_signing": true})"), FailsWith(2617));
        EXPECT_THAT(appliance.Logs(),
                    ElementsAre(Logs("domain.cpp", "%s:%d Cannot save smb conf", "Cannot save smb conf")));
        EXPECT_THAT(state.reloadedServices, IsEmpty());
        EXPECT_FALSE(state.Exists(kSmbInfoPath));
        EXPECT_EQ(*fake::FindKey(state.keyValueFiles[kSmbConfPath]["global"], "vorn sync dctime"), "yes");
    }
}

TEST_F(OptionsSet, DoesNotLookAtTheReloads) {
    appliance.FailNth("VLIBServiceReload", 1, Fault::Result(-1), true);
    EXPECT_THAT(Set(R"({"enable_server_signing": true})"), Succeeds("null"));
    EXPECT_EQ(appliance.CountOf("VLIBServiceReload"), 3);
    EXPECT_THAT(appliance.Logs(), IsEmpty());
}

}  // namespace
