// Capabilities and settings.

#include <filesystem>

#include "appliance/base/paths.h"
#include "appliance/platform/contract.h"
#include "tests/appliance/core/core_test.h"

using appliance::Path;

namespace {

class ConfTest : public appliance_test::CoreTest {
protected:
    ConfTest() {
        std::filesystem::create_directories(folder / "etc");
        std::filesystem::create_directories(folder / "usr/vorn/share");
    }
    std::string capabilities = Path(appliance::kCapabilities);
    std::string settings = Path(appliance::kSettings);
};

TEST_F(ConfTest, EachFromItsFile) {
    Put(capabilities, "supportdomain=YES\nempty=\n");
    Put(settings, "enableduserhome=yes\n");
    VornConf conf;
    EXPECT_STREQ(conf.Def("supportdomain", ""), "YES");
    EXPECT_STREQ(conf.Def("enableduserhome", "fallback"), "fallback");
    EXPECT_STREQ(conf.Def("empty", "fallback"), "");
    EXPECT_STREQ(conf.Info("enableduserhome", ""), "yes");
    EXPECT_STREQ(conf.Info("supportdomain", "no"), "no");
    EXPECT_STREQ(conf.Info("none", nullptr), "");
    EXPECT_STREQ(conf.Info(nullptr, "x"), "x");
}

TEST_F(ConfTest, AsTheFileIsNow) {
    VornConf conf;
    EXPECT_STREQ(conf.Info("enableduserhome", "none"), "none");
    Put(settings, "enableduserhome=yes\n");
    EXPECT_STREQ(conf.Info("enableduserhome", "none"), "yes");
    std::filesystem::remove(settings);
    std::filesystem::create_directory(settings);
    EXPECT_STREQ(conf.Info("enableduserhome", "none"), "none");
}

TEST_F(ConfTest, TheFallbackMayBeTheLastAnswer) {
    Put(settings, "a=" + std::string(200, 'x') + "\n");
    VornConf conf;
    const char* answer = conf.Info("a", "");
    EXPECT_EQ(conf.Info("none", answer), std::string(200, 'x'));
}

TEST_F(ConfTest, Support) {
    EXPECT_FAILS(VLIBCSupportGet("supporttrustdomain"), 0, NotFound);
    Put(capabilities, "supporttrustdomain=yes\nother=no\nloud=YES\n");
    EXPECT_NE(VLIBCSupportGet("supporttrustdomain"), 0);
    EXPECT_FAILS(VLIBCSupportGet("other"), 0, NotFound);
    EXPECT_FAILS(VLIBCSupportGet("loud"), 0, NotFound);
    EXPECT_FAILS(VLIBCSupportGet("none"), 0, NotFound);
    EXPECT_FAILS(VLIBCSupportGet(nullptr), 0, BadArgument);
}

}  // namespace
