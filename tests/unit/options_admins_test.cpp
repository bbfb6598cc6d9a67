// "set" of "disable_domain_admins": on a member, a change is followed by what the platform does about the
// administrators' group.

#include <cstddef>
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
using unit::kSmbInfoPath;
using unit::kSmbInfoTemporary;
using unit::Logs;
using unit::Succeeds;

constexpr const char* kDisable = R"({"disable_domain_admins": true})";
constexpr const char* kEnable = R"({"disable_domain_admins": false})";

class DomainAdmins : public unit::ModuleTest {
protected:
    DomainAdmins() {
        state.joinedFlag = 1;
    }

    void Store(const fake::Section& section) {
        state.keyValueFiles[kSmbInfoPath]["global"] = section;
    }

    fake::Answer Set(const std::string& parameters) {
        return Call(DomainSetOption, FromJson(parameters));
    }

    void ExpectGroupUpdates(int times) {
        EXPECT_EQ(appliance.CountOf("VORNGroupAddDomainAdminGroup"), times);
        EXPECT_EQ(appliance.CountOf("VLIBServiceTypeReload"), times);
    }
};

TEST_F(DomainAdmins, AreUpdatedAfterTheFileAndBeforeTheReloads) {
    EXPECT_THAT(Set(kDisable), Succeeds("null"));
    EXPECT_THAT(
        appliance.CallTexts(fake::kBookkeeping),
        ElementsAre(R"(VLIBCFileGetSection("/usr/vorn/etc/smbinfo.conf", "global", hash))", "VORNWinsIsJoined()",
                    R"(VLIBCFileExist("/usr/vorn/etc/smbinfo.conf.tmp"))",
                    R"(VLIBCFileAddSection("/usr/vorn/etc/smbinfo.conf.tmp", "global", )"
                    R"({"disable domain admins": "yes"}, "    %s=%s\x0a"))",
                    R"(VLIBCSysRename("/usr/vorn/etc/smbinfo.conf.tmp", "/usr/vorn/etc/smbinfo.conf"))",
                    "VORNGroupAddDomainAdminGroup()", "VLIBServiceTypeReload(8)", R"(VLIBServiceReload("samba"))",
                    R"(VLIBServiceReload("nmbd"))", R"(VLIBServiceReload("winbindd"))"));
    EXPECT_THAT(appliance.Logs(), IsEmpty());
}

TEST_F(DomainAdmins, AreUpdatedAlsoWhenTheyAreEnabledAgain) {
    Store({{"disable domain admins", "yes"}});
    EXPECT_THAT(Set(kEnable), Succeeds("null"));
    EXPECT_THAT(state.keyValueFiles[kSmbInfoPath]["global"], IsEmpty());
    ExpectGroupUpdates(1);
    EXPECT_THAT(state.reloadedServiceTypes, ElementsAre(8));
}

TEST_F(DomainAdmins, AreUpdatedForEveryResultButZeroOfTheQuestionForMembership) {
    for (const int joined : {1, 2, -1}) {
        Restart();
        state.joinedFlag = joined;
        Set(kDisable);
        ExpectGroupUpdates(1);
    }
}

TEST_F(DomainAdmins, AreNotUpdatedOutsideADomain) {
    state.joinedFlag = 0;
    EXPECT_THAT(Set(kDisable), Succeeds("null"));
    EXPECT_THAT(state.keyValueFiles[kSmbInfoPath]["global"], ElementsAre(Pair("disable domain admins", "yes")));
    EXPECT_THAT(state.reloadedServices, ElementsAre("samba", "nmbd", "winbindd"));
    EXPECT_THAT(Set(kEnable), Succeeds("null"));
    EXPECT_THAT(state.keyValueFiles[kSmbInfoPath]["global"], IsEmpty());
    ExpectGroupUpdates(0);
}

TEST_F(DomainAdmins, AreNotUpdatedWithoutAChangeOfTheirs) {
    Store({{"disable domain admins", "yes"}});
    EXPECT_THAT(Set(R"({"disable_domain_admins": true, "enable_server_signing": true})"), Succeeds("null"));
    Store({});
    EXPECT_THAT(Set(R"({"disable_domain_admins": false, "enable_server_signing": true})"), Succeeds("null"));
    EXPECT_THAT(state.reloadedServices, ::testing::SizeIs(6));
    ExpectGroupUpdates(0);
}

