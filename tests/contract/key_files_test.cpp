// The reader and the remover of single keys.

#include <sys/stat.h>

#include "contract_test.h"

using contract::GuardedBuffer;
using contract::ReadFile;

namespace {

class KeyFiles : public testing::Test {
protected:
    // The value of a key of a file with this content, or "(none)".
    std::string ValueIn(const std::string& content, const std::string& key) {
        const std::string path = folder.Put("file.conf", content);
        GuardedBuffer buffer(256);
        const int result = VLIBCFileGetKeyValue(path.c_str(), key.c_str(), buffer.data(), buffer.size(), 0);
        EXPECT_TRUE(buffer.GuardsStand());
        if (result <= 0) {
            return "(none)";
        }
        EXPECT_TRUE(buffer.IsTerminated());
        EXPECT_EQ(static_cast<std::size_t>(result), buffer.Text().size());
        return buffer.Text();
    }

    contract::Folder folder;
};

TEST_F(KeyFiles, AFileWithoutSections) {
    EXPECT_EQ(ValueIn("first=1\nsecond=2\n", "first"), "1");
    EXPECT_EQ(ValueIn("first=1\nsecond=2\n", "second"), "2");
    EXPECT_EQ(ValueIn("first=1\nsecond=2", "second"), "2") << "the last line has no end";
}

TEST_F(KeyFiles, TheSectionGlobalIsMeant) {
    EXPECT_EQ(ValueIn("[global]\n    security = ads\n", "security"), "ads");
    EXPECT_EQ(ValueIn("[Global]\nsecurity = ads\n", "security"), "ads");
    EXPECT_EQ(ValueIn("[homes]\nsecurity = wrong\n[global]\nsecurity = ads\n", "security"), "ads");
    EXPECT_EQ(ValueIn("[global]\nsecurity = ads\n[homes]\nsecurity = wrong\n", "security"), "ads");
    EXPECT_EQ(ValueIn("[global]\nother = x\n[homes]\nsecurity = wrong\n", "security"), "(none)");
}

TEST_F(KeyFiles, TheLastOfSeveralCounts) {
    EXPECT_EQ(ValueIn("key=first\nkey=last\n", "key"), "last");
    EXPECT_EQ(ValueIn("[global]\nkey=first\n[other]\nkey=wrong\n[global]\nKEY = last\n", "key"), "last");
}

TEST_F(KeyFiles, KeysAreReadWithoutRegardToCase) {
    EXPECT_EQ(ValueIn("Vorn Sync DCTime = yes\n", "vorn sync dctime"), "yes");
    EXPECT_EQ(ValueIn("realm = LAB.TEST\n", "Realm"), "LAB.TEST");
}

TEST_F(KeyFiles, BlanksAtTheEndsAreNoPartOfIt) {
    EXPECT_EQ(ValueIn("  key  =  a value with  blanks  \n", "key"), "a value with  blanks");
    EXPECT_EQ(ValueIn("\tkey\t=\tvalue\t\n", "key"), "value");
}

TEST_F(KeyFiles, AKeyIsNotAPartOfAnother) {
    EXPECT_EQ(ValueIn("realm name=wrong\nmy realm=wrong\nrealms=wrong\n", "realm"), "(none)");
}

TEST_F(KeyFiles, OnlyTheFirstEqualsSignDivides) {
    EXPECT_EQ(ValueIn("filter=(&(cn=a)(b=c))\n", "filter"), "(&(cn=a)(b=c))");
}

TEST_F(KeyFiles, CommentsAreNotRead) {
    EXPECT_EQ(ValueIn("#key=wrong\n;key=wrong\n  # key = wrong\n", "key"), "(none)");
    EXPECT_EQ(ValueIn("key=right\n# key=wrong\n", "key"), "right");
}

TEST_F(KeyFiles, LinesWithoutAKeyDoNoHarm) {
    EXPECT_EQ(ValueIn("\n\nnonsense\n=\n= value\n[\n[]\nkey=value\n", "nonsense"), "(none)");
    EXPECT_EQ(ValueIn("\n\nnonsense\nkey=value\n\n", "key"), "value");
}

TEST_F(KeyFiles, WhatIsNotThereIsNoValue) {
    char value[32] = {};
    const std::string path = folder.Put("file.conf", "key=value\nempty=\nblank=   \n");
    for (const char* key : {"missing", "empty", "blank"}) {
        EXPECT_EQ(FAILING(VLIBCFileGetKeyValue(path.c_str(), key, value, sizeof value, 0)), 0) << key;
    }
}

TEST_F(KeyFiles, WithoutAFileThereIsNoValue) {
    char value[32] = {};
    EXPECT_LE(FAILING(VLIBCFileGetKeyValue((folder / "none").c_str(), "key", value, sizeof value, 0)), 0);
    EXPECT_LE(FAILING(VLIBCFileGetKeyValue((folder / "").c_str(), "key", value, sizeof value, 0)), 0) << "a folder";
    EXPECT_LE(FAILING(VLIBCFileGetKeyValue((folder / "none/none").c_str(), "key", value, sizeof value, 0)), 0);
}

TEST_F(KeyFiles, AnEmptyFileHasNoKeys) {
    EXPECT_EQ(ValueIn("", "key"), "(none)");
}

TEST_F(KeyFiles, ALongValueIsCutAndTerminated) {
    const std::string path = folder.Put("file.conf", "key=0123456789\n");
    for (int size = 2; size <= 12; ++size) {
        GuardedBuffer buffer(size);
        ASSERT_GT(VLIBCFileGetKeyValue(path.c_str(), "key", buffer.data(), buffer.size(), 0), 0) << size;
        ASSERT_TRUE(buffer.GuardsStand()) << size;
        ASSERT_TRUE(buffer.IsTerminated()) << size;
        EXPECT_EQ(buffer.Text(), std::string("0123456789").substr(0, static_cast<std::size_t>(size) - 1)) << size;
    }
}

TEST_F(KeyFiles, ABufferOfOneByteHoldsTheEmptyText) {
    const std::string path = folder.Put("file.conf", "key=value\n");
    GuardedBuffer buffer(1);
    VLIBCFileGetKeyValue(path.c_str(), "key", buffer.data(), buffer.size(), 0);
    EXPECT_TRUE(buffer.GuardsStand());
    EXPECT_EQ(buffer.data()[0], '\0');
}

TEST_F(KeyFiles, ALongLineIsReadWhole) {
    const std::string value(20000, 'v');
    const std::string path = folder.Put("file.conf", "long=" + value + "\nkey=after\n");
    GuardedBuffer buffer(30000);
    ASSERT_GT(VLIBCFileGetKeyValue(path.c_str(), "long", buffer.data(), buffer.size(), 0), 0);
    EXPECT_EQ(buffer.Text(), value);
    ASSERT_GT(VLIBCFileGetKeyValue(path.c_str(), "key", buffer.data(), buffer.size(), 0), 0);
    EXPECT_EQ(buffer.Text(), "after");
}

TEST_F(KeyFiles, BytesAreNotRecoded) {
    EXPECT_EQ(ValueIn("key=\xC3\xA4\xFF\x80 z\n", "key"), "\xC3\xA4\xFF\x80 z");
}

TEST_F(KeyFiles, AKeyIsRemovedAndNothingElse) {
    const std::string path = folder.Put("file.conf", "# why\nfirst=1\ndomain_dns=192.0.2.1\n  last = 3 \n");
    ASSERT_GE(SUCCEEDING(VLIBCFileRemoveKey(path.c_str(), "domain_dns")), 0);
    EXPECT_EQ(ReadFile(path), "# why\nfirst=1\n  last = 3 \n");
}

TEST_F(KeyFiles, AllOfAKeyAreRemoved) {
    const std::string path = folder.Put("file.conf", "key=1\nother=2\nKEY = 3\nkey=4\n");
    ASSERT_GE(VLIBCFileRemoveKey(path.c_str(), "key"), 0);
    EXPECT_EQ(ReadFile(path), "other=2\n");
}

TEST_F(KeyFiles, RemovingLeavesAFileWithoutTheKeyAlone) {
    const std::string path = folder.Put("file.conf", "keys=1\nmy key=2\n");
    VLIBCFileRemoveKey(path.c_str(), "key");
    EXPECT_EQ(ReadFile(path), "keys=1\nmy key=2\n");
}

TEST_F(KeyFiles, RemovingKeepsTheMode) {
    const std::string path = folder.Put("file.conf", "key=1\nother=2\n");
    ASSERT_EQ(chmod(path.c_str(), 0640), 0);
    ASSERT_GE(VLIBCFileRemoveKey(path.c_str(), "key"), 0);
    struct stat found {};
    ASSERT_EQ(stat(path.c_str(), &found), 0);
    EXPECT_EQ(found.st_mode & 07777, 0640U);
}

TEST_F(KeyFiles, RemovingFromNoFileFailsAndMakesNone) {
    EXPECT_EQ(FAILING(VLIBCFileRemoveKey((folder / "none").c_str(), "key")), -1);
    EXPECT_EQ(ReadFile(folder / "none"), "(missing)");
}

}  // namespace
