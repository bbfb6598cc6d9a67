// Single keys of files: read, and removed.

#include <filesystem>

#include "tests/appliance/core/core_test.h"

using appliance_test::Hash;

namespace {

class ValuesTest : public appliance_test::CoreTest {
protected:
    std::string path = folder / "smb.conf";

    std::string Value(const char* key) {
        char value[64] = {};
        const int length = VLIBCFileGetKeyValue(path.c_str(), key, value, sizeof(value), 0);
        return length > 0 ? std::string(value, static_cast<std::size_t>(length)) : "<" + std::to_string(length) + ">";
    }
};

TEST_F(ValuesTest, OfTheGlobalSection) {
    Put(path,
        "realm = HEADLESS\n[global]\n\tPassword Server =  10.0.0.1 "
        "\r\nempty=\n[homes]\nworkgroup=NO\n[GLOBAL]\nrealm=*\n");
    EXPECT_EQ(Value("password server"), "10.0.0.1");
    EXPECT_EQ(Value("realm"), "*");
    EXPECT_EQ(Value("workgroup"), "<0>");
    EXPECT_EQ(Value("empty"), "<0>");
    EXPECT_EQ(Value(""), "<0>");
}

TEST_F(ValuesTest, OfAFileWithoutSections) {
    Put(path, "trustdomain=yes\ndomain_dns=10.0.0.1,10.0.0.2");
    EXPECT_EQ(Value("trustdomain"), "yes");
    EXPECT_EQ(Value("domain_dns"), "10.0.0.1,10.0.0.2");
}

TEST_F(ValuesTest, IncludesAreNotFollowed) {
    Put(folder / "other.conf", "[global]\nrealm = OTHER\n");
    Put(path, "[global]\ninclude = " + folder / "other.conf" + "\n");
    EXPECT_EQ(Value("realm"), "<0>");
    Hash hash;
    EXPECT_SUCCEEDS(VLIBCFileGetSection(path.c_str(), "global", hash.address()), 0);
    EXPECT_EQ(hash.Value("realm"), "<none>");
    EXPECT_EQ(hash.Value("include"), folder / "other.conf");
}

TEST_F(ValuesTest, CutToTheBuffer) {
    Put(path, "a=0123456789\n");
    char value[12];
    for (const int size : {1, 2, 5, 10, 11, 12}) {
        std::fill(std::begin(value), std::end(value), 'x');
        EXPECT_SUCCEEDS(VLIBCFileGetKeyValue(path.c_str(), "a", value, size, 0), std::min(size - 1, 10));
        EXPECT_EQ(std::string(value), std::string("0123456789").substr(0, static_cast<std::size_t>(size) - 1));
        if (size < 12) {
            EXPECT_EQ(value[size], 'x') << size;
        }
    }
}

TEST_F(ValuesTest, BytesArePassedAsTheyAre) {
    Put(path, "a=\xC3\xA4\xFF\x01\nb=x\tz\n");
    EXPECT_EQ(Value("a"), "\xC3\xA4\xFF\x01");
    EXPECT_EQ(Value("b"), "x\tz");
    Put(path, std::string("a=x\0y\n", 6));
    EXPECT_EQ(Value("a"), "x");
}

TEST_F(ValuesTest, WhatCannotBeRead) {
    char value[8] = {};
    EXPECT_FAILS(VLIBCFileGetKeyValue(path.c_str(), "a", value, 8, 0), -1, NotFound);
    Put(path, "b=1\n");
    EXPECT_FAILS(VLIBCFileGetKeyValue(path.c_str(), "a", value, 8, 0), 0, NotFound);
    EXPECT_FAILS(VLIBCFileGetKeyValue(folder.path().c_str(), "a", value, 8, 0), -1, FileRead);
    EXPECT_FAILS(VLIBCFileGetKeyValue(path.c_str(), "b", value, 0, 0), -1, BadArgument);
    EXPECT_FAILS(VLIBCFileGetKeyValue(path.c_str(), "b", value, -1, 0), -1, BadArgument);
    EXPECT_FAILS(VLIBCFileGetKeyValue(path.c_str(), "b", nullptr, 8, 0), -1, BadArgument);
    EXPECT_FAILS(VLIBCFileGetKeyValue(path.c_str(), nullptr, value, 8, 0), -1, BadArgument);
    EXPECT_FAILS(VLIBCFileGetKeyValue(nullptr, "b", value, 8, 0), -1, BadArgument);
    EXPECT_FAILS(VLIBCFileGetKeyValue(path.c_str(), "b", value, 8, 1), -1, BadArgument);
}

TEST_F(ValuesTest, ASectionIsLoaded) {
    Put(path, "a=1\n[global]\nB b=2\na=3\n[x]\nc=4\n");
    Hash hash{{"a", "old"}, {"kept", "yes"}};
    EXPECT_SUCCEEDS(VLIBCFileGetSection(path.c_str(), "Global", hash.address()), 0);
    EXPECT_EQ(hash.Value("a"), "3");
    EXPECT_EQ(hash.Value("bb"), "2");
    EXPECT_EQ(hash.Value("kept"), "yes");
    EXPECT_EQ(hash.Value("c"), "<none>");
    Hash other;
    EXPECT_SUCCEEDS(VLIBCFileGetSection(path.c_str(), "none", other.address()), 0);
    EXPECT_SUCCEEDS(VLIBCFileGetSection((folder / "none").c_str(), "global", other.address()), 0);
    EXPECT_EQ(other.Value("a"), "<none>");
    EXPECT_FAILS(VLIBCFileGetSection(folder.path().c_str(), "global", other.address()), -1, FileRead);
    EXPECT_FAILS(VLIBCFileGetSection(nullptr, "global", other.address()), -1, BadArgument);
    EXPECT_FAILS(VLIBCFileGetSection(path.c_str(), nullptr, other.address()), -1, BadArgument);
    EXPECT_FAILS(VLIBCFileGetSection(path.c_str(), "global", nullptr), -1, BadArgument);
}

TEST_F(ValuesTest, AKeyIsRemoved) {
    Put(path, "# c\na=1\nb=2\n A = \\\n 3\n[x]\na=4\n");
    EXPECT_SUCCEEDS(VLIBCFileRemoveKey(path.c_str(), "a"), 0);
    EXPECT_EQ(Got(path), "# c\nb=2\n[x]\na=4\n");
    EXPECT_SUCCEEDS(VLIBCFileRemoveKey(path.c_str(), "a"), 0);
    EXPECT_EQ(Got(path), "# c\nb=2\n[x]\na=4\n");
    EXPECT_FAILS(VLIBCFileRemoveKey((folder / "none").c_str(), "a"), -1, NotFound);
    EXPECT_FAILS(VLIBCFileRemoveKey(folder.path().c_str(), "a"), -1, FileRead);
    EXPECT_FAILS(VLIBCFileRemoveKey(nullptr, "a"), -1, BadArgument);
    EXPECT_FAILS(VLIBCFileRemoveKey(path.c_str(), nullptr), -1, BadArgument);
    EXPECT_THAT(folder.Names(), testing::ElementsAre("smb.conf"));
}

}  // namespace
