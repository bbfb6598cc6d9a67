#include "appliance/domain/directory/domain_list.h"

#include <fcntl.h>
#include <sys/stat.h>

#include <ctime>

#include "appliance/base/paths.h"
#include "tests/appliance/directory/directory_test.h"

namespace appliance_test {
namespace {

using appliance::KnownDomain;
using appliance::LoadDomains;
using appliance::Membership;
using appliance::ParseOnline;
using appliance::ParseTrustList;
using Domains = std::vector<KnownDomain>;

constexpr char kHead[] =
    "Domain Name     DNS Domain                                                       Trust Type  Transitive  In   Out "
    " \n";
constexpr char kOwn[] =
    "BUILTIN                                                                          Local\n"
    "NAS1                                                                             Local\n"
    "LAB             lab.test                                                         Workstation Yes         No   No  "
    " \n";
constexpr char kRouted[] =
    "OTHER           other.test                                                       Routed (via LAB)\n";
constexpr char kExternal[] =
    "OLD                                                                              External    No          Yes  Yes "
    " \n";
constexpr char kOnline[] = "BUILTIN : active connection\nNAS1 : active connection\nLAB : active connection\n";
constexpr char kOffline[] = "BUILTIN : active connection\nNAS1 : active connection\nLAB : no active connection\n";

const KnownDomain kLab{"LAB", "lab.test", true};
const KnownDomain kOther{"OTHER", "other.test", false};
const KnownDomain kOld{"OLD", "", false};

std::string List(const std::string& lines) {
    return kHead + (kOwn + lines);
}

TEST(TrustListTest, ReadsTheTrustedDomains) {
    EXPECT_EQ(ParseTrustList(List(std::string(kRouted) + kExternal), "LAB"), (Domains{kOther, kOld}));
    EXPECT_EQ(ParseTrustList(List(""), "lab"), Domains{});
}

TEST(TrustListTest, RefusesWhatIsNoList) {
    for (const char* text :
         {"", "failed to call wbcListTrusts: WBC_ERR_WINBIND_NOT_AVAILABLE\n", "LAB\nOTHER\n", kHead}) {
        EXPECT_FALSE(ParseTrustList(text, "LAB")) << text;
    }
    EXPECT_FALSE(ParseTrustList(List(kRouted), "ELSEWHERE"));
}

TEST(TrustListTest, LeavesOutDamagedLines) {
    const std::string damaged[] = {
        "SHORT\n",
        "ANAMETHATISTOOLONG other.test                                                  Forest\n",
        "BAD|NAME        other.test                                                       Forest\n",
        "BADDNS          -other.test                                                      Forest\n",
        "CONTROL         oth\x01er.test                                                     Forest\n",
        "                other.test                                                       Forest\n",
        "NOTYPE          other.test\n",
        "LAB             other.test                                                       Forest\n",
    };
    for (const std::string& line : damaged) {
        EXPECT_EQ(ParseTrustList(List(line + kExternal), "LAB"), Domains{kOld}) << line;
    }
    EXPECT_EQ(ParseTrustList(List(std::string(kExternal) + kExternal), "LAB"), Domains{kOld});
}

TEST(OnlineTest, LooksAtTheDomainAskedFor) {
    EXPECT_TRUE(ParseOnline(kOnline, "lab"));
    EXPECT_FALSE(ParseOnline(kOffline, "LAB"));
    EXPECT_FALSE(ParseOnline(kOnline, "OTHER"));
    EXPECT_FALSE(ParseOnline("", "LAB"));
    EXPECT_FALSE(ParseOnline("LAB: active connection\n", "LAB"));
}

class DomainListTest : public DirectoryTest {
protected:
    DomainListTest() {
        MakeMember(true);
        EXPECT_FALSE(appliance::ReadMembership(membership));
    }
    // What wbinfo answers to its two questions.
    void PutWinbind(const std::string& list, const std::string& status) {
        Put(folder / "list", list);
        Put(folder / "status", status);
        PutProgram("wbinfo", "case \"$*\" in *online-status*) cat '" + folder / "status" + "';; *) cat '" +
                                 folder / "list" + "';; esac");
    }

