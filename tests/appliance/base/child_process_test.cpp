// The owner of a child process.

#include "appliance/base/child_process.h"

#include <gtest/gtest.h>
#include <poll.h>
#include <sys/wait.h>
#include <unistd.h>

#include <cerrno>
#include <csignal>

#include "appliance/base/process.h"
#include "tests/appliance/base/temporary_folder.h"

using appliance::ChildEnd;
using appliance::ChildProcess;
using appliance_test::Eventually;

namespace {

template <typename Work>
pid_t Start(const Work& work) {
    const pid_t pid = fork();
    if (pid == 0) {
        work();
        _exit(7);
    }
    return pid;
}

bool IsGone(pid_t pid) {
    return kill(pid, 0) != 0 && errno == ESRCH;
}

TEST(ChildProcessTest, TellsHowItEnded) {
    ChildProcess exited(Start([] {}));
    EXPECT_EQ(exited.Wait().how, ChildEnd::How::Exited);
    EXPECT_EQ(exited.Wait().code, 7);  // as often as one asks
    EXPECT_EQ(exited.Look()->code, 7);

    ChildProcess signalled(Start([] { raise(SIGUSR1); }));
    EXPECT_EQ(signalled.Wait().how, ChildEnd::How::Signalled);
    EXPECT_EQ(signalled.Wait().code, SIGUSR1);
}

TEST(ChildProcessTest, LooksWithoutWaiting) {
    const pid_t pid = Start([] { pause(); });
    ChildProcess child(pid);
    EXPECT_FALSE(child.Look());
    ASSERT_GE(child.handle(), 0);
    pollfd ended = {child.handle(), POLLIN, 0};
    EXPECT_EQ(poll(&ended, 1, 0), 0);
    kill(pid, SIGTERM);
    EXPECT_EQ(poll(&ended, 1, 5000), 1);
    ASSERT_TRUE(child.Look());
    EXPECT_EQ(child.Look()->code, SIGTERM);
    EXPECT_TRUE(IsGone(pid));
}

TEST(ChildProcessTest, GoesWithItsOwner) {
    pid_t pid = -1;
    {
        const ChildProcess child(Start([] {
            signal(SIGTERM, SIG_IGN);
            pause();
        }));
        const ChildProcess other(pid = Start([] { pause(); }));
        EXPECT_FALSE(IsGone(pid));
    }
    EXPECT_TRUE(IsGone(pid));
    EXPECT_EQ(waitpid(-1, nullptr, WNOHANG), -1);
    EXPECT_EQ(errno, ECHILD);
}

TEST(ChildProcessTest, ItsGroupGoesWithIt) {
    int ends[2];
    ASSERT_EQ(pipe(ends), 0);
    const pid_t leader = Start([&ends] {
        setsid();
        const pid_t grandchild = fork();
        if (grandchild == 0) {
            pause();
        }
        static_cast<void>(!write(ends[1], &grandchild, sizeof(grandchild)));
        pause();
    });
    pid_t grandchild = -1;
    {
        const ChildProcess child(leader, ChildProcess::Reach::Group);
        ASSERT_EQ(read(ends[0], &grandchild, sizeof(grandchild)), static_cast<ssize_t>(sizeof(grandchild)));
        EXPECT_FALSE(IsGone(grandchild));
    }
    close(ends[0]);
    close(ends[1]);
    EXPECT_TRUE(IsGone(leader));
    // It is another's to collect now.
    EXPECT_TRUE(Eventually([grandchild] { return !appliance::ProcessStart(grandchild); }));
}

TEST(ChildProcessTest, AnEndThatSomebodyElseSawIsLost) {
    const pid_t pid = Start([] {});
    ChildProcess child(pid);
    ASSERT_EQ(waitpid(pid, nullptr, 0), pid);
    EXPECT_EQ(child.Wait().how, ChildEnd::How::Lost);
    EXPECT_EQ(child.Wait().code, ECHILD);
}

}  // namespace
