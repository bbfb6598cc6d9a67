// What a membership changes in smb.conf: the keys of the domain, and no other byte.

#include "appliance/domain/join/domain_keys.h"

#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include "appliance/base/text.h"
#include "appliance/domain/membership/idmap.h"
#include "tests/appliance/join/join_test.h"

namespace {

using appliance::ConfFile;
using appliance::FormerKeys;
using appliance::Membership;
using join_test::AdMembership;
using join_test::kWorkgroupConf;
using testing::HasSubstr;
using testing::Not;

Membership Nt4(const std::string& domain) {
    Membership membership;
    membership.kind = appliance::DomainKind::Nt4;
    membership.domain = domain;
    membership.machine = "NAS1";
    return membership;
}

TEST(DomainKeys, OfActiveDirectory) {
    ConfFile conf(kWorkgroupConf);
    FormerKeys former;
    ASSERT_TRUE(appliance::WriteDomainKeys(AdMembership("LAB", "LAB.TEST"), true, conf, former));
    EXPECT_EQ(conf.Get("global", "security"), "ads");
    EXPECT_EQ(conf.Get("global", "workgroup"), "LAB");
    EXPECT_EQ(conf.Get("global", "realm"), "LAB.TEST");
    EXPECT_EQ(conf.Get("global", "kerberos method"), "secrets and keytab");
    EXPECT_EQ(conf.Get("global", "password server"), std::nullopt);
    EXPECT_EQ(conf.Get("global", "allow trusted domains"), std::nullopt);
    EXPECT_EQ(conf.Get("global", "idmap config LAB : backend"), "rid");
    EXPECT_EQ(conf.Get("global", "idmap config LAB : range"), "1000000-1999999");
    EXPECT_EQ(conf.Get("global", "vorn sync dctime"), "no");
    // Every line that was there, but for the two that change, is there still.
    for (const std::string& line : appliance::Lines(kWorkgroupConf)) {
        if (!appliance::Contains(line, "WORKGROUP") && !appliance::Contains(line, "Security")) {
            EXPECT_THAT(conf.text(), HasSubstr(line + "\n"));
        }
    }
}

TEST(DomainKeys, AGivenControllerGoesWithTheJoinThatNamesNone) {
    ConfFile conf(kWorkgroupConf);
    FormerKeys former;
    Membership membership = AdMembership("LAB", "LAB.TEST");
    membership.passwordServer = "dc1.lab.test";
    ASSERT_TRUE(appliance::WriteDomainKeys(membership, true, conf, former));
    EXPECT_EQ(conf.Get("global", "password server"), "dc1.lab.test");
    membership.passwordServer.clear();
    ASSERT_TRUE(appliance::WriteDomainKeys(membership, true, conf, former));
    EXPECT_EQ(conf.Get("global", "password server"), std::nullopt);
    ASSERT_TRUE(appliance::WriteWorkgroupKeys("WORKGROUP", former, conf));
    EXPECT_EQ(conf.text(), kWorkgroupConf);
}

TEST(DomainKeys, OfAnNt4StyleDomain) {
    ConfFile conf(std::string("[global]\n\tdisable netbios = Yes\n\trealm = OLD.TEST\n\tworkgroup = W\n"));
    FormerKeys former;
    ASSERT_TRUE(appliance::WriteDomainKeys(Nt4("NT4DOM"), false, conf, former));
    EXPECT_EQ(conf.Get("global", "security"), "domain");
    EXPECT_EQ(conf.Get("global", "realm"), std::nullopt);
    EXPECT_EQ(conf.Get("global", "kerberos method"), std::nullopt);
    EXPECT_EQ(conf.Get("global", "disable netbios"), "no");
    EXPECT_EQ(conf.Get("global", "allow trusted domains"), "no");
}

TEST(DomainKeys, LeavingBringsBackEveryByte) {
    const std::string before = kWorkgroupConf;
    ConfFile conf(before);
    FormerKeys former;
    Membership membership = AdMembership("LAB", "LAB.TEST");
    membership.passwordServer = "10.0.0.1";
    ASSERT_TRUE(appliance::WriteDomainKeys(membership, false, conf, former));
    EXPECT_EQ(conf.Get("global", "password server"), "10.0.0.1");
    EXPECT_EQ(conf.Get("global", "allow trusted domains"), "no");
    // A trusted domain's range, written later.
    for (const auto& [key, value] : appliance::MissingIdmapKeys(conf, {"OTHER"})) {
        ASSERT_TRUE(conf.Set("global", key, value));
    }
    const FormerKeys stored = appliance::ParseFormerKeys(appliance::FormatFormerKeys(former));
    EXPECT_EQ(stored, former);
    ASSERT_TRUE(appliance::WriteWorkgroupKeys("WORKGROUP", stored, conf));
    EXPECT_EQ(conf.text(), before);
}

TEST(DomainKeys, LeavingAfterTwoDomainsBringsBackTheFirstState) {
    const std::string before = kWorkgroupConf;
    ConfFile conf(before);
    FormerKeys former;
    ASSERT_TRUE(appliance::WriteDomainKeys(AdMembership("LAB", "LAB.TEST"), true, conf, former));
    ASSERT_TRUE(appliance::WriteDomainKeys(Nt4("NT4DOM"), true, conf, former));
    EXPECT_EQ(conf.Get("global", "realm"), std::nullopt);
    ASSERT_TRUE(appliance::WriteWorkgroupKeys("WORKGROUP", former, conf));
    EXPECT_EQ(conf.text(), before);
}

TEST(DomainKeys, LeavingWithoutTheRecordRemovesTheDomainsKeys) {
    ConfFile conf(kWorkgroupConf);
    FormerKeys former;
    ASSERT_TRUE(appliance::WriteDomainKeys(AdMembership("LAB", "LAB.TEST"), true, conf, former));
    ASSERT_TRUE(appliance::WriteWorkgroupKeys("HOME", FormerKeys(), conf));
    EXPECT_EQ(conf.Get("global", "security"), "user");
    EXPECT_EQ(conf.Get("global", "workgroup"), "HOME");
    EXPECT_EQ(conf.Get("global", "realm"), std::nullopt);
    EXPECT_THAT(conf.text(), Not(HasSubstr("idmap config LAB")));
    EXPECT_THAT(conf.text(), HasSubstr("idmap config * : range = 3000-7999"));
}

TEST(DomainKeys, RangesThatWereThereBeforeTheJoinStay) {
    const std::string own = "idmap config CORP : range = 5000000-5999999";
    ConfFile conf("[global]\n\tworkgroup = W\n\tsecurity = user\n\t" + own + "\n");
    FormerKeys former;
    ASSERT_TRUE(appliance::WriteDomainKeys(AdMembership("LAB", "LAB.TEST"), true, conf, former));
    EXPECT_EQ(conf.Get("global", "idmap config LAB : range"), "6000000-6999999");
    ASSERT_TRUE(appliance::WriteWorkgroupKeys("W", former, conf));
    EXPECT_THAT(conf.text(), HasSubstr(own));
}

TEST(DomainKeys, ThatCannotBeWrittenAreRefused) {
    ConfFile conf(kWorkgroupConf);
    FormerKeys former;
    EXPECT_FALSE(appliance::WriteDomainKeys(AdMembership("LA\nB", "LAB.TEST"), true, conf, former));
    EXPECT_FALSE(appliance::WriteWorkgroupKeys("A\nB", former, conf));
}

TEST(DomainKeys, PutBackAroundAnothersChange) {
    const ConfFile before(kWorkgroupConf);
    ConfFile after = before;
    FormerKeys former;
    ASSERT_TRUE(appliance::WriteDomainKeys(AdMembership("LAB", "LAB.TEST"), true, after, former));
    ConfFile current = after;
    ASSERT_TRUE(current.Set("global", "vorn sync dctime", "yes"));
    appliance::TakeOver(after, before, current);
    ConfFile expected = before;
    ASSERT_TRUE(expected.Set("global", "vorn sync dctime", "yes"));
    EXPECT_EQ(current.text(), expected.text());
}

TEST(DomainKeys, ADamagedRecordIsNone) {
    EXPECT_TRUE(appliance::ParseFormerKeys("").empty());
    EXPECT_TRUE(appliance::ParseFormerKeys("[1]").empty());
    EXPECT_TRUE(appliance::ParseFormerKeys("{\"key\": \"a\\nb\"}").empty());
}

TEST(IdmapKeys, AreGivenOnceToNamesThatCanBe) {
    ConfFile conf("[global]\n");
    const auto keys = appliance::MissingIdmapKeys(conf, {"LAB", "A:B", "-X", "lab2"});
    ASSERT_EQ(keys.size(), 6U);
    EXPECT_EQ(keys[0].first, "idmap config * : backend");
    EXPECT_EQ(keys[3].first, "idmap config LAB : range");
    EXPECT_EQ(keys[5].first, "idmap config LAB2 : range");
    EXPECT_EQ(keys[5].second, "2000000-2999999");
    for (const auto& [key, value] : keys) {
        ASSERT_TRUE(conf.Set("global", key, value));
    }
    EXPECT_TRUE(appliance::MissingIdmapKeys(conf, {"lab", "LAB2"}).empty());
    unsigned low = 0;
    unsigned high = 0;
    EXPECT_TRUE(appliance::IdmapRange(conf, "lab2", low, high));
    EXPECT_EQ(low, 2000000U);
    EXPECT_EQ(high, 2999999U);
    EXPECT_FALSE(appliance::IdmapRange(conf, "NONE", low, high));
}

}  // namespace
