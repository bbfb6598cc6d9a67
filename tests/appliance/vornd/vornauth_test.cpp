// The program that asks PAM, with PAM's own modules and a configuration under a root of the test's.

#include <grp.h>
#include <pwd.h>
#include <sys/stat.h>

#include "appliance/base/command.h"
#include "appliance/base/paths.h"
#include "appliance/tools/vornauth/exit_code.h"
#include "appliance/vornd/authenticator.h"
#include "tests/appliance/vornd/door.h"

namespace vornd_test {
namespace {

using appliance::Command;
using appliance::CommandResult;
using appliance::Secret;
using appliance::Verdict;
using namespace std::string_literals;

constexpr const char* kGranted = "auth required pam_permit.so\naccount required pam_permit.so\n";

class VornauthTest : public ::testing::Test {
protected:
    VornauthTest() {
        mkdir(tree_.At("/etc/pam.d").c_str(), 0755);
        Service(kGranted);
        // "daemon" is everywhere, and its primary group has the number 1.
        tree_.Write("/etc/group", "root:x:0:\nadministrators:x:1:\n");
        symlink(VORN_TEST_VORNAUTH, tree_.At("/usr/vorn/sbin/vornauth").c_str());
        appliance::SetRoot(tree_.root());
    }
    ~VornauthTest() override {
        appliance::SetRoot("");
    }
    void Service(const std::string& text) const {
        tree_.Write("/etc/pam.d/vorn", text);
    }
    // A module that runs a script with the password on its standard input.
    void AskScript(const std::string& script) const {
        tree_.Write("/script", "#!/bin/sh\nIFS= read -r password\n" + script, 0755);
        Service("auth [success=1 default=ignore] pam_exec.so quiet expose_authtok " + tree_.At("/script") +
                "\nauth requisite pam_deny.so\nauth required pam_permit.so\naccount required pam_permit.so\n");
    }
    static int Ask(const std::string& input) {
        Command command;
        command.arguments = {VORN_TEST_VORNAUTH};
        command.input = Secret(input);
        const CommandResult result = appliance::Run(command);
        EXPECT_EQ(result.end, CommandResult::End::Exited) << result.Describe() << result.errors;
        EXPECT_EQ(result.output, "");
        return result.code;
    }

