// Where the appliance keeps its things: the fixed paths that several parts of it need. One that a single part needs
// stands beside the code that does. docs/appliance.md lists all of them, which a test holds against the sources.

#ifndef VORN_APPLIANCE_BASE_PATHS_H
#define VORN_APPLIANCE_BASE_PATHS_H

#include <string>

namespace appliance {

// Configuration that the web-API modules name themselves, too.
inline constexpr const char kSmbConf[] = "/usr/vorn/etc/smb.conf";
inline constexpr const char kSmbInfo[] = "/usr/vorn/etc/smbinfo.conf";
inline constexpr const char kSettings[] = "/etc/vorninfo.conf";
inline constexpr const char kJoinStatus[] = "/var/log/winlock.state";
inline constexpr const char kUpdatingMarker[] = "/tmp/domain_updating";
inline constexpr const char kUserPid[] = "/tmp/domain_user.pid";
inline constexpr const char kGroupPid[] = "/tmp/domain_group.pid";

// What is installed and never changes.
inline constexpr const char kDefaults[] = "/usr/vorn/share/defaults";  // first smb.conf, vorninfo.conf
inline constexpr const char kCapabilities[] = "/usr/vorn/share/capabilities.conf";
inline constexpr const char kModules[] = "/usr/vorn/lib/modules";
inline constexpr const char kVornd[] = "/usr/vorn/sbin/vornd";
inline constexpr const char kVornwin[] = "/usr/vorn/sbin/vornwin";
inline constexpr const char kVornjoin[] = "/usr/vorn/sbin/vornjoin";
inline constexpr const char kVornauth[] = "/usr/vorn/sbin/vornauth";

// State that lasts. Folders of the first kind belong to root and are closed to all others (0700).
inline constexpr const char kPrivate[] = "/usr/vorn/etc/private";
inline constexpr const char kDirectoryData[] = "/usr/vorn/etc/private/directory";  // complete users' and groups' lists
inline constexpr const char kJoinJournal[] = "/usr/vorn/etc/private/join";         // what an interrupted join puts back
inline constexpr const char kState[] = "/var/lib/vorn";
inline constexpr const char kLastTest[] = "/var/lib/vorn/last_test.json";
inline constexpr const char kTasks[] = "/var/lib/vorn/tasks.db";
inline constexpr const char kEvents[] = "/var/lib/vorn/events.db";
inline constexpr const char kSchedule[] = "/usr/vorn/etc/schedule.conf";
inline constexpr const char kCronTable[] = "/etc/cron.d/vorn";
inline constexpr const char kResolvConf[] = "/etc/resolv.conf";
inline constexpr const char kKeytab[] = "/etc/krb5.keytab";
inline constexpr const char kSambaPrivate[] = "/var/lib/samba/private";

// State that ends with the machine's run.
inline constexpr const char kRun[] = "/run/vorn";
inline constexpr const char kSocket[] = "/run/vorn/vornd.sock";
inline constexpr const char kSessions[] = "/run/vorn/sessions.json";
inline constexpr const char kSecretsLock[] = "/run/vorn/secrets.lock";
inline constexpr const char kJoinLock[] = "/run/vorn/join.lock";
inline constexpr const char kJoinSteps[] = "/run/vorn/join_steps.json";
inline constexpr const char kRefreshProgress[] = "/run/vorn/refresh.json";

// The path under which the appliance finds `path`: the path itself, but under another root in a test (SetRoot).
// Every fixed path above goes through it at the place where it is opened, run or handed on.
std::string Path(const std::string& path);

// The variable of the environment that holds that root. It is one for all libraries of a process, and Run hands it on, so
// that the programs which a test starts find the same files.
inline constexpr const char kRootVariable[] = "VORN_TEST_ROOT";

// For tests: puts a folder in front of all that Path answers; an empty text takes it away. Not safe while threads run.
void SetRoot(const std::string& folder);

}  // namespace appliance

#endif
