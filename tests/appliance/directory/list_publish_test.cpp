#include <sys/ptrace.h>
#include <sys/resource.h>
#include <sys/stat.h>
#include <sys/wait.h>
#include <unistd.h>

#include <atomic>
#include <csignal>
#include <filesystem>
#include <fstream>
#include <thread>

#include "appliance/base/file.h"
#include "appliance/base/paths.h"
#include "appliance/base/sqlite.h"
#include "appliance/domain/directory/directory_store.h"
#include "appliance/domain/directory/list_writer.h"
#include "appliance/domain/directory/worker.h"
#include "tests/appliance/directory/directory_test.h"

namespace appliance_test {
namespace {

using appliance::EntryKind;
using appliance::ListWriter;
using Names = std::vector<std::string>;

const Names kOld = {"old1", "old2", "old3"};
const Names kNew = {"new1", "new2"};

class ListPublishTest : public DirectoryTest {
protected:
    static std::string Link() {
        return appliance::ListLinkPath(EntryKind::User, "LAB");
    }
    static std::string List() {
        return appliance::ListPath(EntryKind::User, "LAB");
    }
    static ino_t Inode(const std::string& path) {
        struct stat status {};
        return lstat(path.c_str(), &status) == 0 ? status.st_ino : 0;
    }
    // What another program reads through the link.
    static Names ThroughTheLink() {
        appliance::Database database(Link(), appliance::Database::Mode::Unchanging);
        appliance::Statement rows(database, "SELECT name FROM entries ORDER BY name");
        Names names;
        while (rows.Step()) {
            names.push_back(rows.Text(0));
        }
        return names;
    }
    // The names in the folder of the links that a refresh's deletion would reach.
    static Names UnderThePatterns() {
        Names names;
        for (const auto& file : std::filesystem::directory_iterator(appliance::Path(appliance::kPrivate))) {
            const std::string name = file.path().filename();
            if (name.rfind("domain_", 0) == 0) {
                names.push_back(name);
            }
        }
        return names;
    }
};

// So that the server's next start finds what a killed writer has left.
TEST_F(ListPublishTest, AnUnfinishedListIsKnownAsATemporaryFile) {
    const appliance::ListWriter writer(appliance::EntryKind::User, "LAB");
    const std::string lists = appliance::Path(appliance::kDirectoryData);
    std::vector<std::string> names;
    for (const auto& file : std::filesystem::directory_iterator(lists)) {
        names.push_back(file.path().filename());
    }
    ASSERT_EQ(names.size(), 1u);
    EXPECT_EQ(appliance::TemporaryTarget(names.front()), "user_LAB.db");
    // Not while it is being written, and then it goes.
    EXPECT_EQ(appliance::RemoveStaleTemporaries(lists), 0);
    std::ofstream(lists + "/.user_LAB.db.vorn-a1B2c3") << "left";
    EXPECT_EQ(appliance::RemoveStaleTemporaries(lists), 1);
    EXPECT_TRUE(std::filesystem::exists(lists + "/" + names.front()));
}

TEST_F(ListPublishTest, PublishesAFileAndALinkToIt) {
    Publish(EntryKind::User, "LAB", kOld);
    EXPECT_NE(Inode(List()), 0u);
    EXPECT_EQ(Inode(List()), Inode(Link()));
    struct stat status {};
    ASSERT_EQ(stat(List().c_str(), &status), 0);
    EXPECT_EQ(status.st_mode & 07777, 0600u);
    const ino_t old = Inode(List());
    Publish(EntryKind::User, "LAB", kNew);
    EXPECT_NE(Inode(List()), old);
    EXPECT_EQ(Inode(List()), Inode(Link()));
    EXPECT_EQ(ThroughTheLink(), kNew);
    EXPECT_EQ(UnderThePatterns(), Names{"domain_user_LAB.db"});
    EXPECT_EQ(std::distance(std::filesystem::directory_iterator(appliance::Path(appliance::kDirectoryData)), {}), 1);
}

TEST_F(ListPublishTest, ServesTheListWhileItsLinkIsDeleted) {
    Publish(EntryKind::User, "LAB", kOld);
    ASSERT_EQ(system(("/bin/rm " + appliance::Path(appliance::kPrivate) + "/domain_user* > /dev/null 2>&1").c_str()),
              0);
    EXPECT_EQ(Listed(EntryKind::User, "LAB"), kOld);
    EXPECT_EQ(UnderThePatterns(), Names{});
    EXPECT_TRUE(appliance::LinkList(EntryKind::User, "LAB"));
    EXPECT_EQ(ThroughTheLink(), kOld);
    EXPECT_TRUE(appliance::LinkList(EntryKind::User, "LAB"));
    EXPECT_TRUE(appliance::LinkList(EntryKind::User, "NONE"));
}

TEST_F(ListPublishTest, RefusesAnEmptyListAndKeepsTheOldOne) {
    Publish(EntryKind::User, "LAB", kOld);
    ListWriter writer(EntryKind::User, "LAB");
    writer.Add("NAS1$", 1, "");
    writer.Add("a\nb", 1, "");
    EXPECT_FALSE(writer.Publish("ldap", "dc"));
    EXPECT_EQ(Listed(EntryKind::User, "LAB"), kOld);
}

TEST_F(ListPublishTest, LeavesNoTraceWhenItIsGivenUp) {
    Publish(EntryKind::User, "LAB", kOld);
    {
        ListWriter writer(EntryKind::User, "LAB");
        writer.Add("alice", 1, "");
    }
    EXPECT_EQ(Listed(EntryKind::User, "LAB"), kOld);
    EXPECT_EQ(std::distance(std::filesystem::directory_iterator(appliance::Path(appliance::kDirectoryData)), {}), 1);
}

TEST_F(ListPublishTest, TakesALinkThatWasLeftHalfMade) {
    Publish(EntryKind::User, "LAB", kOld);
    const std::string beside = appliance::FolderOf(Link()) + "/.domain_user_LAB.db.new";
    Put(beside, "left by a killed writer");
    Publish(EntryKind::User, "LAB", kNew);
    EXPECT_EQ(ThroughTheLink(), kNew);
    EXPECT_EQ(Got(beside), "<missing>");
}

#ifndef __SANITIZE_ADDRESS__
// The most memory that a child uses, in kilobytes, when it writes a list of that length.
std::int64_t MemoryFor(int entries) {
    const auto work = [entries](appliance::ProgressReport&) {
        ListWriter writer(EntryKind::User, "LAB");
        for (int number = 0; number < entries; ++number) {
            // Not in the order of the index.
            const std::string digits = std::to_string(1000000 + number * 7919 % 1000003);
            writer.Add("user" + digits, number, "A display name of some length, " + digits);
        }
        writer.Publish("ldap", "dc");
        rusage usage{};
        getrusage(RUSAGE_SELF, &usage);
        return Json::Value(std::int64_t{usage.ru_maxrss});
    };
    return appliance::RunWorker({std::chrono::seconds(50), std::chrono::seconds(50)}, work).asInt64();
}

TEST_F(ListPublishTest, NeedsNoMoreMemoryForALongerList) {
    const std::int64_t few = MemoryFor(10000);
    const std::int64_t many = MemoryFor(40000);
    EXPECT_GT(few, 0);
    EXPECT_LE(many, few + few / 20);
}
#endif

// Readers see one list or the other, whole, whatever is published and deleted meanwhile.
TEST_F(ListPublishTest, NeverShowsReadersAMixture) {
    Publish(EntryKind::User, "LAB", kOld);
    std::atomic<bool> done{false};
    std::atomic<int> reads{0};
    std::atomic<int> wrong{0};
    std::vector<std::thread> readers;
    for (int reader = 0; reader < 3; ++reader) {
        readers.emplace_back([&] {
            while (!done) {
                const Names names = Listed(EntryKind::User, "LAB");
                ++reads;
                if (names != kOld && names != kNew) {
                    ++wrong;
                }
            }
        });
    }
    std::thread remover([&] {
        while (!done) {
            unlink(Link().c_str());
            std::this_thread::sleep_for(std::chrono::milliseconds(1));
        }
    });
    for (int round = 0; round < 60; ++round) {
        Publish(EntryKind::User, "LAB", round % 2 == 0 ? kNew : kOld);
    }
    done = true;
    remover.join();
    for (std::thread& reader : readers) {
        reader.join();
    }
    EXPECT_EQ(wrong, 0);
    EXPECT_GT(reads, 60);
}

// Runs a writer in a child and kills it when it has made `calls` entries into the kernel or returns from it. True when
// it came to its end before.
bool PublishUntilKilled(const Names& names, int calls) {
    const pid_t child = fork();
    if (child == 0) {
        ptrace(PTRACE_TRACEME, 0, nullptr, nullptr);
        raise(SIGSTOP);
        ListWriter writer(EntryKind::User, "LAB");
        for (const std::string& name : names) {
            writer.Add(name, 1, "");
        }
        writer.Publish("ldap", "dc");
        _exit(0);
    }
    int status = 0;
    waitpid(child, &status, 0);
    for (int call = 0; WIFSTOPPED(status) && call < calls; ++call) {
        ptrace(PTRACE_SYSCALL, child, nullptr, nullptr);
        waitpid(child, &status, 0);
    }
    if (!WIFSTOPPED(status)) {
        EXPECT_TRUE(WIFEXITED(status) && WEXITSTATUS(status) == 0);
        return true;
    }
    kill(child, SIGKILL);
    waitpid(child, &status, 0);
    return false;
}

TEST_F(ListPublishTest, LeavesTheOldOrTheNewListWhereverItIsKilled) {
    Publish(EntryKind::User, "LAB", kOld);
    bool sawOld = false;
    bool sawNew = false;
    bool ended = false;
    for (int calls = 1; !ended && calls < 5000; ++calls) {
        ended = PublishUntilKilled(kNew, calls);
        const Names names = Listed(EntryKind::User, "LAB");
        ASSERT_TRUE(names == kOld || names == kNew) << calls;
        const Names linked = ThroughTheLink();
        ASSERT_TRUE(linked == kOld || linked == kNew) << calls;
        ASSERT_EQ(UnderThePatterns(), Names{"domain_user_LAB.db"}) << calls;
        ASSERT_EQ(appliance::FindLists().size(), 1u) << calls;
        sawOld = sawOld || names == kOld;
        if (names == kNew && !ended) {
            sawNew = true;
            Publish(EntryKind::User, "LAB", kOld);
        }
    }
    EXPECT_TRUE(ended);
    EXPECT_TRUE(sawOld);
    EXPECT_TRUE(sawNew);
    EXPECT_EQ(Listed(EntryKind::User, "LAB"), kNew);
    EXPECT_EQ(ThroughTheLink(), kNew);
}

}  // namespace
}  // namespace appliance_test
