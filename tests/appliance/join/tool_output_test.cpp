// From the tools' words to the status messages that the classification of failures knows.

#include "appliance/domain/join/tool_output.h"

#include <gtest/gtest.h>

#include "appliance/domain/join/account_check.h"
#include "appliance/domain/join/join_status.h"

namespace {

using appliance::CommandResult;
using appliance::TicketResult;
namespace status = appliance::status;

CommandResult Ended(int code, const std::string& output, const std::string& errors = "") {
    CommandResult result;
    result.end = CommandResult::End::Exited;
    result.code = code;
    result.output = output;
    result.errors = errors;
    return result;
}

CommandResult EndedBy(CommandResult::End end) {
    CommandResult result;
    result.end = end;
    return result;
}

struct Row {
    const char* name;
    const char* output;
    const char* message;
};

class JoinWords : public testing::TestWithParam<Row> {};

TEST_P(JoinWords, BecomeTheStatusMessage) {
    EXPECT_EQ(appliance::JoinFailureMessage(Ended(255, GetParam().output)), GetParam().message);
}

const char kLookup[] = "Failed to join domain: failed to lookup DC info for domain 'LAB.TEST' over rpc: ";
#define LOOKUP(text) "Failed to join domain: failed to lookup DC info for domain 'LAB.TEST' over rpc: " text "\n"

INSTANTIATE_TEST_SUITE_P(
    NetAdsJoin, JoinWords,
    testing::Values(
        Row{"logon",
            LOOKUP("The attempted logon is invalid. This is either due to a bad username or authentication "
                   "information."),
            "The username or password was not correct."},
        Row{"disabled", LOOKUP("The referenced account is currently disabled and cannot be logged on to."),
            "The account was disabled."},
        Row{"locked",
            LOOKUP("The user account has been automatically locked because too many invalid logon attempts or "
                   "password change attempts have been requested."),
            "Clients credentials have been revoked while getting initial credentials"},
        Row{"expired", LOOKUP("The user account has expired."),
            "Clients credentials have been revoked while getting initial credentials"},
        Row{"must change", LOOKUP("The user password must be changed before logging on the first time."),
            "Password has expired while getting initial credentials"},
        Row{"no right", "Failed to join domain: User specified does not have administrator privileges\n",
            "Unable to join domain: User specified does not have administrator privileges"},
        Row{"no right to an account",
            "Failed to join domain: Failed to set account flags for machine account (NT_STATUS_ACCESS_DENIED)\n",
            "Unable to join domain: Failed to set account flags for machine account (NT_STATUS_ACCESS_DENIED)"},
        Row{"insufficient access",
            "ads_print_error: AD LDAP ERROR: 50 (Insufficient access): acl\n"
            "Failed to join domain: failed to set machine spn\n",
            "ads_join_realm: Insufficient access"},
        Row{"wrong workgroup",
            "Failed to join domain: Invalid configuration (\"workgroup\" set to 'WRONGWG', should be "
            "'LAB') and configuration modification was not requested\n",
            "Invalid workgroup name."},
        Row{"unknown realm",
            "Failed to join domain: failed to find DC for domain X - A domain controller for this "
            "domain was not found.\n",
            "Neither LDAP server nor PDC can be found."},
        Row{"dead", "Failed to join domain: failed to find DC for domain LAB - The request is not supported.\n",
            "Neither LDAP server nor PDC can be found."},
        Row{"445 dropped",
            LOOKUP("{Device Timeout} The specified I/O operation on %hs was not completed before the "
                   "time-out period expired."),
            "445/tcp is unreachable for DC. Please check the network and firewall settings."},
        Row{"445 reset", LOOKUP("The transport-connection attempt was refused by the remote system."),
            "445/tcp is unreachable for DC. Please check the network and firewall settings."},
        Row{"NT4 no right",
            "Failed to join domain: failed to join domain 'NT4DOM' over rpc: {Access Denied} A process "
            "has requested access to an object but has not been granted those access rights.\n",
            "Unable to join domain: failed to join domain 'NT4DOM' over rpc: {Access Denied} A process has requested "
            "access to an object but has not been granted those access rights."},
        Row{"unknown words", "Failed to join domain: failed to precreate account in ou X: No such object\n",
            "Failed to join domain: failed to precreate account in ou X: No such object"},
        Row{"no such words", "Something else\n", "Something else"}));

TEST(JoinFailure, OfAToolThatDidNotComeToItsEnd) {
    EXPECT_EQ(appliance::JoinFailureMessage(EndedBy(CommandResult::End::TimedOut)), "Error System.");
    EXPECT_EQ(appliance::JoinFailureMessage(EndedBy(CommandResult::End::NotStarted)), "Error System.");
    EXPECT_EQ(appliance::JoinFailureMessage(EndedBy(CommandResult::End::Signalled)), "Error System.");
    EXPECT_EQ(std::string(kLookup).find("Failed to join domain: "), 0U);
}

TEST(JoinFailure, WarningsAboutForeignKeysAreNoWords) {
    const CommandResult result = Ended(255, "", "the reason\nIgnoring unknown parameter \"vorn sync dctime\"\n");
    EXPECT_EQ(appliance::LastWords(result), "the reason");
    EXPECT_EQ(appliance::LastWords(Ended(0, "Join is OK\n", "a warning\n")), "Join is OK");
    EXPECT_EQ(appliance::LastWords(Ended(255, "", "")), "exited with 255");
}

class AccountWords : public testing::TestWithParam<Row> {};

TEST_P(AccountWords, BecomeTheStatusMessage) {
    const std::string errors = std::string("Could not connect to server DC1\n") + GetParam().output;
    EXPECT_EQ(appliance::AccountFailureMessage(Ended(255, "", errors), "DC1"), GetParam().message);
}

INSTANTIATE_TEST_SUITE_P(
    NetRpcInfo, AccountWords,
    testing::Values(Row{"disabled", "The account was disabled.\nConnection failed: NT_STATUS_ACCOUNT_DISABLED\n",
                        "The account was disabled."},
                    Row{"wrong",
                        "The username or password was not correct.\nConnection failed: NT_STATUS_LOGON_FAILURE\n",
                        "The username or password was not correct."},
                    Row{"locked", "The account was locked out.\nConnection failed: NT_STATUS_ACCOUNT_LOCKED_OUT\n",
                        "Clients credentials have been revoked while getting initial credentials"},
                    Row{"expired", "Connection failed: NT_STATUS_ACCOUNT_EXPIRED\n",
                        "Clients credentials have been revoked while getting initial credentials"},
                    Row{"must change", "Connection failed: NT_STATUS_PASSWORD_MUST_CHANGE\n",
                        "Password has expired while getting initial credentials"},
                    Row{"nothing", "", "Could not connect to server DC1"},
                    Row{"other", "Connection failed: NT_STATUS_IO_TIMEOUT\n",
                        "Could not connect to server DC1 (NT_STATUS_IO_TIMEOUT)"}));

TEST(AccountFailure, OfAToolThatSucceededOrDidNotEnd) {
    EXPECT_EQ(appliance::AccountFailureMessage(Ended(0, "Domain Name: LAB\n"), "DC1"), "");
    EXPECT_EQ(appliance::AccountFailureMessage(EndedBy(CommandResult::End::TimedOut), "DC1"),
              "Could not connect to server DC1");
    EXPECT_EQ(appliance::AccountFailureMessage(EndedBy(CommandResult::End::NotStarted), "DC1"), status::kSystem);
}

TEST(TicketFailure, EachOutcomeHasItsMessage) {
    const auto message = [](TicketResult::Outcome outcome, bool pinned) {
        TicketResult result;
        result.outcome = outcome;
        result.words = "Cannot contact any KDC for realm 'LAB.TEST'";
        return appliance::TicketFailureMessage(result, pinned);
    };
    using Outcome = TicketResult::Outcome;
    EXPECT_EQ(message(Outcome::Granted, false), "");
    EXPECT_EQ(message(Outcome::WrongPassword, false), status::kWrongPassword);
    EXPECT_EQ(message(Outcome::UnknownAccount, true), status::kUnknownAccount);
    EXPECT_EQ(message(Outcome::Revoked, false), status::kRevoked);
    EXPECT_EQ(message(Outcome::PasswordExpired, false), status::kExpired);
    EXPECT_EQ(message(Outcome::Unreachable, true), status::kKdc);
    EXPECT_EQ(message(Outcome::Unreachable, false),
              "Cannot contact any KDC for realm 'LAB.TEST' while getting initial credentials");
    EXPECT_EQ(message(Outcome::NotAsked, false), status::kSystem);
}

TEST(Accounts, OfDomainsThatNobodyKnowsAreNotAskedFor) {
    for (const char* user :
         {"admin", "admin@corp.test", "LAB\\admin", "lab\\admin", "lab.test\\admin", "corp.test\\admin"}) {
        EXPECT_TRUE(appliance::KdcKnowsOf(user, "LAB.TEST", "LAB")) << user;
    }
    EXPECT_FALSE(appliance::KdcKnowsOf("CORP\\admin", "LAB.TEST", "LAB"));
}

TEST(Membership, IsProvedByWordsAndNotByTheExitStatusAlone) {
    EXPECT_TRUE(appliance::ProvesMembership(Ended(0, "Join is OK\n")));
    EXPECT_TRUE(appliance::ProvesMembership(Ended(0, "Join to 'NT4DOM' is OK\n")));
    EXPECT_FALSE(appliance::ProvesMembership(Ended(0, "")));
    EXPECT_FALSE(appliance::ProvesMembership(Ended(0, "Join is OKAY\n")));
    EXPECT_FALSE(appliance::ProvesMembership(Ended(255, "Join is OK\n")));
    EXPECT_FALSE(appliance::ProvesMembership(EndedBy(CommandResult::End::TimedOut)));
}

TEST(Lookup, NamesTheDomainOrNothing) {
    const char answer[] =
        "Information for Domain Controller: 10.77.0.10\n\nForest: lab.test\nDomain: lab.test\n"
        "Domain Controller: dc1.lab.test\nPre-Win2k Domain: LAB\nPre-Win2k Hostname: DC1\n";
    const appliance::ControllerInfo info = appliance::ParseLookup(Ended(0, answer));
    EXPECT_EQ(info.realm, "lab.test");
    EXPECT_EQ(info.domain, "LAB");
    EXPECT_EQ(info.name, "dc1.lab.test");
    EXPECT_EQ(appliance::ParseLookup(Ended(255, "Didn't find the cldap server!\n")).realm, "");
    // What a controller says goes into configuration files, so that it must be a name.
    EXPECT_EQ(appliance::ParseLookup(Ended(0, "Domain: -lab.test\nPre-Win2k Domain: LAB\n")).realm, "");
    EXPECT_EQ(appliance::ParseLookup(Ended(0, "Domain: lab.test\nPre-Win2k Domain: L\tB\n")).realm, "");
    EXPECT_EQ(
        appliance::ParseLookup(Ended(0, "Domain: lab.test\nPre-Win2k Domain: LAB\nDomain Controller: a b\n")).name, "");
}

}  // namespace
