// Services with and without systemd, on programs of the test's own that write down what is asked of them.

#include "appliance/platform/system/services.h"

#include <signal.h>
#include <sys/stat.h>
#include <unistd.h>

#include <chrono>
#include <cstdlib>
#include <fstream>
#include <string>
#include <thread>
#include <vector>

#include "appliance/base/error_code.h"
#include "appliance/base/paths.h"
#include "appliance/base/process.h"
#include "platform/core.h"
#include "tests/appliance/system/system_test.h"

namespace {

using appliance::ErrorCode;
using std::chrono::milliseconds;
using ::testing::ElementsAre;
using ::testing::HasSubstr;
using ::testing::IsEmpty;

// Goes into the background as the file-sharing service's daemons do. Files beside it say how it behaves.
constexpr const char* kProgram = R"(#!/bin/sh
root=${0%/usr/sbin/*}
name=${0##*/}
echo "$name $*" | sed "s:$root::" >> "$root/record"
if [ -e "$root/fails-$name" ]; then echo "first line" >&2; echo "second" >&2; exit 3; fi
if [ -e "$root/hangs-$name" ]; then exec sleep 60; fi
if [ -e "$root/silent-$name" ]; then exit 0; fi
setsid /bin/sh "$root/daemon" "$root" "$name" < /dev/null > /dev/null 2>&1 &
)";

constexpr const char* kDaemon = R"(root=$1
name=$2
trap 'echo "$name HUP" >> "$root/record"' HUP
trap 'echo "$name TERM" >> "$root/record"; rm "$root/run/samba/$name.pid"; sleep 0.1; exit 0' TERM
if [ -e "$root/stubborn-$name" ]; then trap '' TERM; fi
echo $$ > "$root/run/samba/$name.pid"
if [ -e "$root/short-$name" ]; then exec sleep 0.02; fi
while [ -e "$root/daemon" ]; do sleep 0.02; done
)";

constexpr const char* kControl = R"(#!/bin/sh
root=${0%/usr/bin/*}
echo "smbcontrol $*" | sed "s:$root::" >> "$root/record"
[ ! -e "$root/fails-smbcontrol" ]
)";

constexpr const char* kSystemctl = R"(#!/bin/sh
root=${0%/usr/bin/*}
echo "systemctl $*" >> "$root/record"
for last; do :; done
if [ -e "$root/fails-$last" ]; then echo "Unit $last is broken." >&2; exit 5; fi
if [ "$2" = --quiet ]; then [ -e "$root/enabled-$last" ]; fi
)";

constexpr const char* kScript = R"(#!/bin/sh
root=${0%/etc/init.d/*}
echo "${0##*/} $*" >> "$root/record"
[ ! -e "$root/fails-$1" ]
)";

class Services : public system_test::SystemTest {
protected:
    Services() {
        for (const char* name : {"smbd", "nmbd", "winbindd"}) {
            Put(std::string("/usr/sbin/") + name, kProgram, 0755);
        }
        Put("/daemon", kDaemon);
        Put("/usr/bin/smbcontrol", kControl, 0755);
        Put("/usr/bin/systemctl", kSystemctl, 0755);
        Put("/etc/init.d/webdav-httpd-pure", kScript, 0755);
        Put("/record", "");
        Configure("security = ads\n");
    }

    ~Services() override {
        for (const char* name : {"smbd", "nmbd", "winbindd"}) {
            const int pid = Pid(name);
            if (pid > 0) {
                kill(pid, SIGKILL);
            }
        }
    }

    void Configure(const std::string& keys) const {
        Put(appliance::kSmbConf, "[global]\nworkgroup = LAB\n" + keys);
    }

    void Systemd() const {
        ASSERT_EQ(std::system(("mkdir -p " + At("/run/systemd/system")).c_str()), 0);
    }

    int Pid(const std::string& name) const {
        return appliance::ReadPidFile(At("/run/samba/" + name + ".pid"));
    }

