// The marker of a refresh that has been asked for: who watches believes root's own file alone.

#include <fcntl.h>
#include <json/value.h>
#include <sys/stat.h>
#include <unistd.h>

#include <filesystem>

#include "appliance/base/paths.h"
#include "appliance/domain/directory/progress.h"
#include "tests/appliance/core/core_test.h"

namespace {

class MarkerTest : public appliance_test::CoreTest {
protected:
    MarkerTest() {
        std::filesystem::create_directory(folder / "tmp");
        std::filesystem::permissions(folder / "tmp", std::filesystem::perms(01777));
    }
    static bool IsBelieved() {
        return !appliance::ShownProgress(Json::Value()).isNull();
    }

    std::string path = appliance::Path(appliance::kUpdatingMarker);
};

TEST_F(MarkerTest, OfTheAppliancesOwn) {
    EXPECT_FALSE(IsBelieved());
    ASSERT_EQ(VLIBCFileTouch(path.c_str()), 0);
    EXPECT_TRUE(IsBelieved());
}

TEST_F(MarkerTest, OfAnotherUser) {
    Put(path, "");
    ASSERT_EQ(chown(path.c_str(), 1, 1), 0);
    EXPECT_FALSE(IsBelieved());
    ASSERT_EQ(VLIBCFileTouch(path.c_str()), 0);
    EXPECT_TRUE(IsBelieved());
}

TEST_F(MarkerTest, ThatIsNoRegularFile) {
    Put(folder / "tmp/file", "");
    ASSERT_EQ(symlink("file", path.c_str()), 0);
    EXPECT_FALSE(IsBelieved());
    ASSERT_EQ(unlink(path.c_str()), 0);
    ASSERT_EQ(mkfifo(path.c_str(), 0600), 0);
    EXPECT_FALSE(IsBelieved());
    ASSERT_EQ(unlink(path.c_str()), 0);
    ASSERT_EQ(mkdir(path.c_str(), 0700), 0);
    EXPECT_FALSE(IsBelieved());
}

}  // namespace
