// The advanced domain options, stored in smbinfo.conf.

#include <string>
#include <vector>

#include "tests/unit/smbinfo_test.h"

namespace {

using fake::Fault;
using ::testing::ElementsAre;
using ::testing::IsEmpty;
using ::testing::Pair;
using unit::FromJson;
using unit::kOptionsOn;
using unit::kSmbInfoPath;
using unit::kSmbInfoTemporary;
using unit::Logs;

constexpr const char* kOnEverywhere = R"({"enable_advance_option": true, "register_nics": ["all"]})";

class AdvancedOptionsSave : public unit::SmbInfoTest {};

TEST_F(AdvancedOptionsSave, KeepsTheOtherKeysOfTheSection) {
    for (const bool replaced : {true, false}) {
        state.sectionLoaderReplacesHash = replaced;
        state.hashGrowthReplacesHash = replaced;
        Store({{"server signing", "yes"}, {"advanced_domain_option", "no"}, {"winbind expand groups", "3"}});
        EXPECT_TRUE(Save(kOptionsOn));
        EXPECT_THAT(Stored(), ElementsAre(Pair("server signing", "yes"), Pair("advanced_domain_option", "yes"),
                                          Pair("winbind expand groups", "3"), Pair("register nic", "eth0,eth1")));
    }
    EXPECT_EQ(step.handler.error, 2600);
    EXPECT_THAT(appliance.Logs(), IsEmpty());
}

TEST_F(AdvancedOptionsSave, WritesASectionBesideTheFileAndRenamesIt) {
    Store({{"server signing", "yes"}});
    EXPECT_TRUE(Save(kOptionsOn));
    EXPECT_THAT(
        appliance.CallTexts(),
        ElementsAre("VLIBCSzHashAlloc(1024)", R"(VLIBCFileGetSection("/usr/vorn/etc/smbinfo.conf", "global", hash))",
                    R"(VLIBCSzHashSetValue(hash, "advanced_domain_option", "yes"))",
                    R"(VLIBCSzHashSetValue(hash, "register nic", "eth0,eth1"))",
                    R"(VLIBCFileITmpName("/usr/vorn/etc/smbinfo.conf", size 4095))",
                    R"(VLIBCFileAddSection("/usr/vorn/etc/smbinfo.conf.tmp", "global", )"
                    R"({"server signing": "yes", "advanced_domain_option": "yes", "register nic": "eth0,eth1"}, )"
                    R"("    %s=%s\x0a"))",
                    R"(VLIBCSysRename("/usr/vorn/etc/smbinfo.conf.tmp", "/usr/vorn/etc/smbinfo.conf"))",
                    "VLIBCSzHashFree(hash)"));
    EXPECT_FALSE(state.Exists(kSmbInfoTemporary));
}

TEST_F(AdvancedOptionsSave, RemovesTheSwitchAndTheInterfacesWhenOffOnAll) {
    EXPECT_TRUE(Save(R"({"enable_advance_option": false, "register_nics": ["all"]})"));
    EXPECT_THAT(
        appliance.CallTexts(),
        ElementsAre("VLIBCSzHashAlloc(1024)", R"(VLIBCFileGetSection("/usr/vorn/etc/smbinfo.conf", "global", hash))",
                    R"(VLIBCSzHashRemoveKey(hash, "advanced_domain_option"))",
                    R"(VLIBCSzHashRemoveKey(hash, "register nic"))",
                    R"(VLIBCFileITmpName("/usr/vorn/etc/smbinfo.conf", size 4095))",
                    R"(VLIBCFileAddSection("/usr/vorn/etc/smbinfo.conf.tmp", "global", )"
                    R"({"server signing": "yes"}, "    %s=%s\x0a"))",
                    R"(VLIBCSysRename("/usr/vorn/etc/smbinfo.conf.tmp", "/usr/vorn/etc/smbinfo.conf"))",
                    "VLIBCSzHashFree(hash)"));
    EXPECT_THAT(Stored(), ElementsAre(Pair("server signing", "yes")));
}

TEST_F(AdvancedOptionsSave, StoresTheInterfacesAlsoWhenOff) {
    EXPECT_TRUE(Save(R"({"enable_advance_option": false, "register_nics": ["eth0"]})"));
    EXPECT_THAT(Stored(), ElementsAre(Pair("server signing", "yes"), Pair("register nic", "eth0")));
}

TEST_F(AdvancedOptionsSave, CreatesTheFileWithTheKeysThatItSets) {
    state.keyValueFiles.clear();
    EXPECT_TRUE(Save(kOptionsOn));
    EXPECT_THAT(state.keyValueFiles[kSmbInfoPath],
                ElementsAre(Pair(
                    "global", ElementsAre(Pair("advanced_domain_option", "yes"), Pair("register nic", "eth0,eth1")))));
    EXPECT_EQ(state.sectionFormats[kSmbInfoPath], unit::kSmbLine);
}

TEST_F(AdvancedOptionsSave, DropsTheFilesOtherSections) {
    state.keyValueFiles[kSmbInfoPath]["printers"] = {{"path", "/x"}};
    EXPECT_TRUE(Save(kOptionsOn));
    EXPECT_THAT(state.keyValueFiles[kSmbInfoPath], ElementsAre(Pair("global", ::testing::SizeIs(3))));
}

TEST_F(AdvancedOptionsSave, RemovesTheSwitchForWhateverIsNotTrue) {
    for (const char* options :
         {R"({"enable_advance_option": false})", R"({"enable_advance_option": null})", "{}", "null", "[]", R"("true")",
          R"({"enable_advance_option": "true"})", R"({"enable_advance_option": []})", R"({"Enable": true})"}) {
        Store({{"server signing", "yes"}, {"advanced_domain_option", "yes"}, {"register nic", "eth7"}});
        EXPECT_TRUE(Save(options)) << options;
        EXPECT_THAT(Stored(), ElementsAre(Pair("server signing", "yes"))) << options;
    }
}

TEST_F(AdvancedOptionsSave, RemovesTheInterfacesWhenTheyAreAll) {
    for (const char* nics : {R"(["all"])", "[]", R"(["eth0", "all", "eth1"])", "null", R"([""])"}) {
        Store({{"register nic", "eth7"}});
        Json::Value options;
        options["enable_advance_option"] = true;
        options["register_nics"] = FromJson(nics);
        EXPECT_TRUE(step.handler.SaveSMBOption(options)) << nics;
        EXPECT_THAT(Stored(), ElementsAre(Pair("advanced_domain_option", "yes"))) << nics;
    }
    Store({{"register nic", "eth7"}});
    EXPECT_TRUE(Save(R"({"enable_advance_option": true})"));
    EXPECT_THAT(Stored(), ElementsAre(Pair("advanced_domain_option", "yes")));
}

TEST_F(AdvancedOptionsSave, StoresAnInterfaceOfOneCharacter) {
    EXPECT_TRUE(Save(R"({"enable_advance_option": true, "register_nics": ["e"]})"));
    EXPECT_EQ(*fake::FindKey(Stored(), "register nic"), "e");
}

TEST_F(AdvancedOptionsSave, RewritesTheFileAlsoWhenNothingChanged) {
    EXPECT_TRUE(Save(kOptionsOn));
    const fake::Section stored = Stored();
    EXPECT_TRUE(Save(kOptionsOn));
    EXPECT_EQ(Stored(), stored);
    EXPECT_EQ(appliance.CountOf("VLIBCSysRename"), 2);
}

TEST_F(AdvancedOptionsSave, Records2617WhenNoHashIsToBeHad) {
    appliance.FailNth("VLIBCSzHashAlloc", 1, Fault::Null());
    EXPECT_FALSE(Save(kOptionsOn));
    EXPECT_EQ(step.handler.error, 2617);
    EXPECT_THAT(appliance.Logs(), ElementsAre(Logs("domain.cpp", "%s:%d Cannot alloc memory", "Cannot alloc memory")));
    EXPECT_THAT(appliance.CallTexts(fake::kLogs), ElementsAre("VLIBCSzHashAlloc(1024)"));
    ExpectUntouched();
}

TEST_F(AdvancedOptionsSave, Records2617SilentlyWhenTheHashTakesNoOption) {
    for (const char* options : {kOptionsOn, kOnEverywhere}) {
        for (const int failing : {1, 2}) {
            for (const bool replaced : {true, false}) {
                if (options == kOnEverywhere && failing == 2) {
                    continue;  // has one option to set
                }
                SCOPED_TRACE(std::string(options) + std::to_string(failing));
                StartAnew();
                state.hashGrowthReplacesHash = replaced;
                state.sectionLoaderReplacesHash = replaced;
                appliance.FailNth("VLIBCSzHashSetValue", failing, Fault::Result(-1));
                EXPECT_FALSE(Save(options));
                EXPECT_EQ(step.handler.error, 2617);
                EXPECT_THAT(appliance.Logs(), IsEmpty());
                EXPECT_EQ(appliance.CountOf("VLIBCFileITmpName"), 0);
                ExpectUntouched();
            }
        }
    }
}

TEST_F(AdvancedOptionsSave, TakesAPositiveResultOfTheHashForStored) {
    appliance.FailNth("VLIBCSzHashSetValue", 1, Fault::Result(1), true);
    EXPECT_TRUE(Save(kOptionsOn));
    EXPECT_THAT(Stored(), ElementsAre(Pair("server signing", "yes"), Pair("advanced_domain_option", "yes"),
                                      Pair("register nic", "eth0,eth1")));
}

TEST_F(AdvancedOptionsSave, Records2617SilentlyWithoutATemporaryName) {
    appliance.FailNth("VLIBCFileITmpName", 1, Fault::Result(-1));
    EXPECT_FALSE(Save(kOptionsOn));
    EXPECT_EQ(step.handler.error, 2617);
    EXPECT_THAT(appliance.Logs(), IsEmpty());
    ExpectUntouched();
}

TEST_F(AdvancedOptionsSave, KeepsAnEarlierError) {
    const std::vector<std::pair<const char*, Fault>> failures = {{"VLIBCSzHashAlloc", Fault::Null()},
                                                                 {"VLIBCSzHashSetValue", Fault::Result(-1)},
                                                                 {"VLIBCFileITmpName", Fault::Result(-1)}};
    for (const auto& failure : failures) {
        StartAnew();
        step.handler.error = 2618;
        appliance.FailNth(failure.first, 1, failure.second);
        EXPECT_FALSE(Save(kOptionsOn)) << failure.first;
        EXPECT_EQ(step.handler.error, 2618) << failure.first;
    }
}

TEST_F(AdvancedOptionsSave, DoesNotLookAtTheLoader) {
    appliance.FailNth("VLIBCFileGetSection", 1, Fault::Result(-1));
    EXPECT_TRUE(Save(kOptionsOn));
    EXPECT_THAT(Stored(), ElementsAre(Pair("advanced_domain_option", "yes"), Pair("register nic", "eth0,eth1")));
}

TEST_F(AdvancedOptionsSave, DoesNotLookAtTheRemovals) {
    appliance.FailNth("VLIBCSzHashRemoveKey", 1, Fault::Result(-1), true);
    EXPECT_TRUE(Save("{}"));
    EXPECT_EQ(step.handler.error, 2600);
    EXPECT_EQ(appliance.CountOf("VLIBCSysRename"), 1);
}

}  // namespace