    // What was asked since the last look, as soon as there are `count` lines of it.
    std::vector<std::string> Record(std::size_t count = 0) {
        std::vector<std::string> lines;
        for (int round = 0; round < 1000; ++round) {
            lines.clear();
            std::ifstream file(At("/record"));
            for (std::string line; std::getline(file, line);) {
                // How a start finds out that the daemon is there.
                if (line.find(" ping") == std::string::npos) {
                    lines.push_back(line);
                }
            }
            if (lines.size() >= seen + count) {
                break;
            }
            std::this_thread::sleep_for(milliseconds(10));
        }
        std::vector<std::string> fresh(lines.begin() + static_cast<std::ptrdiff_t>(seen), lines.end());
        seen = lines.size();
        return fresh;
    }

    std::size_t seen = 0;
};

const char* const kStartedSmbd = "smbd -D --configfile=/usr/vorn/etc/smb.conf";
const char* const kStartedWinbindd = "winbindd -D --configfile=/usr/vorn/etc/smb.conf";

TEST_F(Services, AreStartedOnceAndStopped) {
    ASSERT_TRUE(appliance::StartService("samba"));
    const int pid = Pid("smbd");
    EXPECT_GT(pid, 0);
    ASSERT_TRUE(appliance::StartService("samba"));
    EXPECT_EQ(Pid("smbd"), pid);
    EXPECT_THAT(Record(), ElementsAre(kStartedSmbd));
    ASSERT_TRUE(appliance::StopService("samba"));
    EXPECT_FALSE(appliance::ProcessStart(pid)) << "the call returned before the end";
    ASSERT_TRUE(appliance::StopService("samba"));
    EXPECT_THAT(Record(), ElementsAre("smbd TERM"));
}

TEST_F(Services, AreRestartedWithANewProcess) {
    ASSERT_EQ(VLIBServiceRestart("winbindd"), 0);
    const int first = Pid("winbindd");
    ASSERT_EQ(VLIBServiceRestart("winbindd"), 0);
    EXPECT_NE(Pid("winbindd"), first);
    EXPECT_FALSE(appliance::ProcessStart(first));
    EXPECT_THAT(Record(), ElementsAre(kStartedWinbindd, "winbindd TERM", kStartedWinbindd));
}

TEST_F(Services, AreReloadedWhereTheyRun) {
    ASSERT_TRUE(appliance::StartService("samba"));
    const int pid = Pid("smbd");
    Record();
    ASSERT_EQ(VLIBServiceReload("samba"), 0);
    EXPECT_THAT(Record(), ElementsAre("smbcontrol --configfile=/usr/vorn/etc/smb.conf smbd reload-config"));
    Put("/fails-smbcontrol", "");
    ASSERT_EQ(VLIBServiceReload("samba"), 0);
    EXPECT_THAT(Record(2),
                ElementsAre("smbcontrol --configfile=/usr/vorn/etc/smb.conf smbd reload-config", "smbd HUP"));
    EXPECT_EQ(Pid("smbd"), pid);
}

TEST_F(Services, AreStartedByAReloadWhereTheyShouldRun) {
    ASSERT_EQ(VLIBServiceReload("nmbd"), 0);
    EXPECT_GT(Pid("nmbd"), 0);
    EXPECT_THAT(Record(), ElementsAre("nmbd -D --configfile=/usr/vorn/etc/smb.conf"));
}

TEST_F(Services, HaveNoWinbinddInAWorkgroup) {
    ASSERT_TRUE(appliance::StartService("winbindd"));
    const int pid = Pid("winbindd");
    Configure("security = user\n");
    EXPECT_EQ(VLIBServiceIsEnabled("winbindd"), 0);
    ASSERT_EQ(VLIBServiceReload("winbindd"), 0);
    EXPECT_FALSE(appliance::ProcessStart(pid));
    Record();
    const appliance::ServiceResult result = appliance::StartService("winbindd");
    EXPECT_EQ(result.failure, ErrorCode::NotMember);
    EXPECT_EQ(result.error, "winbindd runs on a member of a domain only");
    EXPECT_EQ(VLIBServiceRestart("winbindd"), -1);
    EXPECT_EQ(VLIBCErrGet(), static_cast<int>(ErrorCode::NotMember));
    ASSERT_EQ(VLIBServiceReload("winbindd"), 0);
    EXPECT_TRUE(appliance::StopService("winbindd"));
    EXPECT_THAT(Record(), IsEmpty());
    Configure("security = domain\n");
    EXPECT_EQ(VLIBServiceIsEnabled("winbindd"), 1);
    EXPECT_TRUE(appliance::StartService("winbindd"));
}

