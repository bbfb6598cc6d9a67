// The settings file and its lock.

#include "appliance/base/settings.h"

#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <algorithm>
#include <atomic>
#include <csignal>
#include <filesystem>
#include <thread>

#include "appliance/base/paths.h"
#include "tests/appliance/base/temporary_folder.h"

using appliance::Path;
using appliance::SettingsLock;
using std::chrono::milliseconds;

namespace {

class SettingsTest : public appliance_test::FolderTest {
protected:
    SettingsTest() {
        std::filesystem::create_directory(folder / "etc");
    }
    std::string path = Path(appliance::kSettings);
};

bool FreeForAnotherThread() {
    bool isFree = false;
    std::thread([&] { isFree = SettingsLock::Take(milliseconds(0)).has_value(); }).join();
    return isFree;
}

TEST_F(SettingsTest, PathsLieUnderTheRoot) {
    EXPECT_EQ(path, folder / "etc/vorninfo.conf");
    appliance::SetRoot("");
    EXPECT_EQ(Path(appliance::kSettings), "/etc/vorninfo.conf");
}

TEST_F(SettingsTest, ReadAndWritten) {
    std::error_code error;
    EXPECT_FALSE(appliance::Setting("trustdomain", error));
    EXPECT_FALSE(error);
    Put(path, "# mine\ntrustdomain=yes\n other = x\n");
    EXPECT_EQ(appliance::Setting("trustdomain", error), "yes");
    EXPECT_FALSE(appliance::SetSetting("trustdomain", "no"));
    EXPECT_FALSE(appliance::SetSetting("domain_dns", "10.0.0.1,10.0.0.2"));
    EXPECT_EQ(Got(path), "# mine\ntrustdomain=no\n other = x\n domain_dns = 10.0.0.1,10.0.0.2\n");
    EXPECT_FALSE(appliance::RemoveSetting("domain_dns"));
    EXPECT_FALSE(appliance::RemoveSetting("domain_dns"));
    EXPECT_EQ(Got(path), "# mine\ntrustdomain=no\n other = x\n");
    EXPECT_EQ(appliance::SetSetting("a", "1\nb=2"), std::errc::invalid_argument);
    EXPECT_EQ(Got(path), "# mine\ntrustdomain=no\n other = x\n");
    EXPECT_TRUE(FreeForAnotherThread());
}

TEST_F(SettingsTest, AFileThatCannotBeRead) {
    std::filesystem::create_directory(path);
    std::error_code error;
    EXPECT_FALSE(appliance::Setting("trustdomain", error));
    EXPECT_EQ(error, std::errc::is_a_directory);
    EXPECT_EQ(appliance::SetSetting("a", "1"), std::errc::is_a_directory);
}

TEST_F(SettingsTest, ItsThreadMayTakeTheLockAgain) {
    const auto first = SettingsLock::Take(milliseconds(0));
    ASSERT_TRUE(first);
    {
        const auto second = SettingsLock::Take(milliseconds(0));
        ASSERT_TRUE(second);
        EXPECT_FALSE(appliance::SetSetting("a", "1"));
        EXPECT_FALSE(FreeForAnotherThread());
    }
    EXPECT_FALSE(FreeForAnotherThread());
}

TEST_F(SettingsTest, FreeWhenEachWasGivenBack) {
    {
        auto first = SettingsLock::Take(milliseconds(0));
        const auto second = SettingsLock::Take(milliseconds(0));
        const SettingsLock moved = std::move(*first);
        first.reset();
        EXPECT_FALSE(FreeForAnotherThread());
    }
    EXPECT_TRUE(FreeForAnotherThread());
    SettingsLock::Take(milliseconds(0))->Detach();
    EXPECT_FALSE(FreeForAnotherThread());
    EXPECT_TRUE(SettingsLock::Release());
    EXPECT_FALSE(SettingsLock::Release());
    EXPECT_TRUE(FreeForAnotherThread());
}

TEST_F(SettingsTest, EndsWithItsThread) {
    std::thread([] { SettingsLock::Take(milliseconds(0))->Detach(); }).join();
    EXPECT_TRUE(SettingsLock::Take(milliseconds(0)));
}

TEST_F(SettingsTest, NoWriteWhileAnotherHoldsTheLock) {
    const pid_t holder = appliance_test::Fork([&] {
        SettingsLock::Take(milliseconds(0))->Detach();
        Put(folder / "held", "");
        pause();
        return true;
    });
    ASSERT_TRUE(appliance_test::Eventually([&] { return Got(folder / "held").empty(); }));
    EXPECT_EQ(appliance::SetSetting("a", "1"), std::errc::timed_out);
    EXPECT_EQ(Got(path), "<missing>");
    kill(holder, SIGKILL);
    appliance_test::WaitFor(holder);
    EXPECT_FALSE(appliance::SetSetting("a", "1"));
    EXPECT_EQ(Got(path), "a=1\n");
}

TEST_F(SettingsTest, WritersDoNotLoseOneAnothersKeys) {
    std::vector<pid_t> writers;
    for (const char* name : {"a", "b", "c"}) {
        writers.push_back(appliance_test::Fork([name] {
            std::vector<std::thread> threads;
            std::atomic<int> failed{0};
            for (int thread = 0; thread < 2; ++thread) {
                threads.emplace_back([&failed, name, thread] {
                    for (int turn = 0; turn < 10; ++turn) {
                        const std::string key = name + std::to_string(thread) + "." + std::to_string(turn);
                        failed += appliance::SetSetting(key, "1") ? 1 : 0;
                    }
                });
            }
            for (std::thread& thread : threads) {
                thread.join();
            }
            return failed == 0;
        }));
    }
    for (const pid_t writer : writers) {
        EXPECT_EQ(appliance_test::WaitFor(writer), 0);
    }
    const std::string text = Got(path);
    EXPECT_EQ(std::count(text.begin(), text.end(), '\n'), 60);
}

}  // namespace
