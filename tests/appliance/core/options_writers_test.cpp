// Writers of smbinfo.conf side by side, with temporary names of their own or with one that they share: the file is always
// one writer's whole section, and what nobody sets survives.

#include <atomic>
#include <string>
#include <thread>

#include "appliance/base/conf_file.h"
#include "appliance/base/file.h"
#include "tests/appliance/core/core_test.h"

using appliance_test::Fork;
using appliance_test::Hash;
using appliance_test::WaitFor;

namespace {

constexpr char kFormat[] = "    %s=%s\n";

class OptionsWritersTest : public appliance_test::CoreTest {
protected:
    OptionsWritersTest() {
        Put(path, "[global]\n    kept=yes\n    first=0\n    second=0\n");
    }

    std::string path = folder / "smbinfo.conf";

    // One change, as the handlers of requests make it. Each writer sets two keys to one text.
    bool ChangeOnce(bool sharedName, const std::string& text) {
        Hash hash;
        VLIBCFileGetSection(path.c_str(), "global", hash.address());
        VLIBCSzHashSetValue(hash.address(), "first", text.c_str());
        VLIBCSzHashSetValue(hash.address(), "second", text.c_str());
        std::string temporary = path + ".tmp";
        if (sharedName) {
            if (VLIBCFileExist(temporary.c_str()) != 0) {
                VLIBCSysRemove(temporary.c_str());
            }
        } else {
            char name[4095] = {};
            if (VLIBCFileITmpName(path.c_str(), name, sizeof(name)) != 0) {
                return false;
            }
            temporary = name;
        }
        return VLIBCFileAddSection(temporary.c_str(), "global", hash.get(), kFormat) != 0 &&
               VLIBCSysRename(temporary.c_str(), path.c_str()) == 0;
    }

    // Is the file one writer's whole section?
    bool IsWhole() {
        std::string text;
        if (appliance::ReadFile(path, text)) {
            return false;
        }
        const auto section = appliance::ConfFile(text).Section("global");
        return section.size() == 3 && section[0] == std::make_pair(std::string("kept"), std::string("yes")) &&
               section[1].second == section[2].second;
    }
};

TEST_F(OptionsWritersTest, SideBySide) {
    std::vector<pid_t> writers;
    for (int number = 0; number < 4; ++number) {
        writers.push_back(Fork([&, number] {
            std::atomic<int> failed{0};
            std::vector<std::thread> threads;
            for (const bool shared : {false, true}) {
                threads.emplace_back([&, shared] {
                    for (int turn = 0; turn < 40; ++turn) {
                        const std::string text(static_cast<std::size_t>(1 + (number * 977 + turn * 131) % 3000), 'x');
                        // With the shared name a writer may find its file gone, and says so; nothing worse.
                        failed += ChangeOnce(shared, text) || shared ? 0 : 1;
                        failed += IsWhole() ? 0 : 1;
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
        EXPECT_EQ(WaitFor(writer), 0);
    }
    EXPECT_TRUE(IsWhole());
    std::remove((path + ".tmp").c_str());
    EXPECT_THAT(folder.Names(), testing::ElementsAre("smbinfo.conf"));
}

}  // namespace