TEST_F(Services, HaveNoNmbdWithoutNetbios) {
    for (const char* value : {"yes", "Yes", "true", "1", "on"}) {
        Configure(std::string("disable netbios = ") + value + "\n");
        EXPECT_EQ(VLIBServiceIsEnabled("nmbd"), 0);
        EXPECT_EQ(VLIBServiceReload("nmbd"), 0);
        EXPECT_EQ(VLIBServiceRestart("nmbd"), -1);
    }
    EXPECT_THAT(Record(), IsEmpty());
    Configure("disable netbios = no\n");
    EXPECT_EQ(VLIBServiceIsEnabled("nmbd"), 1);
}

TEST_F(Services, ThatFailToStartSayWhy) {
    Put("/fails-smbd", "");
    const appliance::ServiceResult result = appliance::StartService("samba");
    EXPECT_EQ(result.failure, ErrorCode::CommandFailed);
    EXPECT_EQ(result.error, "smbd exited with 3: first line");
    EXPECT_EQ(VLIBServiceReload("samba"), -1);
    EXPECT_EQ(VLIBCErrGet(), static_cast<int>(ErrorCode::CommandFailed));
    EXPECT_STREQ(VLIBCErrorGetFile(), "service_operations.cpp");
}

TEST_F(Services, ThatEndRightAwayHaveFailed) {
    Put("/short-winbindd", "");
    Put("/fails-smbcontrol", "");
    for (int round = 0; round < 2; ++round) {
        const auto begin = std::chrono::steady_clock::now();
        const appliance::ServiceResult result = appliance::StartService("winbindd");
        EXPECT_EQ(result.failure, ErrorCode::CommandFailed);
        EXPECT_EQ(result.error, "winbindd ended right after its start; its own log says why");
        EXPECT_LT(std::chrono::steady_clock::now() - begin, appliance::kServiceDeadline / 2);
    }
    Put("/silent-smbd", "");
    const auto start = std::chrono::steady_clock::now();
    EXPECT_EQ(appliance::StartService("samba", milliseconds(2000)).failure, ErrorCode::CommandFailed);
    EXPECT_LT(std::chrono::steady_clock::now() - start, appliance::kServiceDeadline / 2);
}

TEST_F(Services, ThatAreTooBusyToAnswerAreThere) {
    Put("/fails-smbcontrol", "");
    EXPECT_TRUE(appliance::StartService("samba"));
    EXPECT_GT(Pid("smbd"), 0);
}

TEST_F(Services, AreWaitedForUntilTheDeadline) {
    Put("/hangs-smbd", "");
    const auto start = std::chrono::steady_clock::now();
    EXPECT_EQ(appliance::StartService("samba", milliseconds(300)).failure, ErrorCode::TimedOut);
    EXPECT_LT(std::chrono::steady_clock::now() - start, appliance::kServiceDeadline / 2);
}

TEST_F(Services, ThatDoNotEndAreKilled) {
    Put("/stubborn-smbd", "");
    ASSERT_TRUE(appliance::StartService("samba"));
    const int pid = Pid("smbd");
    ASSERT_TRUE(appliance::StopService("samba", milliseconds(300)));
    EXPECT_FALSE(appliance::ProcessStart(pid));
}

TEST_F(Services, ThatDoNotEndLeaveTimeForTheStart) {
    Put("/stubborn-winbindd", "");
    ASSERT_TRUE(appliance::StartService("winbindd"));
    const int pid = Pid("winbindd");
    const auto start = std::chrono::steady_clock::now();
    const appliance::ServiceResult result = appliance::RestartService("winbindd");
    EXPECT_TRUE(result) << result.error;
    EXPECT_FALSE(appliance::ProcessStart(pid));
    EXPECT_GT(Pid("winbindd"), 0);
    EXPECT_LT(std::chrono::steady_clock::now() - start, milliseconds(6000));
}

