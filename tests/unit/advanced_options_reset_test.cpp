// The advanced domain options, switched off in smbinfo.conf, and how both writers of them replace the file.

#include <functional>
#include <string>
#include <vector>

#include "tests/unit/smbinfo_test.h"

namespace {

using fake::Fault;
using ::testing::ElementsAre;
using ::testing::IsEmpty;
using ::testing::Pair;
using unit::ErrorAfter;
using unit::kOptionsOn;
using unit::kSmbInfoPath;
using unit::kSmbInfoTemporary;
using unit::Logs;

class AdvancedOptionsReset : public unit::SmbInfoTest {};

TEST_F(AdvancedOptionsReset, LeavesNoForTheSwitchAndNoInterfaces) {
    for (const bool replaced : {true, false}) {
        state.sectionLoaderReplacesHash = replaced;
        state.hashGrowthReplacesHash = replaced;
        Store({{"server signing", "yes"}, {"advanced_domain_option", "yes"}, {"register nic", "eth7"}, {"x", "y"}});
        EXPECT_EQ(step.handler.RemoveSmbinfoKeys(), 0);
        EXPECT_THAT(Stored(),
                    ElementsAre(Pair("server signing", "yes"), Pair("advanced_domain_option", "no"), Pair("x", "y")));
    }
    EXPECT_EQ(step.handler.error, 2600);
    EXPECT_THAT(appliance.Logs(), IsEmpty());
    EXPECT_FALSE(state.Exists(kSmbInfoTemporary));
}

TEST_F(AdvancedOptionsReset, CreatesTheFileToSayNo) {
    state.keyValueFiles.clear();
    EXPECT_EQ(step.handler.RemoveSmbinfoKeys(), 0);
    EXPECT_THAT(state.keyValueFiles[kSmbInfoPath],
                ElementsAre(Pair("global", ElementsAre(Pair("advanced_domain_option", "no")))));
    EXPECT_EQ(state.sectionFormats[kSmbInfoPath], unit::kSmbLine);
}

TEST_F(AdvancedOptionsReset, AsksThePlatformInThisOrder) {
    Store({{"register nic", "eth7"}});
    step.handler.RemoveSmbinfoKeys();
    EXPECT_THAT(
        appliance.CallTexts(),
        ElementsAre("VLIBCSzHashAlloc(1024)", R"(VLIBCFileGetSection("/usr/vorn/etc/smbinfo.conf", "global", hash))",
                    R"(VLIBCSzHashSetValue(hash, "advanced_domain_option", "no"))",
                    R"(VLIBCSzHashRemoveKey(hash, "register nic"))",
                    R"(VLIBCFileITmpName("/usr/vorn/etc/smbinfo.conf", size 4095))",
                    R"(VLIBCFileAddSection("/usr/vorn/etc/smbinfo.conf.tmp", "global", )"
                    R"({"advanced_domain_option": "no"}, "    %s=%s\x0a"))",
                    R"(VLIBCSysRename("/usr/vorn/etc/smbinfo.conf.tmp", "/usr/vorn/etc/smbinfo.conf"))",
                    "VLIBCSzHashFree(hash)"));
}

TEST_F(AdvancedOptionsReset, FailsWithoutALineOrACodeWhenNoHashIsToBeHad) {
    appliance.FailNth("VLIBCSzHashAlloc", 1, Fault::Null());
    EXPECT_EQ(step.handler.RemoveSmbinfoKeys(), -1);
    EXPECT_EQ(step.handler.error, 2600);
    EXPECT_THAT(appliance.CallTexts(), ElementsAre("VLIBCSzHashAlloc(1024)"));
    ExpectUntouched();
}

TEST_F(AdvancedOptionsReset, Records2617WhenTheHashDoesNotTakeTheSwitch) {
    for (const bool replaced : {true, false}) {
        StartAnew();
        state.hashGrowthReplacesHash = replaced;
        appliance.FailNth("VLIBCSzHashSetValue", 1, Fault::Result(-1));
        EXPECT_EQ(step.handler.RemoveSmbinfoKeys(), -1);
        EXPECT_EQ(step.handler.error, 2617);
        EXPECT_THAT(appliance.Logs(),
                    ElementsAre(Logs("domain.cpp", "%s:%d VLIBCSzHashSetValue() failed [0x%04X %s:%d]",
                                     "VLIBCSzHashSetValue() failed " + ErrorAfter("VLIBCSzHashSetValue"))));
        EXPECT_THAT(appliance.CallTexts(fake::kLogs),
                    ElementsAre("VLIBCSzHashAlloc(1024)",
                                R"(VLIBCFileGetSection("/usr/vorn/etc/smbinfo.conf", "global", hash))",
                                R"(VLIBCSzHashSetValue(hash, "advanced_domain_option", "no"))", "VLIBCErrGet()",
                                "VLIBCErrorGetFile()", "VLIBCErrorGetLine()", "VLIBCSzHashFree(hash)"));
        ExpectUntouched();
    }
}

TEST_F(AdvancedOptionsReset, TakesAPositiveResultOfTheHashForStored) {
    appliance.FailNth("VLIBCSzHashSetValue", 1, Fault::Result(1));
    EXPECT_EQ(step.handler.RemoveSmbinfoKeys(), 0);
    EXPECT_EQ(*fake::FindKey(Stored(), "advanced_domain_option"), "no");
}

TEST_F(AdvancedOptionsReset, DoesNotLookAtTheLoaderAndTheRemoval) {
    appliance.FailNth("VLIBCFileGetSection", 1, Fault::Result(-1));
    appliance.FailNth("VLIBCSzHashRemoveKey", 1, Fault::Result(-1));
    EXPECT_EQ(step.handler.RemoveSmbinfoKeys(), 0);
    EXPECT_THAT(Stored(), ElementsAre(Pair("advanced_domain_option", "no")));
    EXPECT_THAT(appliance.Logs(), IsEmpty());
}

TEST_F(AdvancedOptionsReset, Records2617WithoutATemporaryName) {
    appliance.FailNth("VLIBCFileITmpName", 1, Fault::Result(-1));
    EXPECT_EQ(step.handler.RemoveSmbinfoKeys(), -1);
    EXPECT_EQ(step.handler.error, 2617);
    EXPECT_THAT(appliance.Logs(),
                ElementsAre(Logs("domain.cpp", "%s:%d cannot store smbinfo.conf", "cannot store smbinfo.conf")));
    ExpectUntouched();
}

TEST_F(AdvancedOptionsReset, KeepsAnEarlierError) {
    for (const char* failing : {"VLIBCSzHashSetValue", "VLIBCFileITmpName"}) {
        StartAnew();
        step.handler.error = 2618;
        appliance.FailNth(failing, 1, Fault::Result(-1));
        EXPECT_EQ(step.handler.RemoveSmbinfoKeys(), -1) << failing;
        EXPECT_EQ(step.handler.error, 2618) << failing;
    }
}

// What becomes of the writing and the rename shows neither in the result nor in the log.
class RewriteOfSmbInfo : public unit::SmbInfoTest {
protected:
    const std::vector<std::function<bool()>> writers = {[this] { return Save(kOptionsOn); },
                                                        [this] { return step.handler.RemoveSmbinfoKeys() == 0; }};
};

TEST_F(RewriteOfSmbInfo, TakesEveryResultButMinusOneForAName) {
    for (const auto& write : writers) {
        for (const int result : {1, -2}) {
            StartAnew();
            appliance.FailNth("VLIBCFileITmpName", 1, Fault::Result(result));
            EXPECT_TRUE(write()) << result;
            EXPECT_EQ(appliance.CountOf("VLIBCSysRename"), 1) << result;
            EXPECT_THAT(appliance.Logs(), IsEmpty());
        }
    }
}

TEST_F(RewriteOfSmbInfo, RenamesAlsoWhatCouldNotBeWritten) {
    for (const auto& write : writers) {
        StartAnew();
        Store({{"server signing", "yes"}});
        appliance.FailNth("VLIBCFileAddSection", 1, Fault::Result(0));
        EXPECT_TRUE(write());
        EXPECT_EQ(appliance.CountOf("VLIBCSysRename"), 1);
        EXPECT_EQ(step.handler.error, 2600);
        EXPECT_THAT(appliance.Logs(), IsEmpty());
        EXPECT_THAT(Stored(), ElementsAre(Pair("server signing", "yes")));
    }
}

TEST_F(RewriteOfSmbInfo, LeavesTheTemporaryFileWhenTheRenameFails) {
    for (const auto& write : writers) {
        for (const int result : {-1, 1}) {
            StartAnew();
            Store({{"server signing", "yes"}});
            state.Remove(kSmbInfoTemporary);
            appliance.FailNth("VLIBCSysRename", 1, Fault::Result(result));
            EXPECT_TRUE(write()) << result;
            EXPECT_EQ(step.handler.error, 2600);
            EXPECT_THAT(appliance.Logs(), IsEmpty());
            EXPECT_THAT(Stored(), ElementsAre(Pair("server signing", "yes")));
            EXPECT_TRUE(state.Exists(kSmbInfoTemporary));
        }
    }
}

}  // namespace