TEST_F(DomainAdmins, AreNotUpdatedForOtherOptions) {
    EXPECT_THAT(Set(R"({"enable_sync_time": true, "enable_server_signing": true, "enable_rpc_enum_usergroup": true,
                        "domain_nested_group": 3})"),
                Succeeds("null"));
    EXPECT_THAT(state.reloadedServices, ElementsAre("samba", "nmbd", "winbindd"));
    EXPECT_EQ(appliance.CountOf("VORNWinsIsJoined"), 0);
    ExpectGroupUpdates(0);
}

TEST_F(DomainAdmins, AreUpdatedAlsoWhenTheRenameFails) {
    for (const int result : {-1, 1}) {
        Restart();
        state.joinedFlag = 1;
        appliance.FailNth("VLIBCSysRename", 1, Fault::Result(result));
        EXPECT_THAT(Set(kDisable), FailsWith(2617));
        EXPECT_THAT(appliance.Logs(),
                    ElementsAre(Logs("domain.cpp", "%s:%d Cannot save smb conf", "Cannot save smb conf")));
        ExpectGroupUpdates(1);
        EXPECT_THAT(state.reloadedServices, IsEmpty());
        EXPECT_TRUE(state.Exists(kSmbInfoTemporary));
        EXPECT_FALSE(state.Exists(kSmbInfoPath));
    }
}

TEST_F(DomainAdmins, AreNotUpdatedWhenTheFileCannotBeWritten) {
    appliance.FailNth("VLIBCFileAddSection", 1, Fault::Result(0));
    EXPECT_THAT(Set(kDisable), FailsWith(2617));
    ExpectGroupUpdates(0);
    EXPECT_THAT(state.reloadedServices, IsEmpty());
}

TEST_F(DomainAdmins, AreUpdatedForANegativeResultOfTheWriter) {
    appliance.FailNth("VLIBCFileAddSection", 1, Fault::Result(-1));
    EXPECT_THAT(Set(kDisable), Succeeds("null"));
    ExpectGroupUpdates(1);
}

TEST_F(DomainAdmins, AreUpdatedForAChangeThatTheHashRefuses) {
    appliance.FailNth("VLIBCSzHashSetValue", 1, Fault::Result(-1));
    EXPECT_THAT(Set(kDisable), Succeeds("null"));
    ExpectGroupUpdates(1);
    Restart();
    state.joinedFlag = 1;
    Store({{"disable domain admins", "yes"}});
    appliance.FailNth("VLIBCSzHashRemoveKey", 1, Fault::Result(-1));
    EXPECT_THAT(Set(kEnable), Succeeds("null"));
    ExpectGroupUpdates(1);
}

TEST_F(DomainAdmins, ReloadTheServicesWhateverBecomesOfTheUpdate) {
    appliance.FailNth("VORNGroupAddDomainAdminGroup", 1, Fault::Result(-1));
    appliance.FailNth("VLIBServiceTypeReload", 1, Fault::Result(-1));
    EXPECT_THAT(Set(kDisable), Succeeds("null"));
    ExpectGroupUpdates(1);
    EXPECT_THAT(state.reloadedServices, ElementsAre("samba", "nmbd", "winbindd"));
    EXPECT_THAT(appliance.Logs(), IsEmpty());
}

// The steps by themselves: what they answer and what they leave for the writing of the file.
class OptionUpdate : public unit::ModuleTest {
protected:
    using Step = unit::Step<DomainServiceHandler>;

    OptionUpdate() : hash(VLIBCSzHashAlloc(8)) {
        state.joinedFlag = 1;
    }

    void TearDown() override {
        VLIBCSzHashFree(hash);
        ModuleTest::TearDown();
    }

    std::string Value() {
        const char* value = VLIBCSzHashGetValue(hash, "key");
        return value == nullptr ? "none" : value;
    }

    VLIBSZHASH* hash;
};

TEST_F(OptionUpdate, NeedsNoGroupBeforeAnythingChanged) {
    EXPECT_FALSE(Step().handler.needAddDomainAdminGroup);
}

TEST_F(OptionUpdate, OfTheAdministratorsNeedsTheGroupAfterAChangeOnAMember) {
    Step on(R"({"switch": true})");
    EXPECT_TRUE(on.handler.UpdateDisableAdminConf(&hash, "switch", "key"));
    EXPECT_TRUE(on.handler.needAddDomainAdminGroup);
    EXPECT_EQ(Value(), "yes");
    Step off(R"({"switch": false})");
    EXPECT_TRUE(off.handler.UpdateDisableAdminConf(&hash, "switch", "key"));
    EXPECT_TRUE(off.handler.needAddDomainAdminGroup);
    EXPECT_EQ(Value(), "none");
}

