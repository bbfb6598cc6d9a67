// The command line, the first start, and starts that can't be.

#include <fcntl.h>
#include <gmock/gmock.h>
#include <sys/file.h>
#include <sys/stat.h>
#include <sys/wait.h>
#include <unistd.h>

#include <cerrno>
#include <cstdio>
#include <filesystem>
#include <optional>

#include "appliance/base/file.h"
#include "appliance/base/file_lock.h"
#include "tests/appliance/vornd/support.h"

namespace vornd_test {
namespace {

namespace fs = std::filesystem;
using ::testing::HasSubstr;
using ::testing::MatchesRegex;
using ::testing::StartsWith;

// The one line that a start which fails ends with.
std::string Refusal(const Tree& tree, const std::vector<std::string>& arguments = {}, int status = 1,
                    milliseconds wait = milliseconds(10000)) {
    Server server(tree, arguments, false);
    EXPECT_EQ(server.End(wait), status);
    const std::string errors = server.Errors();
    const std::size_t last = errors.rfind("vornd: ");
    const std::string line = last == std::string::npos ? errors : errors.substr(last);
    EXPECT_EQ(line.find('\n'), line.size() - 1) << errors;
    return line.substr(0, line.size() - 1);
}

mode_t ModeOf(const std::string& path) {
    struct stat found {};
    return stat(path.c_str(), &found) == 0 ? found.st_mode & 07777u : 0;
}

TEST(CommandLineTest, WrongOnesEndWithOneLine) {
    Tree tree;
    EXPECT_EQ(Refusal(tree, {"--nonsense"}, 2), "vornd: option \"--nonsense\" is unknown or wrong; try --help");
    EXPECT_EQ(Refusal(tree, {"-x"}, 2), "vornd: option \"-x\" is unknown or wrong; try --help");
    EXPECT_EQ(Refusal(tree, {"--foreground=1"}, 2), "vornd: option \"--foreground=1\" is unknown or wrong; try --help");
    EXPECT_EQ(Refusal(tree, {"--socket"}, 2), "vornd: option \"--socket\" needs a value");
    EXPECT_EQ(Refusal(tree, {"--socket", ""}, 2), "vornd: option \"--socket\" needs a value");
    for (const char* seconds : {"-1", "1x", "x", "301", "99999999999999999999"}) {
        EXPECT_EQ(Refusal(tree, {"--drain", seconds}, 2),
                  "vornd: option \"--drain\" takes a number of seconds up to 300");
    }
    EXPECT_EQ(Refusal(tree, {"start"}, 2), "vornd: \"start\" is one argument too many; try --help");
}

TEST(CommandLineTest, HelpAndVersionEndWell) {
    Tree tree;
    for (const char* option : {"--help", "--version"}) {
        Server server(tree, {option}, false);
        EXPECT_EQ(server.End(), 0) << option;
        EXPECT_EQ(server.Errors(), "");
    }
}

TEST(FirstStartTest, MakesWhatIsMissing) {
    Tree tree;
    Server server(tree);
    EXPECT_EQ(tree.Read("/usr/vorn/etc/smb.conf"), tree.Read("/usr/vorn/share/defaults/smb.conf"));
    EXPECT_EQ(tree.Read("/etc/vorninfo.conf"), "trustdomain=yes\n");
    EXPECT_EQ(ModeOf(tree.At("/usr/vorn/etc/smb.conf")), 0644u);
    EXPECT_EQ(ModeOf(tree.At("/usr/vorn/etc/private")), 0700u);
    EXPECT_EQ(ModeOf(tree.At("/usr/vorn/etc/private/directory")), 0700u);
    EXPECT_EQ(ModeOf(tree.At("/usr/vorn/etc/private/join")), 0700u);
    EXPECT_EQ(ModeOf(tree.At("/var/lib/vorn")), 0700u);
    EXPECT_EQ(ModeOf(tree.At("/var/lib/vorn/tasks.db")), 0600u);
    EXPECT_EQ(ModeOf(tree.At("/run/vorn")), 0755u);
    EXPECT_EQ(ModeOf(tree.Socket()), 0666u);
}

// A writer of the settings may be at work before there is a file.
TEST(FirstStartTest, TheSettingsAreMadeUnderTheirLock) {
    Tree tree;
    std::optional<appliance::FileLock> lock =
        appliance::FileLock::Take(tree.At("/etc/vorninfo.conf.lock"), milliseconds(0));
    ASSERT_TRUE(lock);
    {
        Server server(tree, {}, false);
        ASSERT_TRUE(Eventually([&] { return fs::exists(tree.At("/usr/vorn/etc/smb.conf")); }));
        EXPECT_FALSE(server.Hears("READY=1", milliseconds(1000)));
        EXPECT_FALSE(fs::exists(tree.At("/etc/vorninfo.conf")));
        tree.Write("/etc/vorninfo.conf", "trustdomain=no\n");
        lock.reset();
        EXPECT_TRUE(server.Hears("READY=1"));
        EXPECT_EQ(tree.Read("/etc/vorninfo.conf"), "trustdomain=no\n");
    }
    fs::remove(tree.At("/etc/vorninfo.conf"));
    lock = appliance::FileLock::Take(tree.At("/etc/vorninfo.conf.lock"), milliseconds(0));
    ASSERT_TRUE(lock);
    // It waits for the lock for five seconds itself.
    EXPECT_EQ(Refusal(tree, {}, 1, milliseconds(20000)),
              "vornd: " + tree.At("/etc/vorninfo.conf") +
                  " can't be made: its lock can't be had: Resource temporarily unavailable");
}

TEST(FirstStartTest, KeepsWhatIsThere) {
    Tree tree;
    tree.Write("/usr/vorn/etc/smb.conf", "[global]\n\tworkgroup = MINE\n", 0600);
    tree.Write("/etc/vorninfo.conf", "trustdomain=no\n");
    Server server(tree);
    EXPECT_EQ(tree.Read("/usr/vorn/etc/smb.conf"), "[global]\n\tworkgroup = MINE\n");
    EXPECT_EQ(ModeOf(tree.At("/usr/vorn/etc/smb.conf")), 0600u);
    EXPECT_EQ(tree.Read("/etc/vorninfo.conf"), "trustdomain=no\n");
}

TEST(FirstStartTest, RemovesStaleTemporaryFilesOnly) {
    Tree tree;
    const std::string stale = tree.At("/usr/vorn/etc/.smb.conf.vorn-a1B2c3");
    const std::string written = tree.At("/usr/vorn/etc/.smb.conf.vorn-d4E5f6");
    const std::string other = tree.At("/usr/vorn/etc/.somebody.else");
    for (const std::string& path : {stale, written, other}) {
        fs::copy_file(tree.At("/usr/vorn/share/capabilities.conf"), path);
    }
    const appliance::FileDescriptor writer(open(written.c_str(), O_RDONLY | O_CLOEXEC));
    ASSERT_EQ(flock(writer.get(), LOCK_EX), 0);
    Server server(tree);
    EXPECT_FALSE(fs::exists(stale));
    EXPECT_TRUE(fs::exists(written));
    EXPECT_TRUE(fs::exists(other));
}

TEST(FirstStartTest, LeavesAListThatIsBeingFetchedAndNoOther) {
    for (const char* const fetch : {"", "/tmp/domain_user.pid", "/tmp/domain_group.pid"}) {
        Tree tree;
        fs::create_directories(tree.At("/usr/vorn/etc/private/directory"));
        fs::create_directories(tree.At("/tmp"));
        tree.Write("/usr/vorn/etc/private/directory/.user_LAB.db.vorn-a1B2c3", "half", 0600);
        tree.Write("/usr/vorn/etc/private/directory/user_LAB.db", "whole", 0600);
        if (*fetch != '\0') {
            tree.Write(fetch, std::to_string(getpid()) + "\n", 0644);
        }
        Server server(tree);
        EXPECT_EQ(fs::exists(tree.At("/usr/vorn/etc/private/directory/.user_LAB.db.vorn-a1B2c3")), *fetch != '\0');
        EXPECT_TRUE(fs::exists(tree.At("/usr/vorn/etc/private/directory/user_LAB.db")));
    }
}

TEST(FirstStartTest, RemovesWhatAKilledServerWasWritingOfTheOptions) {
    Tree tree;
    tree.Write("/usr/vorn/etc/smbinfo.conf", "[global]\n", 0644);
    tree.Write("/usr/vorn/etc/smbinfo.conf.tmp", "[glo", 0644);
    Server server(tree);
    EXPECT_FALSE(fs::exists(tree.At("/usr/vorn/etc/smbinfo.conf.tmp")));
    EXPECT_EQ(tree.Read("/usr/vorn/etc/smbinfo.conf"), "[global]\n");
}

TEST(FirstStartTest, PutsADamagedTaskFileAside) {
    Tree tree;
    fs::create_directories(tree.At("/var/lib/vorn"));
    tree.Write("/var/lib/vorn/tasks.db", std::string(5000, 'x'), 0600);
    Server server(tree);
    EXPECT_THAT(server.Errors(), HasSubstr("tasks.db was damaged"));
    EXPECT_EQ(tree.Read("/var/lib/vorn/tasks.db.damaged"), std::string(5000, 'x'));
    EXPECT_EQ(server.Call("start", Object({{"body", "steps"}})).status, 200);
}

TEST(FirstStartTest, SaysThatSmbConfNamesNoWorkgroupAndServes) {
    Tree tree;
    tree.Write("/usr/vorn/etc/smb.conf", "garbage\n");
    Server server(tree);
    EXPECT_THAT(server.Errors(), HasSubstr("smb.conf does not say whether this is a member of a domain"));
    EXPECT_EQ(tree.Read("/usr/vorn/etc/smb.conf"), "garbage\n");
}

TEST(RefusedStartTest, MissingFiles) {
    Tree tree;
    fs::remove(tree.At("/usr/vorn/share/defaults/smb.conf"));
    EXPECT_EQ(Refusal(tree), "vornd: " + tree.At("/usr/vorn/etc/smb.conf") + " is missing, and so is its default " +
                                 tree.At("/usr/vorn/share/defaults/smb.conf") + ": No such file or directory");
    tree.Write("/usr/vorn/share/defaults/smb.conf", "[global]\nworkgroup = X\n");
    fs::remove(tree.At("/usr/vorn/share/capabilities.conf"));
    EXPECT_EQ(Refusal(tree),
              "vornd: " + tree.At("/usr/vorn/share/capabilities.conf") + " can't be read: No such file or directory");
}

TEST(RefusedStartTest, MissingSamba) {
    Tree tree;
    fs::remove(tree.At("/usr/sbin/winbindd"));
    EXPECT_EQ(Refusal(tree), "vornd: " + tree.At("/usr/sbin/winbindd") + " is missing: install the package winbind");
}

TEST(RefusedStartTest, NoModules) {
    Tree tree;
    fs::remove(tree.At("/usr/vorn/lib/modules/test_module.so"));
    EXPECT_EQ(Refusal(tree), "vornd: no module in " + tree.At("/usr/vorn/lib/modules"));
    fs::remove(tree.At("/usr/vorn/lib/modules"));
    EXPECT_EQ(Refusal(tree), "vornd: the folder of modules " + tree.At("/usr/vorn/lib/modules") + " is missing");
}

TEST(RefusedStartTest, PlacesThatAreTaken) {
    Tree tree;
    tree.Write("/var/lib/vorn", "a file where a folder should be");
    EXPECT_THAT(Refusal(tree), StartsWith("vornd: folder " + tree.At("/var/lib/vorn") + " can't be made: "));
    fs::remove(tree.At("/var/lib/vorn"));
    fs::create_directories(tree.At("/usr/vorn/etc/smb.conf"));
    EXPECT_EQ(Refusal(tree), "vornd: " + tree.At("/usr/vorn/etc/smb.conf") + " can't be read: Is a directory");
}

TEST(RefusedStartTest, TaskFileThatCantBeUsed) {
    Tree tree;
    fs::create_directories(tree.At("/var/lib/vorn/tasks.db"));
    EXPECT_THAT(Refusal(tree), StartsWith("vornd: the records of background tasks can't be used: "));
}

TEST(RefusedStartTest, Sockets) {
    Tree tree;
    tree.Write("/tmp/file", "keep me");
    EXPECT_EQ(Refusal(tree, {"--socket", tree.At("/tmp/file")}),
              "vornd: socket " + tree.At("/tmp/file") + ": something else has this name");
    EXPECT_EQ(tree.Read("/tmp/file"), "keep me");
    EXPECT_THAT(Refusal(tree, {"--socket", tree.At("/nowhere/socket")}),
                MatchesRegex("vornd: socket .*/nowhere/socket.lock: No such file or directory"));
    EXPECT_THAT(Refusal(tree, {"--socket", tree.At("/" + std::string(120, 'x'))}),
                MatchesRegex("vornd: socket .*: the path has more than 107 bytes"));
}

TEST(RefusedStartTest, OthersThanRoot) {
    Tree tree;
    const pid_t child = fork();
    if (child == 0) {
        if (setgid(65534) != 0 || setuid(65534) != 0 || freopen("/dev/null", "w", stderr) == nullptr) {
            _exit(99);
        }
        execl(VORN_TEST_VORND, VORN_TEST_VORND, "--foreground", nullptr);
        // The program may lie where this user can't look.
        _exit(errno == EACCES ? 1 : 98);
    }
    int status = 0;
    ASSERT_EQ(waitpid(child, &status, 0), child);
    EXPECT_EQ(WEXITSTATUS(status), 1);
}

}  // namespace
}  // namespace vornd_test