TEST_F(Services, NeverTouchTheProcessOfAStalePidFile) {
    const pid_t other = system_test::StartChild([] { std::this_thread::sleep_for(std::chrono::seconds(30)); });
    Put("/run/samba/smbd.pid", std::to_string(other) + "\n");
    ASSERT_EQ(std::system(("touch -d '1 hour ago' " + At("/run/samba/smbd.pid")).c_str()), 0);
    EXPECT_TRUE(appliance::StopService("samba"));
    EXPECT_TRUE(appliance::ProcessStart(other));
    ASSERT_TRUE(appliance::StartService("samba"));
    EXPECT_NE(Pid("smbd"), other);
    kill(other, SIGKILL);
    system_test::EndOf(other);
}

TEST_F(Services, NeedAConfiguration) {
    ASSERT_EQ(unlink(At(appliance::kSmbConf).c_str()), 0);
    const appliance::ServiceResult result = appliance::StartService("samba");
    EXPECT_EQ(result.failure, ErrorCode::FileRead);
    EXPECT_THAT(result.error, HasSubstr("/usr/vorn/etc/smb.conf: No such file"));
    EXPECT_EQ(VLIBServiceIsEnabled("samba"), -1);
    EXPECT_TRUE(appliance::StopService("samba"));
    EXPECT_THAT(Record(), IsEmpty());
}

TEST_F(Services, AreStartedOnceByManyAtOnce) {
    std::vector<pid_t> children;
    for (int number = 0; number < 5; ++number) {
        children.push_back(system_test::StartChild([] { _exit(appliance::StartService("samba") ? 0 : 1); }));
    }
    for (const pid_t child : children) {
        EXPECT_EQ(system_test::EndOf(child), 0);
    }
    EXPECT_THAT(Record(), ElementsAre(kStartedSmbd));
}

TEST_F(Services, OfTypeEightKnowTheAdministrators) {
    ASSERT_EQ(VLIBServiceTypeReload(8), 0);
    EXPECT_THAT(Record(), ElementsAre(kStartedSmbd, kStartedWinbindd));
    for (const int type : {0, 7, 9, -8}) {
        EXPECT_EQ(VLIBServiceTypeReload(type), -1);
        EXPECT_EQ(VLIBCErrGet(), static_cast<int>(ErrorCode::BadArgument));
    }
    // One that fails does not hold up the other.
    ASSERT_TRUE(appliance::StopService("samba"));
    Put("/fails-smbd", "");
    Record();
    EXPECT_EQ(VLIBServiceTypeReload(8), -1);
    EXPECT_THAT(Record(),
                ElementsAre(kStartedSmbd, "smbcontrol --configfile=/usr/vorn/etc/smb.conf winbindd reload-config"));
}

TEST_F(Services, OfOtherNamesAreScripts) {
    ASSERT_EQ(VLIBServiceRestart("webdav-httpd-pure"), 0);
    ASSERT_EQ(VLIBServiceReload("webdav-httpd-pure"), 0);
    ASSERT_TRUE(appliance::StartService("webdav-httpd-pure"));
    ASSERT_TRUE(appliance::StopService("webdav-httpd-pure"));
    EXPECT_THAT(Record(), ElementsAre("webdav-httpd-pure restart", "webdav-httpd-pure reload",
                                      "webdav-httpd-pure start", "webdav-httpd-pure stop"));
    Put("/fails-reload", "");
    ASSERT_EQ(VLIBServiceReload("webdav-httpd-pure"), 0);
    EXPECT_THAT(Record(), ElementsAre("webdav-httpd-pure reload", "webdav-httpd-pure force-reload"));
    Put("/fails-restart", "");
    EXPECT_EQ(VLIBServiceRestart("webdav-httpd-pure"), -1);
    EXPECT_EQ(VLIBServiceRestart("no-such-service"), -1);
    EXPECT_EQ(VLIBCErrGet(), static_cast<int>(ErrorCode::NotFound));
}

TEST_F(Services, AreEnabledByAStartLink) {
    EXPECT_EQ(VLIBServiceIsEnabled("webdav-httpd-pure"), 0);
    for (const char* link : {"K01webdav-httpd-pure", "Sx1webdav-httpd-pure", "S1xwebdav-httpd-pure",
                             "S01webdav-httpd-pure2", "S01xwebdav-httpd-pure", "S01no-such-service"}) {
        Put(std::string("/etc/rc2.d/") + link, "");
    }
    EXPECT_EQ(VLIBServiceIsEnabled("webdav-httpd-pure"), 0);
    EXPECT_EQ(VLIBServiceIsEnabled("no-such-service"), 0);
    Put("/etc/rc2.d/S03webdav-httpd-pure", "");
    EXPECT_EQ(VLIBServiceIsEnabled("webdav-httpd-pure"), 1);
    EXPECT_EQ(VLIBServiceIsEnabled("samba"), 1);
    EXPECT_EQ(VLIBServiceIsEnabled("winbindd"), 1);
}

