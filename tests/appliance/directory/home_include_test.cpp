#include "appliance/domain/directory/home_include.h"

#include <sys/stat.h>

#include "appliance/base/conf_file.h"
#include "appliance/base/paths.h"
#include "tests/appliance/directory/directory_test.h"

namespace appliance_test {
namespace {

using appliance::WithUserHomes;

constexpr char kPath[] = "/x/userhome.conf";
constexpr char kLine[] = "    include = /x/userhome.conf";

TEST(WithUserHomesTest, PutsOneLineAtTheEndOfGlobal) {
    EXPECT_EQ(WithUserHomes("[global]\n  a=b\n", kPath, true), "[global]\n  a=b\n" + std::string(kLine) + "\n");
    EXPECT_EQ(WithUserHomes("# top\n[global]\n\ta = b\n\n# share\n[data]\n\tpath = /data\n", kPath, true),
              "# top\n[global]\n\ta = b\n" + std::string(kLine) + "\n\n# share\n[data]\n\tpath = /data\n");
    EXPECT_EQ(WithUserHomes("[global]\n", kPath, true), "[global]\n" + std::string(kLine) + "\n");
    EXPECT_EQ(WithUserHomes("[global]\n a = one \\\n two\n[data]\n", kPath, true),
              "[global]\n a = one \\\n two\n" + std::string(kLine) + "\n[data]\n");
}

TEST(WithUserHomesTest, TakesItAwayAgainByteForByte) {
    for (const std::string text :
         {"[global]\n  a=b\n", "[global]\n  a=b", "[global]", "[global]\r\n\ta=b\r\n[data]\r\n",
          "a=b\n[Global]\nc=d\n\n\n", "[global]\n\tinclude = /usr/vorn/etc/smbinfo.conf\n[data]\n path=/\n",
          "[global]\n;c\n# d\n\n"}) {
        const auto with = WithUserHomes(text, kPath, true);
        ASSERT_TRUE(with) << text;
        EXPECT_NE(*with, text);
        EXPECT_EQ(WithUserHomes(*with, kPath, true), *with) << "once is enough";
        EXPECT_EQ(WithUserHomes(*with, kPath, false), text);
        EXPECT_EQ(WithUserHomes(text, kPath, false), text);
    }
}

TEST(WithUserHomesTest, KnowsTheLineHoweverItIsWritten) {
    EXPECT_EQ(WithUserHomes("[global]\nINCLUDE=/x/userhome.conf\na=b\n", kPath, true),
              "[global]\nINCLUDE=/x/userhome.conf\na=b\n");
    EXPECT_EQ(WithUserHomes("[global]\n in clude =  /x/userhome.conf \na=b\n", kPath, false), "[global]\na=b\n");
    EXPECT_EQ(WithUserHomes("[global]\n# include = /x/userhome.conf\n", kPath, false),
              "[global]\n# include = /x/userhome.conf\n");
}

TEST(WithUserHomesTest, RefusesAFileWithoutAPlace) {
    for (const char* text : {"", "a=b\n", "[data]\npath=/\n", "[global]\na = b \\\n", "[global]\na = b \\"}) {
        EXPECT_FALSE(WithUserHomes(text, kPath, true)) << text;
        EXPECT_EQ(WithUserHomes(text, kPath, false), text);
    }
}

class HomeIncludeTest : public DirectoryTest {};

TEST_F(HomeIncludeTest, WritesTheSectionAndTheLine) {
    const std::string conf = "[global]\n\tworkgroup = LAB\n[data]\n\tpath = /data\n";
    Put(appliance::Path(appliance::kSmbConf), conf);
    chmod(appliance::Path(appliance::kSmbConf).c_str(), 0640);
    bool changed = false;
    ASSERT_FALSE(appliance::IncludeUserHomes(true, changed));
    EXPECT_TRUE(changed);
    const std::string homes = appliance::Path(appliance::kUserHomeConf);
    EXPECT_EQ(Got(appliance::Path(appliance::kSmbConf)),
              "[global]\n\tworkgroup = LAB\n    include = " + homes + "\n[data]\n\tpath = /data\n");
    struct stat status {};
    ASSERT_EQ(stat(appliance::Path(appliance::kSmbConf).c_str(), &status), 0);
    EXPECT_EQ(status.st_mode & 07777, 0640u);

    appliance::ConfFile section(Got(homes));
    EXPECT_EQ(section.Sections(), (std::vector<std::string>{"homes", "global"}));
    EXPECT_EQ(section.Get("homes", "browseable"), "no");
    EXPECT_EQ(section.Get("homes", "valid users"), "%D%w%S");
    EXPECT_TRUE(section.Section("global").empty());  // only turns back

    ASSERT_FALSE(appliance::IncludeUserHomes(true, changed));
    EXPECT_FALSE(changed);
    Put(homes, "something else");
    ASSERT_FALSE(appliance::IncludeUserHomes(true, changed));
    EXPECT_EQ(Got(homes), section.text());
    ASSERT_FALSE(appliance::IncludeUserHomes(false, changed));
    EXPECT_TRUE(changed);
    EXPECT_EQ(Got(appliance::Path(appliance::kSmbConf)), conf);
    ASSERT_FALSE(appliance::IncludeUserHomes(false, changed));
    EXPECT_FALSE(changed);
}

TEST_F(HomeIncludeTest, FailsWithEverythingAsItWas) {
    bool changed = true;
    EXPECT_EQ(appliance::IncludeUserHomes(true, changed), std::errc::no_such_file_or_directory);
    EXPECT_FALSE(changed);
    Put(appliance::Path(appliance::kSmbConf), "[data]\n\tpath = /data\n");
    EXPECT_TRUE(appliance::IncludeUserHomes(true, changed));
    EXPECT_EQ(Got(appliance::Path(appliance::kSmbConf)), "[data]\n\tpath = /data\n");
    EXPECT_EQ(Got(appliance::Path(appliance::kUserHomeConf)), "<missing>");
}

TEST_F(HomeIncludeTest, MakesNoFolderForWhoBelongsToNoDomain) {
    MakeMember(true);
    EXPECT_EQ(appliance::MakeUserHome("root"), "root is no user of a domain");
    EXPECT_EQ(appliance::MakeUserHome("nobody-of-this-name"), "nobody-of-this-name: no such account");
    EXPECT_NE(appliance::MakeUserHome("a\nb"), "");
    EXPECT_NE(appliance::MakeUserHome("-rf"), "");
    EXPECT_NE(appliance::MakeUserHome(""), "");
}

}  // namespace
}  // namespace appliance_test