TEST_F(OptionUpdate, OfTheAdministratorsForgetsAnEarlierNeed) {
    Step off(R"({"switch": false})");
    off.handler.needAddDomainAdminGroup = true;
    EXPECT_FALSE(off.handler.UpdateDisableAdminConf(&hash, "switch", "key"));
    EXPECT_FALSE(off.handler.needAddDomainAdminGroup);
    state.joinedFlag = 0;
    Step on(R"({"switch": true})");
    on.handler.needAddDomainAdminGroup = true;
    EXPECT_TRUE(on.handler.UpdateDisableAdminConf(&hash, "switch", "key"));
    EXPECT_FALSE(on.handler.needAddDomainAdminGroup);
}

TEST_F(OptionUpdate, OfASwitchTellsWhetherItChanged) {
    Step on(R"({"switch": true})");
    EXPECT_TRUE(on.handler.UpdateBoolConf(&hash, "switch", "key"));
    EXPECT_EQ(Value(), "yes");
    EXPECT_FALSE(on.handler.UpdateBoolConf(&hash, "switch", "key"));
    Step missing;
    EXPECT_TRUE(missing.handler.UpdateBoolConf(&hash, "switch", "key"));
    EXPECT_EQ(Value(), "none");
    EXPECT_FALSE(missing.handler.UpdateBoolConf(&hash, "switch", "key"));
    EXPECT_FALSE(on.handler.needAddDomainAdminGroup);
    EXPECT_EQ(appliance.CountOf("VORNWinsIsJoined"), 0);
}

TEST_F(OptionUpdate, OfANumberTellsWhetherItChanged) {
    Step number(R"({"number": -5})");
    EXPECT_TRUE(number.handler.UpdateIntConf(&hash, "number", "key"));
    EXPECT_EQ(Value(), "-5");
    EXPECT_FALSE(number.handler.UpdateIntConf(&hash, "number", "key"));
    Step missing;
    EXPECT_TRUE(missing.handler.UpdateIntConf(&hash, "number", "key"));
    EXPECT_EQ(Value(), "0");
    EXPECT_FALSE(missing.handler.UpdateIntConf(&hash, "number", "key"));
}

TEST_F(OptionUpdate, ReadsTheRequestFirst) {
    Step step(R"({"x": true, "y": 3})");
    const std::size_t before = appliance.Calls().size();
    step.handler.UpdateBoolConf(&hash, "x", "bool");
    step.handler.UpdateIntConf(&hash, "y", "int");
    step.handler.UpdateDisableAdminConf(&hash, "x", "admins");
    std::vector<std::string> calls = appliance.CallTexts();
    calls.erase(calls.begin(), calls.begin() + static_cast<std::ptrdiff_t>(before));
    EXPECT_THAT(calls,
                ElementsAre(R"(VORN::APIRequest::GetParam("x", null))", R"(VLIBCSzHashGetValue(hash, "bool"))",
                            R"(VLIBCSzHashSetValue(hash, "bool", "yes"))", R"(VORN::APIRequest::GetParam("y", null))",
                            R"(VLIBCSzHashGetValue(hash, "int"))", R"(VLIBCSzHashSetValue(hash, "int", "3"))",
                            R"(VORN::APIRequest::GetParam("x", null))", "VORNWinsIsJoined()",
                            R"(VLIBCSzHashGetValue(hash, "admins"))", R"(VLIBCSzHashSetValue(hash, "admins", "yes"))"));
}

TEST_F(OptionUpdate, GoesOnWithAHashThatMoved) {
    for (const bool replaced : {true, false}) {
        state.hashGrowthReplacesHash = replaced;
        VLIBCSzHashRemoveKey(hash, "key");
        EXPECT_TRUE(Step(R"({"x": true})").handler.UpdateBoolConf(&hash, "x", "key"));
        EXPECT_TRUE(Step(R"({"x": 3})").handler.UpdateIntConf(&hash, "x", "key"));
        EXPECT_TRUE(Step(R"({"x": true})").handler.UpdateDisableAdminConf(&hash, "x", "key"));
        EXPECT_EQ(Value(), "yes");
    }
}

}  // namespace
