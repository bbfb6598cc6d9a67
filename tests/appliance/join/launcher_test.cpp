// The join tool as the server starts it: what goes in, what comes back, and what becomes of a tool that dies.

#include "appliance/domain/join/launcher.h"

#include "appliance/base/paths.h"
#include "appliance/domain/join/join_request.h"
#include "appliance/domain/join/join_status.h"
#include "tests/appliance/join/join_test.h"

namespace {

using appliance::JobResult;
using appliance::JoinRequest;
using testing::HasSubstr;
using testing::IsEmpty;
using testing::Not;

constexpr char kCanary[] = "canary-5519";

class LauncherTest : public join_test::JoinTest {
protected:
    static JobResult Run() {
        JoinRequest request;
        request.domain = "lab.test";
        request.credentials = {"admin", appliance::Secret(kCanary)};
        return appliance::RunJoinTool(request);
    }
};

TEST_F(LauncherTest, HandsOverTheRequestAndBringsBackTheResult) {
    Tool(appliance::kVornjoin,
         "cat > $R/request; ps -o sid= -p $$ > $R/session; echo $$ >> $R/session; "
         "echo '{\"success\":false,\"key\":\"join\",\"message\":\"Invalid KDC ip.\"}'; exit 1");
    const JobResult result = Run();
    EXPECT_FALSE(result.success);
    EXPECT_EQ(result.status.message, "Invalid KDC ip.");
    JoinRequest request;
    std::string error;
    ASSERT_TRUE(appliance::ParseJoinRequest(Content("/request"), request, error));
    EXPECT_EQ(request.credentials.password.view(), kCanary);
    EXPECT_THAT(Content("/calls"), Not(HasSubstr(kCanary)));
}

TEST_F(LauncherTest, AToolThatCannotBeStartedIsASystemError) {
    EXPECT_EQ(Run().status.message, "Error System.");
    appliance::JoinStatus status;
    ASSERT_FALSE(appliance::ReadJoinStatus(status));
    EXPECT_EQ(status.message, "Error System.");
}

TEST_F(LauncherTest, AToolThatDiesIsASystemErrorUnlessItsWorkWasDone) {
    Tool(appliance::kVornjoin, "case \"$*\" in --recover) exit 0;; esac; kill -9 $$");
    EXPECT_EQ(Run().status.message, "Error System.");
    EXPECT_THAT(Calls("recover"), testing::ElementsAre("vornjoin --recover"));
    Tool(appliance::kVornjoin, "case \"$*\" in --recover) exit 3;; esac; kill -9 $$");
    EXPECT_TRUE(Run().success);
    unlink(At("/calls").c_str());
    Tool(appliance::kVornjoin, "case \"$*\" in --recover) exit 1;; --recover-old-later) exit 0;; esac; kill -9 $$");
    EXPECT_EQ(Run().status.message, "Error System.");
    EXPECT_THAT(Calls("later"), testing::ElementsAre("vornjoin --recover-old-later"));
}

// A failed join that could not find out which secret works has left its journal: somebody goes on.
TEST_F(LauncherTest, WhatAFailedJoinLeftOpenIsSettledInTheBackground) {
    Tool(appliance::kVornjoin,
         "case \"$*\" in --recover-old-later) exit 0;; esac; "
         "echo '{\"success\":false,\"key\":\"join\",\"message\":\"Error System.\"}'; exit 1");
    EXPECT_FALSE(Run().success);
    EXPECT_THAT(Calls("later"), IsEmpty());
    appliance::MakeJournalFolder();
    appliance::WriteJournal({});
    EXPECT_FALSE(Run().success);
    EXPECT_THAT(Calls("later"), testing::ElementsAre("vornjoin --recover-old-later"));
}

TEST_F(LauncherTest, AnAnswerThatIsNoneIsASystemError) {
    Tool(appliance::kVornjoin, "case \"$*\" in --recover) exit 0;; esac; echo hello");
    EXPECT_EQ(Run().status.message, "Error System.");
}

}  // namespace
