// Settings, capabilities, DNS servers, events, services: what changes the machine, or asks what only an appliance has.

#include "platform/settings.h"
#include "machine_test.h"
#include "platform/domain.h"
#include "platform/eventlog.h"
#include "platform/network.h"

using contract::kSettings;
using contract::List;

namespace {

// ---- Settings and capabilities ----

constexpr const char* kKey = "contract_test_setting";

TEST(Settings, AreReadAsTheyAreAtPresent) {
    const contract::KeptFile kept(kSettings);
    const std::string before = contract::ReadFile(kSettings) == "(missing)" ? "" : contract::ReadFile(kSettings) + "\n";
    VornConf conf;
    ASSERT_STREQ(conf.Info(kKey, "none"), "none");
    contract::WriteFile(kSettings, before + kKey + "=first\n");
    EXPECT_STREQ(conf.Info(kKey, "none"), "first") << "of the reader that was there before";
    EXPECT_STREQ(VornConf().Info(kKey, "none"), "first");
    contract::WriteFile(kSettings, before + kKey + "=second\n");
    EXPECT_STREQ(VornConf().Info(kKey, "none"), "second");
    ASSERT_GE(VLIBCFileRemoveKey(kSettings, kKey), 0);
    EXPECT_STREQ(VornConf().Info(kKey, "none"), "none");
}

TEST(Settings, AreNoCapabilities) {
    const contract::KeptFile kept(kSettings);
    contract::WriteFile(kSettings, std::string(kKey) + "=yes\n");
    VornConf conf;
    EXPECT_STREQ(conf.Def(kKey, "none"), "none");
    EXPECT_EQ(VLIBCSupportGet(kKey), 0);
}

TEST(Settings, OfTwoReadersDoNotMix) {
    VornConf first;
    VornConf second;
    const char* one = first.Def("no such capability of any model", "first");
    const char* other = second.Def("no such capability of any model", "second");
    EXPECT_STREQ(one, "first");
    EXPECT_STREQ(other, "second");
}

// Without this one the module says that the model has no domain support, whatever else works.
TEST(Capabilities, SayThatDomainsAreSupported) {
    VornConf conf;
    EXPECT_STREQ(conf.Def("supportdomain", "missing"), "yes");
}

TEST(Capabilities, AreTheSameByBothWays) {
    for (const char* capability : {"supportdomain", "supporttrustdomain"}) {
        VornConf conf;
        EXPECT_EQ(VLIBCSupportGet(capability) != 0, std::string(conf.Def(capability, "")) == "yes") << capability;
    }
}

// ---- DNS servers ----

class DnsServers : public testing::Test {
protected:
    DnsServers() {
        EXPECT_GE(VORNNetDNSListGet(&before.list), 0);
    }
    ~DnsServers() override {
        EXPECT_GE(VORNNetDNSListSet(before.list), 0);
        List after;
        EXPECT_GE(VORNNetDNSListGet(&after.list), 0);
        EXPECT_EQ(after.Texts(), before.Texts()) << "the machine's own list is not back";
    }

    List before;
};

TEST_F(DnsServers, AreSetInTheirOrder) {
    List wanted;
    ASSERT_TRUE(wanted.Push("192.0.2.53"));
    ASSERT_TRUE(wanted.Push("192.0.2.7"));
    ASSERT_GE(SUCCEEDING(VORNNetDNSListSet(wanted.list)), 0);
    EXPECT_EQ(wanted.Texts(), (std::vector<std::string>{"192.0.2.53", "192.0.2.7"})) << "the list stays the caller's";
    List found;
    ASSERT_GE(SUCCEEDING(VORNNetDNSListGet(&found.list)), 0);
    EXPECT_EQ(found.Texts(), wanted.Texts());
}

TEST_F(DnsServers, ReplaceThoseBefore) {
    for (const char* server : {"192.0.2.1", "192.0.2.2"}) {
        List wanted;
        ASSERT_TRUE(wanted.Push(server));
        ASSERT_GE(VORNNetDNSListSet(wanted.list), 0);
        List found;
        ASSERT_GE(VORNNetDNSListGet(&found.list), 0);
        EXPECT_EQ(found.Texts(), std::vector<std::string>{server});
    }
}

TEST_F(DnsServers, AreAppendedAlsoToAListWithoutRoom) {
    List wanted;
    ASSERT_TRUE(wanted.Push("192.0.2.1"));
    ASSERT_TRUE(wanted.Push("192.0.2.2"));
    ASSERT_GE(VORNNetDNSListSet(wanted.list), 0);
    List found(1);
    ASSERT_TRUE(found.Push("own"));
    ASSERT_GE(VORNNetDNSListGet(&found.list), 0);
    EXPECT_EQ(found.Texts(), (std::vector<std::string>{"own", "192.0.2.1", "192.0.2.2"}));
}

// ---- The switch for trusted domains ----

TEST(TrustedDomains, AreSwitchedOnAndOff) {
    const int before = VORNWinIsEnableTrustDomain();
    for (const int wanted : {0, 1, 0, 1}) {
        EXPECT_GE(SUCCEEDING(VORNWinSetTrustDomain(wanted)), 0);
        EXPECT_EQ(VORNWinIsEnableTrustDomain() != 0, wanted == 1);
    }
    // Any value that was answered may be set again, and is then answered again.
    EXPECT_GE(VORNWinSetTrustDomain(before), 0);
    EXPECT_EQ(VORNWinIsEnableTrustDomain(), before);
}

// ---- Events ----

TEST(Events, AreWritten) {
    EXPECT_GE(SUCCEEDING(VORNLogSet1(2, 1, 0x11800404, "CONTRACT", "", "", "")), 0);
    EXPECT_GE(SUCCEEDING(VORNLogSet1(2, 1, 0x11800506, "WORKGROUP", "", "", "")), 0);
}

TEST(Events, WithAnyTextAreWritten) {
    EXPECT_GE(VORNLogSet1(2, 1, 0x11800404, "", "", "", ""), 0);
    EXPECT_GE(VORNLogSet1(2, 1, 0x11800404, "%s%n%s", "'); --", "\xFF\xFE", "\n"), 0);
    EXPECT_GE(VORNLogSet1(2, 1, 0x11800404, std::string(5000, 'x').c_str(), "", "", ""), 0);
}

// ---- Services ----

constexpr const char* kNoService = "contract-no-such-service";

TEST(Services, ThatNobodyKnowsAreRefused) {
    EXPECT_EQ(FAILING(VLIBServiceReload(kNoService)), -1);
    EXPECT_EQ(FAILING(VLIBServiceRestart(kNoService)), -1);
    EXPECT_LE(VLIBServiceIsEnabled(kNoService), 0);
}

TEST(Services, WithNamesThatNoneCanHaveAreRefused) {
    for (const std::string& name : {std::string(), std::string("../../bin/true"), std::string("a b;c"),
                                    std::string("-h"), std::string(5000, 's')}) {
        EXPECT_EQ(VLIBServiceReload(name.c_str()), -1) << name;
        EXPECT_EQ(VLIBServiceRestart(name.c_str()), -1) << name;
        EXPECT_LE(VLIBServiceIsEnabled(name.c_str()), 0) << name;
    }
}

TEST(Services, OfFileSharingAreReloaded) {
    EXPECT_EQ(VLIBServiceIsEnabled("samba"), 1);
    EXPECT_GE(SUCCEEDING(VLIBServiceReload("samba")), 0);
    EXPECT_GE(SUCCEEDING(VLIBServiceTypeReload(8)), 0);
}

}  // namespace
