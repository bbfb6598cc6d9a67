// The writing of smbinfo.conf by "set" of the domain options, under a temporary name of its own.

#include <string>
#include <vector>

#include "src/domain.h"
#include "tests/unit/handler_step.h"

namespace {

using fake::Fault;
using ::testing::ElementsAre;
using ::testing::IsEmpty;
using ::testing::Pair;
using unit::kSmbInfoPath;
using unit::kSmbInfoTemporary;

constexpr const char* kExists = R"(VLIBCFileExist("/usr/vorn/etc/smbinfo.conf.tmp"))";
constexpr const char* kRemoves = R"(VLIBCSysRemove("/usr/vorn/etc/smbinfo.conf.tmp"))";
constexpr const char* kWrites =
    R"(VLIBCFileAddSection("/usr/vorn/etc/smbinfo.conf.tmp", "global", {"key": "value"}, "    %s=%s\x0a"))";
constexpr const char* kRenames = R"(VLIBCSysRename("/usr/vorn/etc/smbinfo.conf.tmp", "/usr/vorn/etc/smbinfo.conf"))";

class OptionsWrite : public unit::ModuleTest {
protected:
    OptionsWrite() {
        state.keyValueFiles[kSmbInfoPath]["global"] = {{"old", "value"}};
    }

    // Writes a hash of one key and gives the calls that this took.
    std::vector<std::string> Write() {
        VLIBSZHASH* hash = VLIBCSzHashAlloc(8);
        VLIBCSzHashSetValue(&hash, "key", "value");
        const std::size_t before = appliance.Calls().size();
        written = step.handler.SaveSmbAdvConf(hash);
        std::vector<std::string> calls = appliance.CallTexts();
        calls.erase(calls.begin(), calls.begin() + static_cast<std::ptrdiff_t>(before));
        VLIBCSzHashFree(hash);
        EXPECT_EQ(step.handler.error, 2600);
        EXPECT_THAT(appliance.Logs(), IsEmpty());
        return calls;
    }

    void ExpectOldFile() {
        EXPECT_THAT(state.keyValueFiles[kSmbInfoPath], ElementsAre(Pair("global", ElementsAre(Pair("old", "value")))));
    }

    void ExpectNewFile() {
        EXPECT_THAT(state.keyValueFiles[kSmbInfoPath], ElementsAre(Pair("global", ElementsAre(Pair("key", "value")))));
        EXPECT_EQ(state.sectionFormats[kSmbInfoPath], unit::kSmbLine);
        EXPECT_FALSE(state.Exists(kSmbInfoTemporary));
    }

    unit::Step<DomainServiceHandler> step;
    bool written = false;
};

TEST_F(OptionsWrite, ReplacesTheFileByARename) {
    EXPECT_THAT(Write(), ElementsAre(kExists, kWrites, kRenames));
    EXPECT_TRUE(written);
    ExpectNewFile();
}

TEST_F(OptionsWrite, RemovesATemporaryFileThatWasLeftBehind) {
    state.keyValueFiles[kSmbInfoTemporary]["left over"] = {{"a", "b"}};
    EXPECT_THAT(Write(), ElementsAre(kExists, kRemoves, kWrites, kRenames));
    EXPECT_TRUE(written);
    ExpectNewFile();
}

TEST_F(OptionsWrite, TakesEveryResultButZeroForALeftOverFile) {
    for (const int result : {1, 2, -1}) {
        Restart();
        appliance.FailNth("VLIBCFileExist", 1, Fault::Result(result));
        EXPECT_THAT(Write(), ElementsAre(kExists, kRemoves, kWrites, kRenames)) << result;
        EXPECT_TRUE(written);
    }
}

TEST_F(OptionsWrite, LeavesOtherTemporaryFilesAlone) {
    state.files.insert("/usr/vorn/etc/smbinfo.conf.tm");
    state.files.insert("/usr/vorn/etc/smbinfo.conf.tmp.tmp");
    EXPECT_THAT(Write(), ElementsAre(kExists, kWrites, kRenames));
    EXPECT_EQ(state.files.size(), 2U);
}

TEST_F(OptionsWrite, GoesOnWhenTheLeftOverFileStays) {
    state.files.insert(kSmbInfoTemporary);
    appliance.FailNth("VLIBCSysRemove", 1, Fault::Result(-1));
    EXPECT_THAT(Write(), ElementsAre(kExists, kRemoves, kWrites, kRenames));
    EXPECT_TRUE(written);
}

TEST_F(OptionsWrite, FailsWhenTheWriterAnswersZero) {
    appliance.FailNth("VLIBCFileAddSection", 1, Fault::Result(0));
    EXPECT_THAT(Write(), ElementsAre(kExists, kWrites));
    EXPECT_FALSE(written);
    ExpectOldFile();
}

TEST_F(OptionsWrite, TakesEveryOtherResultOfTheWriterForWritten) {
    for (const int result : {1, -1}) {
        appliance.FailNth("VLIBCFileAddSection", 1, Fault::Result(result));
        EXPECT_THAT(Write(), ElementsAre(kExists, kWrites, kRenames)) << result;
        EXPECT_TRUE(written) << result;
        ExpectNewFile();
        Restart();
    }
}

TEST_F(OptionsWrite, FailsWhenTheRenameAnswersAnythingButZero) {
    for (const int result : {-1, 1}) {
        Restart();
        state.keyValueFiles[kSmbInfoPath]["global"] = {{"old", "value"}};
        appliance.FailNth("VLIBCSysRename", 1, Fault::Result(result));
        EXPECT_THAT(Write(), ElementsAre(kExists, kWrites, kRenames)) << result;
        EXPECT_FALSE(written);
        ExpectOldFile();
        EXPECT_THAT(state.keyValueFiles[kSmbInfoTemporary],
                    ElementsAre(Pair("global", ElementsAre(Pair("key", "value")))));
    }
}

TEST_F(OptionsWrite, UpdatesTheAdministratorsAfterTheRename) {
    step.handler.needAddDomainAdminGroup = true;
    EXPECT_THAT(Write(),
                ElementsAre(kExists, kWrites, kRenames, "VORNGroupAddDomainAdminGroup()", "VLIBServiceTypeReload(8)"));
    EXPECT_TRUE(written);
}

TEST_F(OptionsWrite, UpdatesTheAdministratorsAlsoWhenTheRenameFails) {
    for (const int result : {-1, 1}) {
        Restart();
        step.handler.needAddDomainAdminGroup = true;
        appliance.FailNth("VLIBCSysRename", 1, Fault::Result(result));
        EXPECT_THAT(Write(), ElementsAre(kExists, kWrites, kRenames, "VORNGroupAddDomainAdminGroup()",
                                         "VLIBServiceTypeReload(8)"));
        EXPECT_FALSE(written);
    }
}

TEST_F(OptionsWrite, DoesNotUpdateTheAdministratorsWhenNothingCouldBeWritten) {
    step.handler.needAddDomainAdminGroup = true;
    appliance.FailNth("VLIBCFileAddSection", 1, Fault::Result(0));
    EXPECT_THAT(Write(), ElementsAre(kExists, kWrites));
    EXPECT_FALSE(written);
}

}  // namespace
