#include "tests/appliance/join/join_test.h"

#include <fcntl.h>
#include <sys/stat.h>
#include <tdb.h>
#include <unistd.h>

#include <cstdlib>
#include <filesystem>
#include <fstream>
#include <memory>
#include <sstream>

#include "appliance/base/paths.h"
#include "appliance/base/text.h"

namespace join_test {

const char kWorkgroupConf[] =
    "# the appliance's own\n"
    "[global]\n"
    "\tworkgroup = WORKGROUP\n"
    "\tnetbios name = NAS1\n"
    "  ; a comment\n"
    "\tSecurity=user\n"
    "\tvorn sync dctime = no\n"
    "\tidmap config * : backend = tdb\n"
    "\tidmap config * : range = 3000-7999\n"
    "\tserver string = the \\\n"
    "\t  store\n"
    "\tinclude = /usr/vorn/etc/smbinfo.conf\n"
    "\n"
    "[data]\n"
    "\tpath = /data\n";

namespace {

struct CloseTdb {
    void operator()(tdb_context* context) const {
        tdb_close(context);
    }
};

TDB_DATA DataOf(const std::string& text) {
    return {reinterpret_cast<unsigned char*>(const_cast<char*>(text.data())), text.size()};
}

std::string Replaced(const std::string& text, const std::string& part, const std::string& by) {
    std::string result = text;
    result.replace(result.find(part), part.size(), by);
    return result;
}

}  // namespace

JoinTest::JoinTest() {
    char folder[] = "/tmp/vorn-join-XXXXXX";
    root = mkdtemp(folder);
    appliance::SetRoot(root);
    Put(appliance::kSmbConf, kWorkgroupConf, 0640);
    Put(appliance::kSmbInfo, "[global]\n    advanced_domain_option=no\n");
    Put(appliance::kSettings, "trustdomain=yes\nenableduserhome=no\n");
    Put(appliance::kResolvConf, "nameserver 192.0.2.1\nnameserver 192.0.2.2\n");
    for (const char* made : {appliance::kPrivate, appliance::kJoinJournal, appliance::kSambaPrivate}) {
        std::filesystem::create_directories(At(made));
        chmod(At(made).c_str(), 0700);
    }
    for (const char* made : {appliance::kRun, "/run/samba", "/var/cache/samba", "/var/log", "/usr/bin", "/usr/sbin"}) {
        std::filesystem::create_directories(At(made));
    }
    for (const char* tool : {"/usr/bin/net", "/usr/bin/wbinfo", "/usr/bin/rpcclient", "/usr/bin/nmblookup",
                             "/usr/bin/smbcontrol", "/usr/bin/testparm"}) {
        Tool(tool, "exit 1");
    }
    // A daemon with a pid file, as far as those who start and stop it can see.
    Tool("/usr/sbin/winbindd", "setsid sleep 600 >/dev/null 2>&1 & echo $! > $R/run/samba/winbindd.pid");
}

JoinTest::~JoinTest() {
    if (const int pid = std::atoi(Content("/run/samba/winbindd.pid").c_str()); pid > 1) {
        kill(pid, SIGKILL);
    }
    appliance::SetRoot("");
    std::error_code ignored;
    std::filesystem::remove_all(root, ignored);
}

std::string JoinTest::Content(const std::string& path) const {
    std::ifstream file(At(path));
    if (!file) {
        return "<missing>";
    }
    std::stringstream text;
    text << file.rdbuf();
    return text.str();
}

bool JoinTest::Exists(const std::string& path) const {
    return std::filesystem::exists(At(path));
}

void JoinTest::Put(const std::string& path, const std::string& content, unsigned mode) const {
    std::filesystem::create_directories(std::filesystem::path(At(path)).parent_path());
    std::ofstream(At(path)) << content;
    chmod(At(path).c_str(), mode);
}

void JoinTest::Tool(const std::string& path, const std::string& script) const {
    Put(path,
        "#!/bin/sh\n"
        "R='" +
            root +
            "'\n"
            "echo \"$(basename $0) $*\" >> $R/calls\n" +
            script + "\n",
        0755);
}

std::vector<std::string> JoinTest::Calls() const {
    return Exists("/calls") ? appliance::Lines(Content("/calls")) : std::vector<std::string>();
}

std::vector<std::string> JoinTest::Calls(const std::string& part) const {
    std::vector<std::string> found;
    for (const std::string& line : Calls()) {
        if (appliance::Contains(line, part)) {
            found.push_back(line);
        }
    }
    return found;
}

void JoinTest::PutSecrets(const std::string& path, const std::map<std::string, std::string>& records) const {
    std::filesystem::create_directories(std::filesystem::path(At(path)).parent_path());
    unlink(At(path).c_str());
    const std::unique_ptr<tdb_context, CloseTdb> tdb(
        tdb_open(At(path).c_str(), 0, TDB_DEFAULT, O_RDWR | O_CREAT, 0600));
    ASSERT_TRUE(tdb);
    for (const auto& [key, value] : records) {
        ASSERT_EQ(tdb_store(tdb.get(), DataOf(key), DataOf(value), TDB_REPLACE), 0);
    }
}

std::map<std::string, std::string> JoinTest::Secrets(const std::string& path) const {
    std::map<std::string, std::string> records;
    const std::unique_ptr<tdb_context, CloseTdb> tdb(tdb_open(At(path).c_str(), 0, TDB_DEFAULT, O_RDONLY, 0));
    if (tdb) {
        tdb_traverse_read(
            tdb.get(),
            [](tdb_context*, TDB_DATA key, TDB_DATA value, void* found) {
                (*static_cast<std::map<std::string, std::string>*>(
                    found))[std::string(reinterpret_cast<char*>(key.dptr), key.dsize)] =
                    std::string(reinterpret_cast<char*>(value.dptr), value.dsize);
                return 0;
            },
            &records);
    }
    return records;
}

void JoinTest::MakeMember(const std::string& security, const std::string& domain, const std::string& realm) const {
    std::string conf = Replaced(kWorkgroupConf, "Security=user", "Security=" + security);
    conf = Replaced(conf, "workgroup = WORKGROUP",
                    "workgroup = " + domain + (realm.empty() ? "" : "\n\trealm = " + realm));
    Put(appliance::kSmbConf, conf, 0640);
    std::map<std::string, std::string> records = SecretsOf(domain, realm, "old");
    records["SECRETS/SID/NAS1"] = "machine sid";
    PutSecrets("/var/lib/samba/private/secrets.tdb", records);
}

std::map<std::string, std::string> SecretsOf(const std::string& domain, const std::string& realm,
                                             const std::string& password) {
    std::map<std::string, std::string> records = {
        {"SECRETS/MACHINE_PASSWORD/" + domain, password},
        {"SECRETS/MACHINE_LAST_CHANGE_TIME/" + domain, "1"},
        {"SECRETS/MACHINE_SEC_CHANNEL_TYPE/" + domain, "2"},
        {"SECRETS/MACHINE_DOMAIN_INFO/" + domain, password},
        {"SECRETS/SID/" + domain, "sid of " + domain},
        {"SECRETS/DOMGUID/" + domain, "guid"},
        {"SECRETS/PROTECT/IDS/" + domain, "yes"},
    };
    if (!realm.empty()) {
        records["SECRETS/SALTING_PRINCIPAL/DES/" + realm] = "salt";
    }
    return records;
}

appliance::Membership AdMembership(const std::string& domain, const std::string& realm) {
    appliance::Membership membership;
    membership.kind = appliance::DomainKind::ActiveDirectory;
    membership.hasSecret = true;
    membership.domain = domain;
    membership.realm = realm;
    membership.machine = "NAS1";
    return membership;
}

}  // namespace join_test
