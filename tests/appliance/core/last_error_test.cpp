// The last error is the calling thread's own.

#include <atomic>
#include <thread>

#include "tests/appliance/core/core_test.h"

namespace {

TEST(LastError, NoneAtFirst) {
    std::thread([] {
        EXPECT_EQ(VLIBCErrGet(), 0);
        EXPECT_STREQ(VLIBCErrorGetFile(), "");
        EXPECT_EQ(VLIBCErrorGetLine(), 0);
    }).join();
}

TEST(LastError, AsItWasSet) {
    static const char name[] = "constant.c";
    VLIBCErrSetEx(0x1234, name, 77);
    EXPECT_EQ(VLIBCErrGet(), 0x1234);
    EXPECT_EQ(VLIBCErrorGetFile(), name);
    EXPECT_EQ(VLIBCErrorGetLine(), 77);
    VLIBCErrSetEx(1, nullptr, 2);
    EXPECT_STREQ(VLIBCErrorGetFile(), "");
}

TEST(LastError, OfEachThread) {
    static const char* const names[] = {"0", "1", "2", "3", "4", "5", "6", "7"};
    std::atomic<int> wrong{0};
    std::vector<std::thread> threads;
    for (int number = 0; number < 8; ++number) {
        threads.emplace_back([&wrong, number] {
            for (int turn = 0; turn < 2000; ++turn) {
                VLIBCErrSetEx(number * 10000 + turn, names[number], turn);
                std::this_thread::yield();
                wrong += VLIBCErrGet() == number * 10000 + turn && VLIBCErrorGetFile() == names[number] &&
                                 VLIBCErrorGetLine() == turn
                             ? 0
                             : 1;
            }
        });
    }
    for (std::thread& thread : threads) {
        thread.join();
    }
    EXPECT_EQ(wrong, 0);
}

TEST(LastError, OfAFailureInOneThreadOnly) {
    VLIBCErrSetEx(7, "mine", 8);
    std::thread([] { EXPECT_FAILS(VLIBCReadPidFile("/nonexistent"), -1, NotFound); }).join();
    EXPECT_EQ(VLIBCErrGet(), 7);
    EXPECT_STREQ(VLIBCErrorGetFile(), "mine");
    EXPECT_EQ(VLIBCErrorGetLine(), 8);
}

}  // namespace
