// What a join changes ahead of itself, the trusted-domain setting and the DNS servers: put back to the byte, or named.

#include "appliance/domain/join/provisional.h"

#include <sys/stat.h>
#include <unistd.h>

#include <chrono>
#include <filesystem>

#include "appliance/base/paths.h"
#include "appliance/domain/join/recovery.h"
#include "tests/appliance/base/traced_child.h"
#include "tests/appliance/join/join_test.h"

namespace {

using appliance::ChangeTrustSetting;
using testing::ElementsAre;
using testing::HasSubstr;
using testing::IsEmpty;

constexpr char kCopy[] = "/usr/vorn/etc/private/trustdomain.kept";
constexpr char kResolvCopy[] = "/usr/vorn/etc/private/resolv.conf.kept";
constexpr char kMissing[] = "<missing>";
constexpr char kNoFolderAnyMore[] = "Not a directory";

class ProvisionalTest : public join_test::JoinTest {
protected:
    // What the next start of the server names.
    static std::vector<std::string> Named() {
        return appliance::RecoverInterruptedJoin().notes;
    }
    void PutSettings(const std::string& content) {
        if (content == kMissing) {
            unlink(At(appliance::kSettings).c_str());
        } else {
            Put(appliance::kSettings, content);
        }
    }
    std::string Settings() const {
        return Content(appliance::kSettings);
    }
};

TEST_F(ProvisionalTest, ChangesAheadOfAJoinAreNamedOnce) {
    ASSERT_FALSE(ChangeTrustSetting(false));
    const std::string before = "nameserver 192.0.2.7\n";
    Put(kResolvCopy, "kept " + std::to_string(before.size()) + "\n" + before + Content(appliance::kResolvConf));
    EXPECT_THAT(Named(), ElementsAre("the DNS servers are still 192.0.2.1,192.0.2.2; before the join: 192.0.2.7",
                                     "the trusted-domain setting is still changed; before the join: trustdomain=yes"));
    EXPECT_THAT(Named(), IsEmpty());
}

TEST_F(ProvisionalTest, ChangesThatWerePutBackOrKeptAreNotNamed) {
    ASSERT_FALSE(ChangeTrustSetting(false));
    ASSERT_FALSE(ChangeTrustSetting(true));
    EXPECT_FALSE(Exists(kCopy));
    EXPECT_THAT(Named(), IsEmpty());
    ASSERT_FALSE(ChangeTrustSetting(false));
    appliance::KeepProvisionalChanges();
    EXPECT_THAT(Named(), IsEmpty());
    // A copy that is no longer the file's: somebody else has changed the servers since.
    Put(kResolvCopy, "kept 0\nnameserver 192.0.2.9\n");
    EXPECT_THAT(Named(), IsEmpty());
}

// Written before the change, which a killed server never made.
TEST_F(ProvisionalTest, ACopyWithoutAChangeIsNotNamed) {
    const std::string before = "trustdomain=yes\n";
    PutSettings(before);
    Put(kCopy, "kept " + std::to_string(before.size()) + "\n" + before + "trustdomain=no\n");
    Put(kResolvCopy, "kept 0\n" + Content(appliance::kResolvConf) + "options timeout:1\n");
    EXPECT_THAT(Named(), IsEmpty());
    EXPECT_FALSE(Exists(kCopy));
}

// The recovery of the join before may still be at work; not even in the same second does it take the copies of this one.
TEST_F(ProvisionalTest, WhatABegunJoinHasChangedIsNotLeftOver) {
    const appliance::Moment began = std::chrono::system_clock::now();
    usleep(20000);  // two ticks, with which the kernel may stamp a file
    const std::string before = Settings();
    ASSERT_FALSE(ChangeTrustSetting(false));
    EXPECT_THAT(appliance::TakeProvisionalChanges(began), IsEmpty());
    EXPECT_TRUE(Exists(kCopy));
    ASSERT_FALSE(ChangeTrustSetting(true));
    EXPECT_EQ(Settings(), before);
    ASSERT_FALSE(ChangeTrustSetting(false));
    EXPECT_THAT(appliance::TakeProvisionalChanges(std::chrono::system_clock::now()), ElementsAre(HasSubstr("trust")));
    EXPECT_FALSE(Exists(kCopy));
}

class SettingsBefore : public ProvisionalTest, public testing::WithParamInterface<const char*> {};

TEST_P(SettingsBefore, ComeBackToTheByte) {
    const std::string before = GetParam();
    PutSettings(before);
    const bool enabled = appliance::TrustedDomainsEnabled();
    ASSERT_FALSE(ChangeTrustSetting(!enabled));
    EXPECT_NE(Settings(), before);
    EXPECT_EQ(appliance::TrustedDomainsEnabled(), !enabled);
    ASSERT_FALSE(ChangeTrustSetting(enabled));
    EXPECT_EQ(Settings(), before);
    // What is so already stays as it is.
    ASSERT_FALSE(ChangeTrustSetting(enabled));
    EXPECT_EQ(Settings(), before);
    EXPECT_FALSE(Exists(kCopy));
}

INSTANTIATE_TEST_SUITE_P(Of, SettingsBefore,
                         testing::Values(kMissing, "", "enableduserhome=no\n", "trustdomain=yes  \n",
                                         "trustdomain=no\ntrustdomain=yes\nx=1\n", "TrustDomain = YES\r\n",
                                         "# trustdomain=no\ntrustdomain=no", "trustdomain=no\n"));

TEST_F(ProvisionalTest, WhatSomebodyElseHasWrittenMeanwhileStays) {
    PutSettings("a=1\n");
    ASSERT_FALSE(ChangeTrustSetting(false));
    Put(appliance::kSettings, Settings() + "b=2\n");
    ASSERT_FALSE(ChangeTrustSetting(true));
    EXPECT_EQ(Settings(), "a=1\nb=2\n");
    PutSettings("trustdomain=Yes\n");
    ASSERT_FALSE(ChangeTrustSetting(false));
    Put(appliance::kSettings, Settings() + "b=2\n");
    ASSERT_FALSE(ChangeTrustSetting(true));
    EXPECT_EQ(Settings(), "trustdomain=Yes\nb=2\n");
    EXPECT_FALSE(Exists(kCopy));
}

// Killed anywhere, on the way there and on the way back: changed and named, or neither.
TEST_F(ProvisionalTest, AKilledChangeIsNamedExactlyWhenItWasMade) {
    const std::string before = "x=1\ntrustdomain=yes\n";
    for (const bool back : {false, true}) {
        int changed = 0;
        int kept = 0;
        bool killed = true;
        for (int calls = 0; killed; ++calls) {
            ASSERT_LT(calls, 2000) << "the change does not end";
            unlink(At(kCopy).c_str());
            PutSettings(before);
            ASSERT_FALSE(back && ChangeTrustSetting(false));
            killed = appliance_test::KilledAtCall(calls, [back] { return !ChangeTrustSetting(back); });
            const bool isChanged = !appliance::TrustedDomainsEnabled();
            (isChanged ? changed : kept) += 1;
            EXPECT_EQ(Settings() != before, isChanged) << calls;
            const std::vector<std::string> named = Named();
            EXPECT_EQ(!named.empty(), isChanged) << calls;
            EXPECT_FALSE(Exists(kCopy));
        }
        EXPECT_GT(changed, 2);
        EXPECT_GT(kept, 2);
    }
}

// The copy can't be written: nothing is changed. The settings can't be written: nothing is named.
TEST_F(ProvisionalTest, AFailedChangeChangesNothing) {
    const std::string before = Settings();
    std::filesystem::remove_all(At(appliance::kPrivate));
    Put(appliance::kPrivate, "no folder");
    const std::error_code error = ChangeTrustSetting(false);
    EXPECT_EQ(error.message(), kNoFolderAnyMore);
    EXPECT_EQ(Settings(), before);
}

}  // namespace
