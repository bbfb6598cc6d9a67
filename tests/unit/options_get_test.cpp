// "get" of the five domain options.

#include <string>
#include <vector>

#include "src/api_table.h"
#include "src/domain.h"
#include "tests/unit/handler_step.h"

namespace {

using fake::Fault;
using ::testing::ElementsAre;
using ::testing::IsEmpty;
using unit::FailsWith;
using unit::FromJson;
using unit::kSmbConfPath;
using unit::kSmbInfoPath;
using unit::Logs;
using unit::Succeeds;

constexpr const char* kDefaults =
    R"({"enable_sync_time": false, "enable_server_signing": false, "enable_rpc_enum_usergroup": false,
        "domain_nested_group": 1, "disable_domain_admins": false})";
constexpr const char* kAllOn =
    R"({"enable_sync_time": true, "enable_server_signing": true, "enable_rpc_enum_usergroup": true,
        "domain_nested_group": 7, "disable_domain_admins": true})";

// The switches in smbinfo.conf: to the client, and in the file.
const std::vector<std::pair<std::string, std::string>> kSwitches = {
    {"enable_server_signing", "server signing"},
    {"enable_rpc_enum_usergroup", "enable nt4 enum"},
    {"disable_domain_admins", "disable domain admins"},
};

class OptionsGet : public unit::ModuleTest {
protected:
    void StoreAll() {
        state.keyValueFiles[kSmbConfPath]["global"] = {{"vorn sync dctime", "yes"}};
        state.keyValueFiles[kSmbInfoPath]["global"] = {{"server signing", "yes"},
                                                       {"enable nt4 enum", "yes"},
                                                       {"winbind expand groups", "7"},
                                                       {"disable domain admins", "yes"}};
    }

    Json::Value Get() {
        const fake::Answer answer = Call(DomainGetOption);
        EXPECT_TRUE(answer.success);
        return answer.data;
    }
};

TEST_F(OptionsGet, AnswersTheDefaultsWithoutTheFiles) {
    EXPECT_THAT(Call(DomainGetOption), Succeeds(kDefaults));
    EXPECT_THAT(appliance.Logs(), IsEmpty());
}

TEST_F(OptionsGet, AnswersWhatIsStored) {
    StoreAll();
    EXPECT_THAT(Call(DomainGetOption), Succeeds(kAllOn));
    EXPECT_THAT(appliance.Logs(), IsEmpty());
}

TEST_F(OptionsGet, AsksThePlatformInThisOrder) {
    StoreAll();
    Call(DomainGetOption);
    EXPECT_THAT(
        appliance.CallTexts(fake::kAnswers),
        ElementsAre(R"(VLIBCFileGetKeyValue("/usr/vorn/etc/smb.conf", "vorn sync dctime", size 64, 0))",
                    "VLIBCSzHashAlloc(1024)", R"(VLIBCFileGetSection("/usr/vorn/etc/smbinfo.conf", "global", hash))",
                    R"(VLIBCSzHashGetValue(hash, "server signing"))", R"(VLIBCSzHashGetValue(hash, "enable nt4 enum"))",
                    R"(VLIBCSzHashGetValue(hash, "disable domain admins"))",
                    R"(VLIBCSzHashGetValue(hash, "winbind expand groups"))", "VLIBCSzHashFree(hash)"));
}

TEST_F(OptionsGet, IsTheSameFromAHashThatStaysWhereItIs) {
    StoreAll();
    state.sectionLoaderReplacesHash = false;
    EXPECT_THAT(Call(DomainGetOption), Succeeds(kAllOn));
}

TEST_F(OptionsGet, TakesTheTimeSynchronisationFromTheMainConfiguration) {
    state.keyValueFiles[kSmbConfPath]["global"] = {{"vorn sync dctime", "yes"}};
    Json::Value expected = FromJson(kDefaults);
    expected["enable_sync_time"] = true;
    EXPECT_EQ(Get(), expected);
    state.keyValueFiles.clear();
    state.keyValueFiles[kSmbInfoPath]["global"] = {{"vorn sync dctime", "yes"}};
    EXPECT_EQ(Get(), FromJson(kDefaults));
}

TEST_F(OptionsGet, TakesTheOthersFromTheSectionOfTheDomainInformation) {
    StoreAll();
    state.keyValueFiles[kSmbConfPath]["global"] = state.keyValueFiles[kSmbInfoPath]["global"];
    state.keyValueFiles[kSmbInfoPath]["other"] = state.keyValueFiles[kSmbInfoPath]["global"];
    state.keyValueFiles[kSmbInfoPath].erase("global");
    EXPECT_EQ(Get(), FromJson(kDefaults));
}

TEST_F(OptionsGet, TakesEachSwitchFromItsOwnKey) {
    for (const auto& option : kSwitches) {
        state.keyValueFiles[kSmbInfoPath]["global"] = {{option.second, "yes"}};
        Json::Value expected = FromJson(kDefaults);
        expected[option.first] = true;
        EXPECT_EQ(Get(), expected) << option.second;
    }
}