TEST_F(Services, AreUnitsWhereSystemdRuns) {
    Systemd();
    ASSERT_EQ(VLIBServiceReload("samba"), 0);
    ASSERT_EQ(VLIBServiceReload("nmbd"), 0);
    ASSERT_EQ(VLIBServiceReload("winbindd"), 0);
    ASSERT_EQ(VLIBServiceRestart("webdav-httpd-pure"), 0);
    ASSERT_TRUE(appliance::StartService("winbindd"));
    ASSERT_TRUE(appliance::StopService("winbindd"));
    EXPECT_THAT(Record(), ElementsAre("systemctl --no-ask-password reload-or-restart -- smbd.service",
                                      "systemctl --no-ask-password reload-or-restart -- nmbd.service",
                                      "systemctl --no-ask-password reload-or-restart -- winbind.service",
                                      "systemctl --no-ask-password restart -- webdav-httpd-pure.service",
                                      "systemctl --no-ask-password start -- winbind.service",
                                      "systemctl --no-ask-password stop -- winbind.service"));
    Put("/fails-smbd.service", "");
    const appliance::ServiceResult result = appliance::RestartService("samba");
    EXPECT_EQ(result.failure, ErrorCode::CommandFailed);
    EXPECT_EQ(result.error, "samba: exited with 5: Unit smbd.service is broken.");
}

TEST_F(Services, AreEnabledAsSystemdSays) {
    Systemd();
    EXPECT_EQ(VLIBServiceIsEnabled("webdav-httpd-pure"), 0);
    Put("/enabled-webdav-httpd-pure.service", "");
    EXPECT_EQ(VLIBServiceIsEnabled("webdav-httpd-pure"), 1);
    Put("/enabled-winbind.service", "");
    EXPECT_EQ(VLIBServiceIsEnabled("winbindd"), 1);
    ASSERT_EQ(unlink(At("/usr/bin/systemctl").c_str()), 0);
    EXPECT_EQ(VLIBServiceIsEnabled("winbindd"), -1);
    EXPECT_EQ(VLIBCErrGet(), static_cast<int>(ErrorCode::CommandFailed));
}

TEST_F(Services, HaveNoUnitWithoutAPlaceWhereSystemdRuns) {
    Systemd();
    Configure("security = user\ndisable netbios = yes\n");
    ASSERT_EQ(VLIBServiceReload("winbindd"), 0);
    EXPECT_EQ(VLIBServiceRestart("nmbd"), -1);
    EXPECT_THAT(Record(), ElementsAre("systemctl --no-ask-password stop -- winbind.service",
                                      "systemctl --no-ask-password stop -- nmbd.service"));
}

TEST_F(Services, HaveNamesThatAreNoPathsAndNoOptions) {
    for (const bool systemd : {false, true}) {
        if (systemd) {
            Systemd();
        }
        for (const char* name : {"", "-x", "../init.d/webdav-httpd-pure", "a/b", "a b", "a;b", "A", "a\n", "a.b", "a%b",
                                 "webdav_x", "a@b"}) {
            EXPECT_EQ(VLIBServiceReload(name), -1) << name;
            EXPECT_EQ(VLIBServiceRestart(name), -1) << name;
            EXPECT_EQ(VLIBServiceIsEnabled(name), -1) << name;
            EXPECT_EQ(VLIBCErrGet(), static_cast<int>(ErrorCode::BadArgument));
        }
    }
    EXPECT_EQ(VLIBServiceReload(std::string(65, 'a').c_str()), -1);
    EXPECT_EQ(VLIBServiceReload(nullptr), -1);
    EXPECT_EQ(VLIBServiceRestart(nullptr), -1);
    EXPECT_EQ(VLIBServiceIsEnabled(nullptr), -1);
    EXPECT_THAT(Record(), IsEmpty());
}

}  // namespace
