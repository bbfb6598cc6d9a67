// The DNS name check of a join that failed: whether the domain's name resolves, and what keeps it from a shell.

#include <string>
#include <vector>

#include "tests/unit/set_test.h"

namespace {

using ::testing::ElementsAre;
using ::testing::IsEmpty;
using unit::FailsWith;
using unit::JoinRequest;
using unit::Logs;
using unit::Succeeds;

const std::string kCommand = "/usr/bin/nslookup ";
const std::string kOutput = " > /usr/vorn/etc/private/dns_query 2>&1";
constexpr const char* kOutputPath = "/usr/vorn/etc/private/dns_query";

class DnsCheck : public unit::SetTest {
protected:
    DnsCheck() {
        MakeJoinFail("Invalid KDC ip.");
    }

    void Again() {
        Restart();
        MakeJoinFail("Invalid KDC ip.");
    }

    // A join of this domain that brings new DNS servers.
    static Json::Value Joining(const std::string& domain, const std::string& dns = "192.0.2.7") {
        Json::Value parameters = JoinRequest();
        parameters["domain_name"] = domain;
        parameters["dns"] = dns;
        return parameters;
    }

    void ExpectNameError() {
        EXPECT_THAT(appliance.Logs(),
                    ElementsAre(Logs("domain.cpp", "%s:%d domain dns name error", "domain dns name error"),
                                Logs("domain.cpp", "%s:%d Failed to save domain/workgroup info.",
                                     "Failed to save domain/workgroup info.")));
        EXPECT_EQ(appliance.CountOf("ErrWINIState1Get"), 0);
    }

    // No command, and nothing that touches the command's output.
    void ExpectRefused(const std::string& domain) {
        Again();
        state.files.insert(kOutputPath);
        EXPECT_THAT(Call(DomainSet, Joining(domain)), FailsWith(2602));
        EXPECT_THAT(state.commands, IsEmpty());
        EXPECT_EQ(appliance.CountOf("system"), 0);
        EXPECT_TRUE(state.Exists(kOutputPath));
        ExpectNameError();
    }