    Tree tree_;
};

TEST_F(VornauthTest, AcceptsAnAdministrator) {
    EXPECT_EQ(Ask("daemon\0secret\0"s), appliance::auth::kAccepted);
}

TEST_F(VornauthTest, TakesAUserAndAPassword) {
    for (const std::string& input :
         {""s, "daemon"s, "daemon\0"s, "daemon\0secret"s, "daemon\0secret\0more"s, "daemon\0secret\0\0"s, "\0secret\0"s,
          "-daemon\0secret\0"s, "dae\nmon\0secret\0"s, "daemon\0"s + std::string(2000, 'x') + "\0"s}) {
        EXPECT_EQ(Ask(input), appliance::auth::kUsage) << input.size();
    }
}

TEST_F(VornauthTest, HandsTheVeryPasswordToPam) {
    const std::string password = R"( pass"w$o\rd with blanks)";
    AskScript(R"(test "$password" = ' pass"w$o\rd with blanks')"
              "\n");
    EXPECT_EQ(Ask("daemon\0"s + password + "\0"s), appliance::auth::kAccepted);
    AskScript("test \"$password\" = wanted && test \"$PAM_USER\" = daemon && test \"$PAM_TYPE\" = auth\n");
    EXPECT_EQ(Ask("daemon\0wanted\0"s), appliance::auth::kAccepted);
    EXPECT_EQ(Ask("daemon\0Wanted\0"s), appliance::auth::kWrongPassword);
    EXPECT_EQ(Ask("daemon\0\0"s), appliance::auth::kWrongPassword);
    EXPECT_EQ(Ask("nobody\0wanted\0"s), appliance::auth::kWrongPassword);
}

TEST_F(VornauthTest, SaysWhatPamRefuses) {
    Service("auth required pam_deny.so\naccount required pam_permit.so\n");
    EXPECT_EQ(Ask("daemon\0secret\0"s), appliance::auth::kWrongPassword);
    EXPECT_EQ(Ask("no-such-user\0secret\0"s), appliance::auth::kUnknownUser);
    Service("auth required pam_permit.so\naccount required pam_deny.so\n");
    EXPECT_EQ(Ask("daemon\0secret\0"s), appliance::auth::kAccountRefused);
    Service("auth required pam_no_such_module.so\naccount required pam_permit.so\n");
    EXPECT_EQ(Ask("daemon\0secret\0"s), appliance::auth::kImpossible);
    unlink(tree_.At("/etc/pam.d/vorn").c_str());
    EXPECT_NE(Ask("daemon\0secret\0"s), appliance::auth::kAccepted);
}

TEST_F(VornauthTest, TakesAdministratorsAlone) {
    tree_.Write("/etc/group", "administrators:x:7:\n");
    EXPECT_EQ(Ask("daemon\0secret\0"s), appliance::auth::kNoAdministrator);
    EXPECT_EQ(Ask("root\0secret\0"s), appliance::auth::kNoAdministrator);
    tree_.Write("/etc/group", "root:x:0:\nadministrators:x:7:nobody,daemon\n");
    EXPECT_EQ(Ask("daemon\0secret\0"s), appliance::auth::kAccepted);
    EXPECT_EQ(Ask("bin\0secret\0"s), appliance::auth::kNoAdministrator);
    tree_.Write("/etc/group", "other:x:1:daemon\nadministratorsx:x:1:daemon\nAdministrators:x:1:daemon\n");
    EXPECT_EQ(Ask("daemon\0secret\0"s), appliance::auth::kNoAdministrator);
    unlink(tree_.At("/etc/group").c_str());
    EXPECT_EQ(Ask("daemon\0secret\0"s), appliance::auth::kNoAdministrator);
    std::string many = "administrators:x:7:";
    for (int member = 0; member < 20000; ++member) {
        many += "member" + std::to_string(member) + ",";
    }
    tree_.Write("/etc/group", "first:x:6:x\n" + many + "daemon\n");
    EXPECT_EQ(Ask("daemon\0secret\0"s), appliance::auth::kAccepted);
    tree_.Write("/etc/group", "first:x:6:x\n" + many + "bin\n");
    EXPECT_EQ(Ask("daemon\0secret\0"s), appliance::auth::kNoAdministrator);
}

TEST_F(VornauthTest, AsksAsTheShippedServiceDoes) {
    std::string text;
    ASSERT_FALSE(appliance::ReadFile(VORN_SOURCES "/appliance/defaults/pam.vorn", text));
    // PAM looks for what is included in the system's own folder; the test's is named whole.
    for (const std::string name : {"common-auth", "common-account"}) {
        const std::string line = "@include " + name + "\n";
        ASSERT_NE(text.find(line), std::string::npos);
        text.replace(text.find(line), line.size(), "@include " + tree_.At("/etc/pam.d/") + name + "\n");
    }
    Service(text);
    tree_.Write("/etc/pam.d/common-auth", "auth required pam_permit.so\n");
    tree_.Write("/etc/pam.d/common-account", "account required pam_deny.so\n");
    EXPECT_EQ(Ask("daemon\0secret\0"s), appliance::auth::kAccountRefused);
    tree_.Write("/etc/pam.d/common-account", "account required pam_permit.so\n");
    EXPECT_EQ(Ask("daemon\0secret\0"s), appliance::auth::kAccepted);
    tree_.Write("/etc/pam.d/common-auth", "auth required pam_deny.so\n");
    EXPECT_EQ(Ask("daemon\0secret\0"s), appliance::auth::kWrongPassword);
}

TEST_F(VornauthTest, DoesNotWaitAfterAFailure) {
    Service(
        "auth optional pam_faildelay.so delay=20000000\nauth required pam_deny.so\naccount required pam_permit.so\n");
    Command command;
    command.arguments = {VORN_TEST_VORNAUTH};
    command.input = Secret("daemon\0secret\0"s);
    command.deadline = milliseconds(30000);
    const CommandResult result = appliance::Run(command);
    EXPECT_EQ(result.code, appliance::auth::kWrongPassword);
    EXPECT_LT(result.took.count(), 10000);
}

TEST_F(VornauthTest, TheServerReadsItsAnswers) {
    AskScript("test \"$password\" = wanted\n");
    EXPECT_EQ(appliance::Authenticate("daemon", Secret("wanted")).kind, Verdict::Kind::Accepted);
    const Verdict wrong = appliance::Authenticate("daemon", Secret("wrong"));
    EXPECT_EQ(wrong.kind, Verdict::Kind::Refused);
    EXPECT_EQ(wrong.reason, "wrong password");
    EXPECT_EQ(appliance::Authenticate("root", Secret("wanted")).reason, "not in the group \"administrators\"");
    Service("auth required pam_no_such_module.so\n");
    const Verdict failed = appliance::Authenticate("daemon", Secret("wanted"));
    EXPECT_EQ(failed.kind, Verdict::Kind::Failed);
    EXPECT_THAT(failed.reason, ::testing::HasSubstr("vornauth exited with 1"));
}

}  // namespace
}  // namespace vornd_test
