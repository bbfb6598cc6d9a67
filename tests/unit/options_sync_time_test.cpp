// "set" of the time synchronisation, the one option that is kept in the main configuration.

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

constexpr const char* kOn = R"({"enable_sync_time": true})";
constexpr const char* kOff = R"({"enable_sync_time": false})";

class SyncTime : public unit::ModuleTest {
protected:
    void Store(const std::string& text) {
        state.keyValueFiles[kSmbConfPath]["global"] = {{"workgroup", "LAB"}, {"vorn sync dctime", text}};
    }

    const fake::Section& Stored() {
        return state.keyValueFiles[kSmbConfPath]["global"];
    }
};

TEST_F(SyncTime, IsWrittenAsYesOrNo) {
    Store("no");
    EXPECT_THAT(Call(DomainSetOption, FromJson(kOn)), Succeeds("null"));
    EXPECT_THAT(Stored(), ElementsAre(Pair("workgroup", "LAB"), Pair("vorn sync dctime", "yes")));
    EXPECT_THAT(Call(DomainSetOption, FromJson(kOff)), Succeeds("null"));
    EXPECT_THAT(Stored(), ElementsAre(Pair("workgroup", "LAB"), Pair("vorn sync dctime", "no")));
}

TEST_F(SyncTime, AloneRewritesTheOtherFileAsItWasAndReloads) {
    state.keyValueFiles[kSmbInfoPath]["global"] = {{"server signing", "yes"}, {"winbind expand groups", "7"}};
    EXPECT_THAT(Call(DomainSetOption, FromJson(kOn)), Succeeds("null"));
    EXPECT_THAT(appliance.CallTexts(fake::kBookkeeping),
                ElementsAre(R"(VLIBCFileGetKeyValue("/usr/vorn/etc/smb.conf", "vorn sync dctime", size 64, 0))",
                            R"(VORNWinsSetSectionKey("global", "vorn sync dctime", "yes"))",
                            R"(VLIBCFileGetSection("/usr/vorn/etc/smbinfo.conf", "global", hash))",
                            R"(VLIBCFileExist("/usr/vorn/etc/smbinfo.conf.tmp"))",
                            R"(VLIBCFileAddSection("/usr/vorn/etc/smbinfo.conf.tmp", "global", )"
                            R"({"server signing": "yes", "winbind expand groups": "7"}, "    %s=%s\x0a"))",
                            R"(VLIBCSysRename("/usr/vorn/etc/smbinfo.conf.tmp", "/usr/vorn/etc/smbinfo.conf"))",
                            R"(VLIBServiceReload("samba"))", R"(VLIBServiceReload("nmbd"))",
                            R"(VLIBServiceReload("winbindd"))"));
}

TEST_F(SyncTime, IsLeftAloneWhenItStandsRight) {
    Store("yes");
    EXPECT_THAT(Call(DomainSetOption, FromJson(kOn)), Succeeds("null"));
    for (const std::string& text : unit::NearlyYes()) {
        Store(text);
        EXPECT_THAT(Call(DomainSetOption, FromJson(kOff)), Succeeds("null"));
        EXPECT_THAT(Stored(), ElementsAre(Pair("workgroup", "LAB"), Pair("vorn sync dctime", text)));
    }
    state.keyValueFiles.clear();
    EXPECT_THAT(Call(DomainSetOption, FromJson(kOff)), Succeeds("null"));
    EXPECT_EQ(appliance.CountOf("VORNWinsSetSectionKey"), 0);
    EXPECT_EQ(appliance.CountOf("VLIBCFileAddSection"), 0);
    EXPECT_EQ(appliance.CountOf("VLIBServiceReload"), 0);
}

TEST_F(SyncTime, IsWrittenOverWhateverIsNotYes) {
    for (const std::string& text : unit::NearlyYes()) {
        Store(text);
        EXPECT_THAT(Call(DomainSetOption, FromJson(kOn)), Succeeds("null"));
        EXPECT_THAT(Stored(), ElementsAre(Pair("workgroup", "LAB"), Pair("vorn sync dctime", "yes"))) << text;
    }
}

