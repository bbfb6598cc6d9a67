// What the domain library answers on a machine that is in a workgroup.

#include <cstring>

#include "machine_test.h"
#include "platform/domain.h"
#include "platform/settings.h"

using contract::GuardedBuffer;
using contract::List;

namespace {

constexpr const char* kNoDomain = "contract-test.invalid";  // a name that never resolves

class InAWorkgroup : public testing::Test {
protected:
    void SetUp() override {
        ExpectNoMember("before the test: these tests are for a machine that is in a workgroup");
        if (HasFailure()) {
            GTEST_FAIL();
        }
    }
    void TearDown() override {
        ExpectNoMember("after the test");
    }
    static void ExpectNoMember(const char* when) {
        char name[256] = {};
        int first = -1;
        int second = -1;
        EXPECT_GE(WINIQuery1(name, sizeof name, &first, &second), 0) << when;
        EXPECT_EQ(first, 0) << when;
        EXPECT_EQ(second, 0) << when;
        EXPECT_STRNE(name, "") << when;
    }
    static std::string Workgroup() {
        char name[256] = {};
        EXPECT_GE(VORNWorkgroupGet(name, sizeof name), 0);
        return name;
    }
};

TEST_F(InAWorkgroup, TheQueryNamesIt) {
    char name[256] = {};
    int first = -1;
    ASSERT_GE(SUCCEEDING(WINIQuery1(name, sizeof name, &first, nullptr)), 0) << "without the second flag";
    EXPECT_EQ(first, 0);
    EXPECT_EQ(name, Workgroup());
}

TEST_F(InAWorkgroup, ItsNameIsCutToTheBuffer) {
    const std::string whole = Workgroup();
    ASSERT_GT(whole.size(), 3U) << "a longer name is needed here";
    GuardedBuffer fromQuery(4);
    int first = -1;
    ASSERT_GE(WINIQuery1(fromQuery.data(), fromQuery.size(), &first, nullptr), 0);
    GuardedBuffer fromGet(4);
    ASSERT_GE(VORNWorkgroupGet(fromGet.data(), fromGet.size()), 0);
    for (const GuardedBuffer* buffer : {&fromQuery, &fromGet}) {
        EXPECT_TRUE(buffer->GuardsStand());
        ASSERT_TRUE(buffer->IsTerminated());
        EXPECT_EQ(buffer->Text(), whole.substr(0, 3));
    }
}

TEST_F(InAWorkgroup, NothingSaysThatItIsAMember) {
    EXPECT_EQ(VORNWinsIsJoined(), 0);
    EXPECT_EQ(VORNWinADSJoined(), 0);
    for (const std::string& domain : {std::string("CONTRACT"), std::string(kNoDomain), std::string(), Workgroup()}) {
        EXPECT_EQ(VORNWinsIsOwnDomain(domain.c_str()), 0) << domain;
    }
    EXPECT_EQ(VORNWinsIsOwnDomain(std::string(10000, 'd').c_str()), 0);
}

TEST_F(InAWorkgroup, ThereIsNoMembershipToTest) {
    EXPECT_EQ(FAILING(VORNWinTestJoin(0)), -1);
    EXPECT_EQ(FAILING(VORNWinTestJoin(1)), -1);
}

TEST_F(InAWorkgroup, ItIsNotBoundToADirectory) {
    EXPECT_NE(VORNLDAPIsBinded(0), 1);
}

TEST_F(InAWorkgroup, NoDomainsAreInSight) {
    List domains;
    VORNWinsEnumAllDomains(&domains.list);
    ASSERT_NE(domains.list, nullptr);
    EXPECT_EQ(domains.Texts(), std::vector<std::string>());
    EXPECT_TRUE(domains.Push("own")) << "the list can be gone on with";
    VORNWinsEnumAllDomains(&domains.list);
    EXPECT_EQ(domains.Texts(), std::vector<std::string>{"own"});
}

TEST_F(InAWorkgroup, NoOrganisationalUnitsAreInSight) {
    List names;
    List values;
    VORNWinsEnumOU(&names.list, &values.list);
    ASSERT_NE(names.list, nullptr);
    ASSERT_NE(values.list, nullptr);
    EXPECT_EQ(names.list->count, 0);
    EXPECT_EQ(values.list->count, 0);
}

TEST_F(InAWorkgroup, NoDomainHasADnsName) {
    for (const std::string& domain : {std::string("CONTRACT"), std::string(), Workgroup(), std::string(5000, 'd')}) {
        GuardedBuffer fqdn(64);
        EXPECT_EQ(FAILING(VORNWinsGetDomainFQDN(domain.c_str(), fqdn.data(), fqdn.size())), -1) << domain;
        EXPECT_TRUE(fqdn.GuardsStand());
    }
}

TEST_F(InAWorkgroup, ARefreshFindsNoDomains) {
    EXPECT_EQ(FAILING(VORNWinUpdateAllDomains()), -1);
    EXPECT_EQ(FAILING(VORNWinUpdateOU()), -1);
    List domains;
    VORNWinsEnumAllDomains(&domains.list);
    EXPECT_EQ(domains.list->count, 0);
}

TEST_F(InAWorkgroup, NobodysUsersAreFetched) {
    for (const int kind : {0, 1}) {
        List domains;
        ASSERT_TRUE(domains.Push("CONTRACT"));
        EXPECT_NE(FAILING(VORNWinGetDomainUGByDomain(kind, domains.list)), 0) << kind;
        EXPECT_EQ(domains.Texts(), std::vector<std::string>{"CONTRACT"});
    }
}

TEST_F(InAWorkgroup, ThereAreNoDomainsAdministratorsToAdd) {
    EXPECT_EQ(FAILING(VORNGroupAddDomainAdminGroup()), -1);
}

TEST_F(InAWorkgroup, HomeFoldersAreIncludedAsTheSettingSays) {
    VornConf conf;
    const bool included = std::strcmp(conf.Info("enableduserhome", ""), "yes") == 0;
    EXPECT_GE(SUCCEEDING(VORNDomainUserHomeInclude(included ? 1 : 0)), 0);
}

TEST_F(InAWorkgroup, AKeyOfTheMainConfigurationIsWrittenAndReadAgain) {
    constexpr const char* kSync = "vorn sync dctime";
    const contract::KeptFile kept(contract::kSmbConf);
    char before[64] = {};
    const bool had = VLIBCFileGetKeyValue(contract::kSmbConf, kSync, before, sizeof before, 0) > 0;
    for (const char* wanted : {"yes", "no"}) {
        ASSERT_GE(SUCCEEDING(VORNWinsSetSectionKey("global", kSync, wanted)), 0);
        char found[64] = {};
        ASSERT_GT(VLIBCFileGetKeyValue(contract::kSmbConf, kSync, found, sizeof found, 0), 0);
        EXPECT_STREQ(found, wanted);
    }
    EXPECT_GE(VORNWinsSetSectionKey("global", kSync, had ? before : "no"), 0);
}

// ---- Joins that fail ----

TEST_F(InAWorkgroup, ARecordWithoutATextIsRefused) {
    for (int missing = 0; missing < 3; ++missing) {
        _tag_VORN_WIN2_ record{};
        record.joinMode = 1;
        record.domainName = missing == 0 ? nullptr : kNoDomain;
        record.userName = missing == 1 ? nullptr : "nobody";
        record.password = missing == 2 ? nullptr : "none";
        EXPECT_NE(FAILING(VORNWinJoin1(&record)), 0) << missing;
    }
}

TEST_F(InAWorkgroup, AJoinOfNoDomainFailsAndSaysWhy) {
    const contract::KeptFile status(contract::kJoinStatus);
    const std::string workgroup = Workgroup();
    _tag_VORN_WIN2_ record{};
    record.joinMode = 1;
    record.domainName = kNoDomain;
    record.userName = "nobody";
    record.password = "none";
    ASSERT_NE(FAILING(VORNWinJoin1(&record)), 0);
    EXPECT_STREQ(record.domainName, kNoDomain);
    EXPECT_EQ(Workgroup(), workgroup);

    GuardedBuffer key(24);
    GuardedBuffer message(512);
    ASSERT_GE(SUCCEEDING(ErrWINIState1Get(key.data(), key.size(), message.data(), message.size())), 0);
    ASSERT_TRUE(key.IsTerminated());
    ASSERT_TRUE(message.IsTerminated());
    EXPECT_TRUE(key.GuardsStand());
    EXPECT_TRUE(message.GuardsStand());
    EXPECT_NE(message.Text(), "");
}

TEST_F(InAWorkgroup, WithoutAStatusThereIsNoReason) {
    const contract::KeptFile status(contract::kJoinStatus);
    VLIBCSysRemove(contract::kJoinStatus);
    char key[24] = {};
    char message[512] = {};
    EXPECT_EQ(FAILING(ErrWINIState1Get(key, sizeof key, message, sizeof message)), -1);
}

}  // namespace
