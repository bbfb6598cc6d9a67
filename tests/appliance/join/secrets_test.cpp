// The database of secrets, on real files.

#include "appliance/domain/membership/secrets.h"

#include <fcntl.h>
#include <krb5.h>
#include <sched.h>
#include <sys/mount.h>
#include <sys/resource.h>
#include <sys/stat.h>
#include <sys/wait.h>
#include <tdb.h>
#include <unistd.h>

#include <atomic>
#include <chrono>
#include <csignal>
#include <system_error>
#include <thread>

#include "appliance/base/file.h"
#include "appliance/base/paths.h"
#include "appliance/domain/membership/kerberos.h"
#include "tests/appliance/join/join_test.h"

namespace {

using appliance::SecretsOwner;
using join_test::SecretsOf;
using testing::ElementsAre;
using testing::Key;
using testing::UnorderedElementsAre;

constexpr char kLive[] = "/var/lib/samba/private/secrets.tdb";
constexpr char kOther[] = "/other.tdb";

class SecretsTest : public join_test::JoinTest {
protected:
    std::map<std::string, std::string> Both() const {
        std::map<std::string, std::string> records = SecretsOf("LAB", "LAB.TEST", "old");
        records.merge(SecretsOf("OTHER", "OTHER.TEST", "other"));
        records["SECRETS/SID/NAS1"] = "machine";
        records["INFO/random_seed"] = std::string("\0\1\2", 3);
        return records;
    }
};

TEST_F(SecretsTest, AreThereOrNot) {
    EXPECT_FALSE(appliance::HasMachineSecret(At(kLive), "LAB"));
    PutSecrets(kLive, Both());
    EXPECT_TRUE(appliance::HasMachineSecret(At(kLive), "LAB"));
    EXPECT_TRUE(appliance::HasMachineSecret(At(kLive), "lab"));
    EXPECT_FALSE(appliance::HasMachineSecret(At(kLive), "LA"));
    Put(kLive, "no database");
    EXPECT_FALSE(appliance::HasMachineSecret(At(kLive), "LAB"));
}

TEST_F(SecretsTest, ACopyHoldsEveryRecord) {
    PutSecrets(kLive, Both());
    appliance::CopySecrets(At(kLive), At(kOther));
    EXPECT_EQ(Secrets(kOther), Both());
    struct stat file {};
    ASSERT_EQ(stat(At(kOther).c_str(), &file), 0);
    EXPECT_EQ(file.st_mode & 0777, 0600U);
    unlink(At(kLive).c_str());
    appliance::CopySecrets(At(kLive), At(kOther));
    EXPECT_TRUE(Secrets(kOther).empty());
}

TEST_F(SecretsTest, OfOneDomainAreRemovedAndTheMachinesOwnStay) {
    PutSecrets(kLive, Both());
    appliance::ReplaceSecrets(At(kLive), "", {{"LAB", "LAB.TEST", "NAS1"}});
    std::map<std::string, std::string> expected = SecretsOf("OTHER", "OTHER.TEST", "other");
    expected["SECRETS/SID/NAS1"] = "machine";
    expected["INFO/random_seed"] = std::string("\0\1\2", 3);
    EXPECT_EQ(Secrets(kLive), expected);
}

TEST_F(SecretsTest, ThatAreRemovedLeaveNoBytes) {
    const std::string password = "canary-of-the-machine";
    PutSecrets(kOther, SecretsOf("LAB", "LAB.TEST", password));
    PutSecrets(kLive, SecretsOf("LAB", "LAB.TEST", "old"));
    appliance::ReplaceSecrets(At(kLive), At(kOther), {{"LAB", "LAB.TEST", "NAS1"}});
    ASSERT_THAT(Content(kLive), testing::HasSubstr(password));
    appliance::ReplaceSecrets(At(kLive), "", {{"LAB", "LAB.TEST", "NAS1"}});
    EXPECT_THAT(Content(kLive), testing::Not(testing::HasSubstr(password)));
    EXPECT_TRUE(Secrets(kLive).empty());
}

TEST_F(SecretsTest, AMachineNamedLikeTheDomainKeepsItsSid) {
    PutSecrets(kLive, {{"SECRETS/SID/LAB", "x"}, {"SECRETS/MACHINE_PASSWORD/LAB", "p"}});
    appliance::ReplaceSecrets(At(kLive), "", {{"LAB", "", "LAB"}});
    EXPECT_THAT(Secrets(kLive), ElementsAre(Key("SECRETS/SID/LAB")));
}

TEST_F(SecretsTest, AreReplacedByThoseOfAnotherFile) {
    PutSecrets(kLive, Both());
    std::map<std::string, std::string> staged = SecretsOf("NEW", "NEW.TEST", "new");
    staged["SECRETS/SID/NAS1"] = "must not be taken over";
    PutSecrets(kOther, staged);
    appliance::ReplaceSecrets(At(kLive), At(kOther), {{"LAB", "LAB.TEST", "NAS1"}, {"NEW", "NEW.TEST", "NAS1"}});
    std::map<std::string, std::string> expected = SecretsOf("NEW", "NEW.TEST", "new");
    expected.merge(SecretsOf("OTHER", "OTHER.TEST", "other"));
    expected["SECRETS/SID/NAS1"] = "machine";
    expected["INFO/random_seed"] = std::string("\0\1\2", 3);
    EXPECT_EQ(Secrets(kLive), expected);
    // The file is the same one, so that programs that have it open see the change.
}

TEST_F(SecretsTest, ProgramsThatHaveTheFileOpenSeeTheChange) {
    PutSecrets(kLive, Both());
    int ready[2];
    int go[2];
    ASSERT_EQ(pipe(ready), 0);
    ASSERT_EQ(pipe(go), 0);
    const pid_t child = fork();
    if (child == 0) {
        tdb_context* tdb = tdb_open(At(kLive).c_str(), 0, TDB_DEFAULT, O_RDWR, 0600);
        char byte = 0;
        const bool told = tdb != nullptr && write(ready[1], "x", 1) == 1 && read(go[0], &byte, 1) == 1;
        std::string key = "SECRETS/MACHINE_PASSWORD/LAB";
        const TDB_DATA data = {reinterpret_cast<unsigned char*>(key.data()), key.size()};
        _exit(told && tdb_exists(tdb, data) == 0 ? 0 : 1);
    }
    char byte = 0;
    ASSERT_EQ(read(ready[0], &byte, 1), 1);
    appliance::ReplaceSecrets(At(kLive), "", {{"LAB", "LAB.TEST", "NAS1"}});
    ASSERT_EQ(write(go[1], "x", 1), 1);
    int status = 0;
    ASSERT_EQ(waitpid(child, &status, 0), child);
    EXPECT_EQ(status, 0);
}

TEST_F(SecretsTest, AMissingFileHasNothingToRemove) {
    appliance::ReplaceSecrets(At(kLive), "", {{"LAB", "LAB.TEST", "NAS1"}});
    EXPECT_FALSE(Exists(kLive));
    PutSecrets(kOther, SecretsOf("LAB", "", "new"));
    appliance::ReplaceSecrets(At(kLive), At(kOther), {{"LAB", "", "NAS1"}});
    EXPECT_EQ(Secrets(kLive), SecretsOf("LAB", "", "new"));
}

// Nobody can make anything of it: it is no obstacle, and its bytes are kept.
TEST_F(SecretsTest, ADamagedFileHoldsNothingAndIsKept) {
    PutSecrets(kLive, Both());
    const std::string whole = Content(kLive);
    std::string torn = whole;
    torn.replace(200, torn.size() - 200, torn.size() - 200, 'x');
    for (const std::string& bytes : {std::string(), std::string("no database"), torn, std::string(9000, '\0')}) {
        Put(kLive, bytes, 0600);
        appliance::CopySecrets(At(kLive), At(kOther));
        EXPECT_THAT(Secrets(kOther), testing::IsEmpty());
        EXPECT_EQ(Content(kLive), bytes);
        EXPECT_FALSE(Exists("/var/lib/samba/private/secrets.tdb.damaged"));

        appliance::ReplaceSecrets(At(kLive), "", {{"LAB", "LAB.TEST", "NAS1"}});
        EXPECT_FALSE(Exists(kLive));
        EXPECT_EQ(Content("/var/lib/samba/private/secrets.tdb.damaged"), bytes);
        unlink(At("/var/lib/samba/private/secrets.tdb.damaged").c_str());

        Put(kLive, bytes, 0600);
        PutSecrets(kOther, SecretsOf("LAB", "LAB.TEST", "new"));
        appliance::ReplaceSecrets(At(kLive), At(kOther), {{"LAB", "LAB.TEST", "NAS1"}});
        EXPECT_EQ(Secrets(kLive), SecretsOf("LAB", "LAB.TEST", "new"));
        EXPECT_EQ(Content("/var/lib/samba/private/secrets.tdb.damaged"), bytes);
        unlink(At("/var/lib/samba/private/secrets.tdb.damaged").c_str());
    }
}

TEST_F(SecretsTest, OnlyADamagedFileIsSetAside) {
    const char* const aside = "/var/lib/samba/private/secrets.tdb.damaged";
    appliance::KeepDamagedSecrets(At(kLive));
    EXPECT_FALSE(Exists(kLive));
    PutSecrets(kLive, Both());
    appliance::KeepDamagedSecrets(At(kLive));
    EXPECT_EQ(Secrets(kLive), Both());
    EXPECT_FALSE(Exists(aside));
    Put(kLive, "no database", 0600);
    appliance::KeepDamagedSecrets(At(kLive));
    EXPECT_FALSE(Exists(kLive));
    EXPECT_EQ(Content(aside), "no database");
}

// A whole one that can't be opened for writing now is not a damaged one.
TEST_F(SecretsTest, AFolderThatTakesNothingIsNoDamage) {
    PutSecrets(kLive, Both());
    const pid_t child = fork();
    if (child == 0) {
        const std::string folder = appliance::FolderOf(At(kLive));
        if (unshare(CLONE_NEWNS) != 0 || mount("none", "/", nullptr, MS_REC | MS_PRIVATE, nullptr) != 0 ||
            mount(folder.c_str(), folder.c_str(), nullptr, MS_BIND, nullptr) != 0 ||
            mount("none", folder.c_str(), nullptr, MS_REMOUNT | MS_BIND | MS_RDONLY, nullptr) != 0) {
            _exit(100);
        }
        appliance::KeepDamagedSecrets(At(kLive));
        int thrown = 0;
        for (const bool copies : {true, false}) {
            try {
                copies ? appliance::CopySecrets(At(kLive), At("/copy.tdb"))
                       : appliance::ReplaceSecrets(At(kLive), "", {{"LAB", "LAB.TEST", "NAS1"}});
            } catch (const std::system_error& error) {
                thrown += error.code().value() == EROFS ? 1 : 0;
            }
        }
        _exit(thrown);
    }
    int status = 0;
    ASSERT_EQ(waitpid(child, &status, 0), child);
    EXPECT_EQ(WEXITSTATUS(status), 2);
    EXPECT_EQ(Secrets(kLive), Both());
    EXPECT_FALSE(Exists("/copy.tdb"));
}

// The reason that the caller is told is the disk's, and the records stay.
TEST_F(SecretsTest, ThatFindNoRoomStay) {
    PutSecrets(kLive, SecretsOf("LAB", "LAB.TEST", "old"));
    PutSecrets(kOther, SecretsOf("LAB", "LAB.TEST", std::string(2 << 20, 'n')));
    const pid_t child = fork();
    if (child == 0) {
        signal(SIGXFSZ, SIG_IGN);
        const rlimit limit = {1 << 20, 1 << 20};
        setrlimit(RLIMIT_FSIZE, &limit);
        try {
            appliance::ReplaceSecrets(At(kLive), At(kOther), {{"LAB", "LAB.TEST", "NAS1"}});
            _exit(0);
        } catch (const std::system_error& error) {
            _exit(error.code().value());
        }
    }
    int status = 0;
    ASSERT_EQ(waitpid(child, &status, 0), child);
    EXPECT_EQ(WEXITSTATUS(status), EFBIG);
    EXPECT_EQ(Secrets(kLive), SecretsOf("LAB", "LAB.TEST", "old"));
    EXPECT_FALSE(Exists("/var/lib/samba/private/secrets.tdb.damaged"));
}

TEST_F(SecretsTest, AreCompared) {
    PutSecrets(kLive, SecretsOf("LAB", "", "one"));
    PutSecrets(kOther, SecretsOf("LAB", "", "one"));
    EXPECT_TRUE(appliance::SameMachineSecret(At(kLive), At(kOther), "LAB"));
    PutSecrets(kOther, SecretsOf("LAB", "", "two"));
    EXPECT_FALSE(appliance::SameMachineSecret(At(kLive), At(kOther), "LAB"));
    PutSecrets(kOther, {});
    EXPECT_FALSE(appliance::SameMachineSecret(At(kLive), At(kOther), "LAB"));
    EXPECT_TRUE(appliance::SameMachineSecret(At(kOther), At("/missing.tdb"), "LAB"));
}

// The library opens a file once for each process.
TEST_F(SecretsTest, ThreadsWaitForEachOther) {
    PutSecrets(kLive, Both());
    std::atomic<int> good{0};
    std::vector<std::thread> threads;
    for (int i = 0; i < 8; ++i) {
        threads.emplace_back([&] {
            for (int k = 0; k < 100; ++k) {
                good += appliance::HasMachineSecret(At(kLive), "LAB") ? 1 : 0;
            }
        });
    }
    for (std::thread& thread : threads) {
        thread.join();
    }
    EXPECT_EQ(good, 800);
}

// Another library of the process with this code has a mutex of its own: what both share is a lock that counts between
// open files, also of one process.
TEST_F(SecretsTest, LibrariesOfAProcessWaitForEachOther) {
    PutSecrets(kLive, Both());
    ASSERT_TRUE(appliance::HasMachineSecret(At(kLive), "LAB"));
    const appliance::FileDescriptor other(open(At(appliance::kSecretsLock).c_str(), O_RDWR | O_CLOEXEC));
    ASSERT_TRUE(other);
    struct flock byte {};
    byte.l_type = F_WRLCK;
    byte.l_whence = SEEK_SET;
    byte.l_start = getpid();
    byte.l_len = 1;
    ASSERT_EQ(fcntl(other.get(), F_OFD_SETLK, &byte), 0);
    std::atomic<int> answer{-1};
    std::thread thread([&] { answer = appliance::HasMachineSecret(At(kLive), "LAB") ? 1 : 0; });
    std::this_thread::sleep_for(std::chrono::milliseconds(200));
    EXPECT_EQ(answer, -1);
    byte.l_type = F_UNLCK;
    EXPECT_EQ(fcntl(other.get(), F_OFD_SETLK, &byte), 0);
    thread.join();
    EXPECT_EQ(answer, 1);
    // Nobody else's process is in the way.
    byte.l_type = F_WRLCK;
    byte.l_start = getpid() + 1;
    ASSERT_EQ(fcntl(other.get(), F_OFD_SETLK, &byte), 0);
    EXPECT_TRUE(appliance::HasMachineSecret(At(kLive), "LAB"));
}

// A writer that is killed leaves the old records or the new ones.
TEST_F(SecretsTest, AreNeverMixedByAKilledWriter) {
    const auto before = SecretsOf("LAB", "LAB.TEST", "old");
    const auto after = SecretsOf("LAB", "LAB.TEST", "new");
    PutSecrets(kOther, after);
    int changed = 0;
    for (int turn = 0; turn < 60; ++turn) {
        PutSecrets(kLive, before);
        const pid_t child = fork();
        if (child == 0) {
            appliance::ReplaceSecrets(At(kLive), At(kOther), {{"LAB", "LAB.TEST", "NAS1"}});
            _exit(0);
        }
        usleep(static_cast<useconds_t>(turn * 40));
        kill(child, SIGKILL);
        ASSERT_EQ(waitpid(child, nullptr, 0), child);
        const bool isThere = appliance::HasMachineSecret(At(kLive), "LAB");
        EXPECT_TRUE(isThere);
        const auto found = Secrets(kLive);
        EXPECT_TRUE(found == before || found == after) << "turn " << turn;
        changed += found == after ? 1 : 0;
    }
    RecordProperty("changed", changed);
}

class KeytabTest : public join_test::JoinTest {
protected:
    void Add(const std::string& principal) {
        krb5_context context = nullptr;
        ASSERT_EQ(krb5_init_context(&context), 0);
        krb5_keytab keytab = nullptr;
        krb5_keytab_entry entry{};
        unsigned char bytes[16] = {1};
        ASSERT_EQ(krb5_kt_resolve(context, ("FILE:" + At("/etc/krb5.keytab")).c_str(), &keytab), 0);
        ASSERT_EQ(krb5_parse_name(context, principal.c_str(), &entry.principal), 0);
        entry.vno = 2;
        entry.key.enctype = ENCTYPE_AES128_CTS_HMAC_SHA1_96;
        entry.key.length = sizeof(bytes);
        entry.key.contents = bytes;
        ASSERT_EQ(krb5_kt_add_entry(context, keytab, &entry), 0);
        krb5_free_principal(context, entry.principal);
        krb5_kt_close(context, keytab);
        krb5_free_context(context);
    }
};

TEST_F(KeytabTest, LosesTheKeysOfOneRealm) {
    Add("NAS1$@LAB.TEST");
    Add("host/nas1@OTHER.TEST");
    Add("host/nas1@LAB.TEST");
    const std::string all = Content("/etc/krb5.keytab");
    appliance::RemoveRealmFromKeytab(At("/etc/krb5.keytab"), "NONE.TEST");
    EXPECT_EQ(Content("/etc/krb5.keytab"), all);
    appliance::RemoveRealmFromKeytab(At("/etc/krb5.keytab"), "lab.test");
    const std::string rest = Content("/etc/krb5.keytab");
    EXPECT_EQ(rest.find("LAB.TEST"), std::string::npos);
    EXPECT_NE(rest.find("OTHER.TEST"), std::string::npos);
    appliance::RemoveRealmFromKeytab(At("/etc/krb5.keytab"), "OTHER.TEST");
    EXPECT_FALSE(Exists("/etc/krb5.keytab"));
    appliance::RemoveRealmFromKeytab(At("/etc/krb5.keytab"), "OTHER.TEST");
}

TEST_F(KeytabTest, ThatIsNoneIsAFailureAndStays) {
    Put("/etc/krb5.keytab", "no keytab");
    EXPECT_THROW(appliance::RemoveRealmFromKeytab(At("/etc/krb5.keytab"), "LAB.TEST"), std::exception);
    EXPECT_EQ(Content("/etc/krb5.keytab"), "no keytab");
    EXPECT_FALSE(Exists("/etc/krb5.keytab.vorn-new"));
}

TEST_F(KeytabTest, TheKerberosConfigurationNamesOneRealm) {
    const std::string path = appliance::WriteKerberosConfiguration(root, "lab.test", "2001:db8::1");
    const std::string text = Content("/krb5.conf");
    EXPECT_EQ(path, At("/krb5.conf"));
    EXPECT_THAT(text, testing::HasSubstr("default_realm = LAB.TEST\n"));
    EXPECT_THAT(text, testing::HasSubstr("kdc = [2001:db8::1]\n"));
    EXPECT_THROW(appliance::WriteKerberosConfiguration(root, "lab.test\n[realms]", ""), std::system_error);
    EXPECT_THROW(appliance::WriteKerberosConfiguration(root, "lab.test", "a }"), std::system_error);
}

}  // namespace