TEST_F(SyncTime, CountsAsOffWhenItCannotBeRead) {
    for (const int result : {-1, 0}) {
        Restart();
        Store("yes");
        appliance.FailNth("VLIBCFileGetKeyValue", 1, Fault::Result(result), true);
        EXPECT_THAT(Call(DomainSetOption, FromJson(kOff)), Succeeds("null"));
        EXPECT_EQ(appliance.CountOf("VORNWinsSetSectionKey"), 0);
        EXPECT_THAT(Call(DomainSetOption, FromJson(kOn)), Succeeds("null"));
        EXPECT_EQ(appliance.CountOf("VORNWinsSetSectionKey"), 1);
    }
}

TEST_F(SyncTime, Answers2617AndChangesNothingElseWhenItCannotBeWritten) {
    appliance.FailNth("VORNWinsSetSectionKey", 1, Fault::Result(-1));
    EXPECT_THAT(Call(DomainSetOption, FromJson(R"({"enable_sync_time": true, "enable_server_signing": true})")),
                FailsWith(2617));
    EXPECT_THAT(appliance.Logs(), ElementsAre(Logs("domain.cpp", "%s:%d Failed to save sync dc time to smb.conf.",
                                                   "Failed to save sync dc time to smb.conf.")));
    EXPECT_THAT(appliance.CallTexts(fake::kRequestReads | fake::kLogs),
                ElementsAre(R"(VLIBCFileGetKeyValue("/usr/vorn/etc/smb.conf", "vorn sync dctime", size 64, 0))",
                            R"(VORNWinsSetSectionKey("global", "vorn sync dctime", "yes"))",
                            "VORN::APIResponse::SetError(2617, null)"));
}

TEST_F(SyncTime, CountsAsWrittenForAPositiveResult) {
    appliance.FailNth("VORNWinsSetSectionKey", 1, Fault::Result(1));
    EXPECT_THAT(Call(DomainSetOption, FromJson(kOn)), Succeeds("null"));
    EXPECT_THAT(state.reloadedServices, ElementsAre("samba", "nmbd", "winbindd"));
    EXPECT_THAT(appliance.Logs(), IsEmpty());
}

TEST_F(SyncTime, StaysWrittenWhenNoHashIsToBeHad) {
    appliance.FailNth("VLIBCSzHashAlloc", 1, Fault::Null());
    EXPECT_THAT(Call(DomainSetOption, FromJson(kOn)), FailsWith(2617));
    EXPECT_THAT(Stored(), ElementsAre(Pair("vorn sync dctime", "yes")));
    EXPECT_EQ(appliance.CountOf("VLIBServiceReload"), 0);
}

TEST_F(SyncTime, TellsItsCallerOnlyOfAChange) {
    unit::Step<DomainServiceHandler> on(FromJson(kOn));
    bool changed = false;
    EXPECT_TRUE(on.handler.SaveSyncDCTime(changed));
    EXPECT_TRUE(changed);
    EXPECT_TRUE(on.handler.SaveSyncDCTime(changed));
    EXPECT_TRUE(changed) << "is never taken back";
    changed = false;
    EXPECT_TRUE(on.handler.SaveSyncDCTime(changed));
    EXPECT_FALSE(changed);
}

TEST_F(SyncTime, TellsItsCallerOfNoChangeThatFailed) {
    unit::Step<DomainServiceHandler> step(FromJson(kOn));
    appliance.FailNth("VORNWinsSetSectionKey", 1, Fault::Result(-1));
    bool changed = false;
    EXPECT_FALSE(step.handler.SaveSyncDCTime(changed));
    EXPECT_FALSE(changed);
    EXPECT_EQ(step.handler.error, 2617);
}

TEST_F(SyncTime, CountsAsUnwantedWhenTheRequestHasNone) {
    Store("yes");
    unit::Step<DomainServiceHandler> step;
    bool changed = false;
    EXPECT_TRUE(step.handler.SaveSyncDCTime(changed));
    EXPECT_TRUE(changed);
    EXPECT_THAT(Stored(), ElementsAre(Pair("workgroup", "LAB"), Pair("vorn sync dctime", "no")));
}

TEST_F(SyncTime, IsNotReadFromWhatAFailedReadLeft) {
    for (const int result : {0, -1}) {
        Restart();
        state.staleText = "yes";
        appliance.FailNth("VLIBCFileGetKeyValue", 1, Fault::Result(result));
        EXPECT_FALSE(Call(DomainGetOption).data["enable_sync_time"].asBool()) << result;
    }
}

}  // namespace