    Membership membership;
};

TEST_F(DomainListTest, KnowsTheOwnDomainWithoutAskingAnyone) {
    EXPECT_EQ(LoadDomains(membership), Domains{kLab});
    membership.kind = appliance::DomainKind::Nt4;
    EXPECT_EQ(LoadDomains(membership), (Domains{{"LAB", "", true}}));
}

TEST_F(DomainListTest, KeepsWhatItSaw) {
    PutWinbind(List(kRouted), kOnline);
    EXPECT_EQ(appliance::ListDomains(membership), (Domains{kLab, kOther}));
    EXPECT_EQ(LoadDomains(membership), (Domains{kLab, kOther}));
    // A trust that ended while the controller is there to say so.
    PutWinbind(List(kExternal), kOnline);
    EXPECT_EQ(appliance::ListDomains(membership), (Domains{kLab, kOld}));
    EXPECT_EQ(LoadDomains(membership), (Domains{kLab, kOld}));
}

TEST_F(DomainListTest, KeepsTrustedDomainsThatWinbindForgot) {
    ASSERT_TRUE(appliance::SaveDomains({kLab, kOther}));
    PutWinbind(List(kExternal), kOffline);
    EXPECT_EQ(appliance::ListDomains(membership), (Domains{kLab, kOld, kOther}));
    PutWinbind(List(""), "");
    EXPECT_EQ(appliance::ListDomains(membership), (Domains{kLab, kOld, kOther}));
}

TEST_F(DomainListTest, AnswersWhatIsKnownWithoutWinbind) {
    ASSERT_TRUE(appliance::SaveDomains({kLab, kOther}));
    PutAnswer("wbinfo", "failed to call wbcListTrusts: WBC_ERR_WINBIND_NOT_AVAILABLE\n", 1);
    EXPECT_EQ(appliance::ListDomains(membership), (Domains{kLab, kOther}));
    PutAnswer("wbinfo", List(kExternal), 1);
    EXPECT_EQ(appliance::ListDomains(membership), (Domains{kLab, kOther}));
}

TEST_F(DomainListTest, WaitsOnlySecondsForWinbind) {
    ASSERT_TRUE(appliance::SaveDomains({kLab, kOther}));
    PutProgram("wbinfo", "exec sleep 60");
    const auto started = std::chrono::steady_clock::now();
    EXPECT_EQ(appliance::ListDomains(membership), (Domains{kLab, kOther}));
    EXPECT_LT(std::chrono::steady_clock::now() - started, std::chrono::seconds(8));
}

TEST_F(DomainListTest, ForgetsTheTrustsOfAnotherDomain) {
    ASSERT_TRUE(appliance::SaveDomains({{"ELSE", "else.test", true}, kOther}));
    EXPECT_EQ(LoadDomains(membership), Domains{kLab});
}

TEST_F(DomainListTest, SurvivesADamagedFile) {
    for (const char* text :
         {"", "{", "{}", "[1]", "[{\"name\":1}]", "[{\"name\":\"LAB\",\"dns\":\"lab.test\"}]",
          "[{\"dns\":\"lab.test\",\"name\":\"LAB\",\"own\":true},{\"dns\":\"\",\"name\":\"a/b\",\"own\":"
          "false},{\"dns\":\"-x\",\"name\":\"X\",\"own\":false}]"}) {
        Put(appliance::Path(appliance::kDomainList), text);
        EXPECT_EQ(LoadDomains(membership), Domains{kLab}) << text;
    }
}

TEST_F(DomainListTest, FindsByEitherName) {
    const Domains domains = {kLab, kOther, kOld};
    EXPECT_EQ(FindDomain(domains, "other"), kOther);
    EXPECT_EQ(FindDomain(domains, "OTHER.test"), kOther);
    EXPECT_EQ(FindDomain(domains, "old"), kOld);
    EXPECT_FALSE(FindDomain(domains, ""));
    EXPECT_FALSE(FindDomain(domains, "none"));
}

TEST_F(DomainListTest, RefreshFailsWhenNobodyAnswers) {
    ASSERT_TRUE(appliance::SaveDomains({{"LAB", "", true}, kOther}));
    membership.kind = appliance::DomainKind::Nt4;  // no controller to ask by LDAP
    PutAnswer("wbinfo", "", 1);
    EXPECT_FALSE(appliance::RefreshDomains(membership));
    EXPECT_EQ(LoadDomains(membership), (Domains{{"LAB", "", true}, kOther}));
    PutWinbind(List(kExternal), kOffline);
    EXPECT_TRUE(appliance::RefreshDomains(membership));
    EXPECT_EQ(LoadDomains(membership), (Domains{{"LAB", "", true}, kOld, kOther}));
    Publish(appliance::EntryKind::User, "LAB", {"alice"});
    Publish(appliance::EntryKind::User, "OTHER", {"zed"});
    EXPECT_TRUE(appliance::RefreshDomains(membership));
    EXPECT_EQ(appliance::FindLists().size(), 2u);
    PutWinbind(List(kExternal), kOnline);
    EXPECT_TRUE(appliance::RefreshDomains(membership));
    EXPECT_EQ(LoadDomains(membership), (Domains{{"LAB", "", true}, kOld}));
    // Winbind may have forgotten it for once.
    EXPECT_EQ(Listed(appliance::EntryKind::User, "OTHER"), std::vector<std::string>{"zed"});
    for (const auto& [domain, hours] : {std::pair("OTHER", 7 * 24 + 1), std::pair("LAB", 9 * 24)}) {
        const std::string list = appliance::ListPath(appliance::EntryKind::User, domain);
        const timespec then = {std::time(nullptr) - hours * 3600, 0};
        const timespec times[] = {then, then};
        ASSERT_EQ(utimensat(AT_FDCWD, list.c_str(), times, 0), 0);
    }
    EXPECT_TRUE(appliance::RefreshDomains(membership));
    EXPECT_EQ(Listed(appliance::EntryKind::User, "OTHER"), std::vector<std::string>{"<none>"});
    EXPECT_EQ(Listed(appliance::EntryKind::User, "LAB"), std::vector<std::string>{"alice"});
}

}  // namespace
}  // namespace appliance_test