    void ExpectCommand(const std::string& domain, const std::string& command) {
        Again();
        EXPECT_THAT(Call(DomainSet, Joining(domain)), FailsWith(2603));
        EXPECT_THAT(state.commands, ElementsAre(command));
    }
};

TEST_F(DnsCheck, LooksTheNameUpAndGoesOnToTheStatus) {
    EXPECT_THAT(Call(DomainSet, Joining("lab.test")), FailsWith(2603));
    EXPECT_THAT(state.commands, ElementsAre("/usr/bin/nslookup lab.test > /usr/vorn/etc/private/dns_query 2>&1"));
    EXPECT_THAT(CallsOf({"VORNWinJoin1", "system", "ErrWINIState1Get"}).back(), "ErrWINIState1Get(size 24, size 512)");
    EXPECT_THAT(Messages(), ElementsAre("Failed to save domain/workgroup info."));
}

TEST_F(DnsCheck, Answers2602ForANameThatDoesNotResolveWhateverTheStatusSays) {
    for (const int result : {-1, 1, 2, 256}) {
        SCOPED_TRACE(result);
        Again();
        state.systemResult = result;
        state.files.insert(kOutputPath);
        EXPECT_THAT(Call(DomainSet, Joining("lab.test")), FailsWith(2602));
        EXPECT_EQ(state.commands.size(), 1U);
        ExpectNameError();
        EXPECT_TRUE(state.Exists(kOutputPath)) << "the output stays";
    }
}

TEST_F(DnsCheck, PutsBackTheServersAfterwards) {
    state.systemResult = 1;
    const auto before = state.dnsServers;
    EXPECT_THAT(Call(DomainSet, Joining("lab.test")), FailsWith(2602));
    EXPECT_EQ(state.dnsServers, before);
    EXPECT_THAT(CallsOf({"VORNNetDNSListSet", "system"}),
                ElementsAre(R"(VORNNetDNSListSet(["192.0.2.7"]))",
                            R"(system("/usr/bin/nslookup lab.test > /usr/vorn/etc/private/dns_query 2>&1"))",
                            R"(VORNNetDNSListSet(["192.0.2.1", "192.0.2.2"]))"));
}

TEST_F(DnsCheck, NeedsNewServers) {
    state.systemResult = 1;
    EXPECT_THAT(Call(DomainSet, JoinRequest()), FailsWith(2603));
    EXPECT_THAT(Call(DomainSet, Joining("lab.test", "")), FailsWith(2603));
    EXPECT_THAT(state.commands, IsEmpty());
}

TEST_F(DnsCheck, NeedsNoServersThatDiffer) {
    state.systemResult = 1;
    EXPECT_THAT(Call(DomainSet, Joining("lab.test", "192.0.2.1,192.0.2.2")), FailsWith(2602));
    EXPECT_EQ(appliance.CountOf("VORNNetDNSListSet"), 0);
}

TEST_F(DnsCheck, TakesEmptyEntriesForServers) {
    state.systemResult = 1;
    EXPECT_THAT(Call(DomainSet, Joining("lab.test", ",")), FailsWith(2602));
}

TEST_F(DnsCheck, NeedsADotInTheName) {
    state.systemResult = 1;
    for (const char* name : {"LAB", "", "lab-test", "lab;test", "-lab"}) {
        EXPECT_THAT(Call(DomainSet, Joining(name)), FailsWith(2603)) << name;
    }
    EXPECT_THAT(state.commands, IsEmpty());
    for (const char* name : {".", ".lab", "lab.", "l.a.b"}) {
        EXPECT_THAT(Call(DomainSet, Joining(name)), FailsWith(2602)) << name;
    }
    EXPECT_EQ(state.commands.size(), 4U);
}

TEST_F(DnsCheck, IsNotMadeForAJoinThatWorks) {
    state.joinResult = 0;
    state.systemResult = 1;
    EXPECT_THAT(Call(DomainSet, Joining("lab.test")), Succeeds("null"));
    EXPECT_THAT(Call(DomainSet, Joining("lab.test;x")), Succeeds("null"));
    EXPECT_THAT(state.commands, IsEmpty());
}

TEST_F(DnsCheck, LeavesACodeThatWasRecordedBefore) {
    state.systemResult = 1;
    Json::Value parameters = Joining("lab.test");
    parameters["manage_mode"] = "1";
    EXPECT_THAT(Call(DomainSet, parameters), FailsWith(2618));
    EXPECT_THAT(Messages(), ElementsAre("wrong the paramter: manage_mode", "domain dns name error",
                                        "Failed to save domain/workgroup info."));
}

TEST_F(DnsCheck, TellsEveryByteAtEveryPlaceOfTheName) {
    const std::string special = "\"';&|<>()$\\*?[]{}~#!`\x7F";
    for (int byte = 1; byte <= 255; ++byte) {
        SCOPED_TRACE(byte);
        const std::string text(1, static_cast<char>(byte));
        const bool refused = byte <= 0x20 || special.find(text) != std::string::npos;
        const std::string names[] = {text + "ab.test", "la" + text + ".test", "lab.tes" + text};
        for (const std::string& name : names) {
            if (refused || (text == "-" && name[0] == '-')) {
                ExpectRefused(name);
            } else {
                ExpectCommand(name, kCommand + name + kOutput);
            }
        }
    }
}

TEST_F(DnsCheck, TellsBytesBesideTheDot) {
    ExpectRefused(".;");
    ExpectRefused(";.");
    ExpectRefused("-.");
    ExpectCommand(".-", kCommand + ".-" + kOutput);
}

TEST_F(DnsCheck, EndsTheNameAtItsFirstNul) {
    ExpectCommand(std::string("lab.test\0;rm", 12), kCommand + "lab.test" + kOutput);
    Again();
    state.systemResult = 1;
    EXPECT_THAT(Call(DomainSet, Joining(std::string("lab\0.test", 9))), FailsWith(2603)) << "no dot before the end";
    EXPECT_THAT(state.commands, IsEmpty());
    ExpectRefused(std::string("lab.;\0test", 10));
}

TEST_F(DnsCheck, CutsTheCommandTo1023Characters) {
    for (const std::size_t length : {1021U, 1022U, 1023U, 1024U, 1025U, 1062U, 3000U}) {
        SCOPED_TRACE(length);
        const std::string name = "l." + std::string(length - kCommand.size() - kOutput.size() - 2, 'n');
        const std::string whole = kCommand + name + kOutput;
        ASSERT_EQ(whole.size(), length);
        ExpectCommand(name, whole.substr(0, 1023));
    }
}

TEST_F(DnsCheck, LooksAtTheNameBeforeItIsCut) {
    ExpectRefused("l." + std::string(1500, 'n') + ";");
    ExpectRefused("l." + std::string(1003, 'n') + " ");
    ExpectCommand("l." + std::string(1500, 'n') + "-", kCommand + "l." + std::string(1023 - kCommand.size() - 2, 'n'));
}

TEST_F(DnsCheck, FindsADotBehindTheCut) {
    ExpectCommand(std::string(1500, 'n') + ".", kCommand + std::string(1023 - kCommand.size(), 'n'));
}

}  // namespace
