// The fetch of one kind of entry, users or groups, by itself.

#include "src/domain/internal.h"
#include "tests/unit/update_fixture.h"

namespace {

using ::testing::ElementsAre;
using ::testing::IsEmpty;
using unit::kUserPid;
using unit::Logs;

constexpr const char* kFetchFailed = "%s:%d query domain user/group fail using specify domain=%s";

class FetchOfOneKind : public unit::FetchTest {};

TEST_F(FetchOfOneKind, RefusesAKindThatIsNeitherUsersNorGroups) {
    for (const int kind : {-1, 2}) {
        for (const char* domain : {static_cast<const char*>(nullptr), "LAB"}) {
            Restart();
            EXPECT_EQ(QueryDomainUserGroup(kind, domain), -1) << kind;
            EXPECT_THAT(appliance.Logs(), ElementsAre(Logs("domain.cpp", "%s:%d Parameter error", "Parameter error")));
            EXPECT_THAT(appliance.CallTexts(fake::kLogs),
                        ElementsAre("VLIBCSzListAlloc(1024)", "VLIBCSzListFree(list)"));
        }
    }
}

TEST_F(FetchOfOneKind, IsSilentWithoutMemoryWhateverTheKind) {
    appliance.FailNth("VLIBCSzListAlloc", 1, fake::Fault::Null(), true);
    for (const int kind : {-1, 0, 1, 2}) {
        EXPECT_EQ(QueryDomainUserGroup(kind, "LAB"), -1) << kind;
    }
    EXPECT_THAT(appliance.Logs(), IsEmpty());
    EXPECT_EQ(appliance.CountOf("VLIBCSzListFree"), 0);
}

TEST_F(FetchOfOneKind, AnswersZeroWhenDoneAndMinusOneOnFailure) {
    EXPECT_EQ(QueryDomainUserGroup(0, nullptr), 0);
    EXPECT_EQ(QueryDomainUserGroup(1, "LAB"), 0);
    state.pidFiles[kUserPid] = 1;
    EXPECT_EQ(QueryDomainUserGroup(0, "LAB"), 0);
    state.trustSetting = 0;
    EXPECT_EQ(QueryDomainUserGroup(1, "OTHER"), -1);
    appliance.FailNth("VORNWinsEnumAllDomains", 2, fake::Fault::Result(-1));
    EXPECT_EQ(QueryDomainUserGroup(1, nullptr), -1);
    appliance.FailNth("VORNWinGetDomainUGByDomain", 3, fake::Fault::Result(1));
    EXPECT_EQ(QueryDomainUserGroup(1, nullptr), -1);
}

TEST_F(FetchOfOneKind, AnEmptyNameIsADomainHere) {
    EXPECT_EQ(QueryDomainUserGroup(0, ""), 0);
    EXPECT_THAT(state.fetchedDomains, ElementsAre(fake::FetchedDomains{0, {""}}));
    EXPECT_THAT(state.commands, IsEmpty());
}

TEST_F(FetchOfOneKind, TheNameInTheLogIsNoFormat) {
    appliance.FailNth("VORNWinGetDomainUGByDomain", 1, fake::Fault::Result(-1));
    EXPECT_EQ(QueryDomainUserGroup(0, "%n%s"), -1);
    EXPECT_THAT(appliance.Logs(), ElementsAre(Logs("domain.cpp", kFetchFailed,
                                                   "query domain user/group fail using specify domain=%n%s")));
}

}  // namespace