TEST_F(OptionsGet, TakesExactlyYesForOn) {
    for (const std::string& text : unit::NearlyYes()) {
        state.keyValueFiles[kSmbConfPath]["global"] = {{"vorn sync dctime", text}};
        state.keyValueFiles[kSmbInfoPath]["global"] = {
            {"server signing", text}, {"enable nt4 enum", text}, {"disable domain admins", text}};
        EXPECT_EQ(Get(), FromJson(kDefaults)) << text;
    }
}

TEST_F(OptionsGet, ShowsTheTimeSynchronisationAsOffWhenItCannotBeRead) {
    for (const int result : {-1, 0}) {
        Restart();
        StoreAll();
        appliance.FailNth("VLIBCFileGetKeyValue", 1, Fault::Result(result));
        Json::Value expected = FromJson(kAllOn);
        expected["enable_sync_time"] = false;
        EXPECT_EQ(Get(), expected) << result;
        EXPECT_THAT(appliance.Logs(), IsEmpty());
    }
}

TEST_F(OptionsGet, ShowsADepthFrom1To99) {
    const std::vector<std::pair<std::string, int>> depths = {
        {"1", 1},   {"2", 2},   {"9", 9},      {"10", 10},   {"50", 50},  {"98", 98},   {"99", 99},
        {"+8", 8},  {" 7", 7},  {"\t7", 7},    {"7 ", 7},    {"007", 7},  {"0099", 99}, {"7abc", 7},
        {"7,9", 7}, {"7.9", 7}, {"99.99", 99}, {"12e3", 12}, {"010", 10}, {"08", 8}};
    for (const auto& depth : depths) {
        state.keyValueFiles[kSmbInfoPath]["global"] = {{"winbind expand groups", depth.first}};
        Json::Value expected = FromJson(kDefaults);
        expected["domain_nested_group"] = depth.second;
        EXPECT_EQ(Get(), expected) << depth.first;
    }
}

TEST_F(OptionsGet, ShowsEveryOtherDepthAs1) {
    for (const char* depth : {"0",
                              "100",
                              "101",
                              "150",
                              "990",
                              "-1",
                              "-2",
                              "-7",
                              "-99",
                              "",
                              " ",
                              "abc",
                              "a7",
                              "+",
                              "-",
                              "+ 7",
                              "- 7",
                              "yes",
                              "0x10",
                              ",7",
                              "2147483647",
                              "2147483648",
                              "-2147483648",
                              "4294967296",
                              "4294967298",
                              "-4294967295",
                              "18446744073709551623",
                              "99999999999999999999",
                              "-99999999999999999999"}) {
        state.keyValueFiles[kSmbInfoPath]["global"] = {{"winbind expand groups", depth}};
        EXPECT_EQ(Get(), FromJson(kDefaults)) << depth;
    }
}

TEST_F(OptionsGet, GoesOnWhenTheSectionCannotBeLoaded) {
    StoreAll();
    appliance.FailNth("VLIBCFileGetSection", 1, Fault::Result(-1));
    Json::Value expected = FromJson(kDefaults);
    expected["enable_sync_time"] = true;
    EXPECT_EQ(Get(), expected);
    EXPECT_THAT(appliance.Logs(), IsEmpty());
}

TEST_F(OptionsGet, Answers2617WhenNoHashIsToBeHad) {
    StoreAll();
    appliance.FailNth("VLIBCSzHashAlloc", 1, Fault::Null());
    EXPECT_THAT(Call(DomainGetOption), FailsWith(2617));
    EXPECT_THAT(appliance.Logs(), ElementsAre(Logs("domain.cpp", "%s:%d Cannot alloc memory", "Cannot alloc memory")));
    EXPECT_THAT(appliance.CallTexts(fake::kLogs),
                ElementsAre(R"(VLIBCFileGetKeyValue("/usr/vorn/etc/smb.conf", "vorn sync dctime", size 64, 0))",
                            "VLIBCSzHashAlloc(1024)", "VORN::APIResponse::SetError(2617, null)"));
}

TEST_F(OptionsGet, HasTheDefaultsAndTheTimeSynchronisationWhenNoHashIsToBeHad) {
    StoreAll();
    appliance.FailNth("VLIBCSzHashAlloc", 1, Fault::Null());
    unit::Step<DomainServiceHandler> step;
    Json::Value data;
    EXPECT_FALSE(step.handler.LoadDomainAdditionalData(data));
    Json::Value expected = FromJson(kDefaults);
    expected["enable_sync_time"] = true;
    EXPECT_EQ(data, expected);
}

TEST_F(OptionsGet, ReplacesWhatTheCallerHad) {
    unit::Step<DomainServiceHandler> step;
    Json::Value data = FromJson(kAllOn);
    EXPECT_TRUE(step.handler.LoadDomainAdditionalData(data));
    EXPECT_EQ(data, FromJson(kDefaults));
    appliance.FailNth("VLIBCSzHashAlloc", 2, Fault::Null());
    data = FromJson(kAllOn);
    EXPECT_FALSE(step.handler.LoadDomainAdditionalData(data));
    EXPECT_EQ(data, FromJson(kDefaults));
}

}  // namespace
