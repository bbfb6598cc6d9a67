// Recording and faults.

#include "tests/double/recorder.h"

#include <gmock/gmock.h>
#include <syslog.h>
#include <unistd.h>

#include <cstdlib>
#include <cstring>
#include <set>
#include <stdexcept>
#include <string>
#include <thread>

#include "platform/core.h"
#include "platform/domain.h"
#include "platform/settings.h"
#include "tests/double/appliance.h"

namespace {

using fake::Fault;
using fake::TheAppliance;
using testing::ElementsAre;

class RecorderTest : public testing::Test {
protected:
    RecorderTest() {
        TheAppliance().Reset();
    }
    ~RecorderTest() override {
        TheAppliance().Reset();
    }
};

TEST_F(RecorderTest, KeepsCallsInTheirOrder) {
    char value[128] = {};
    fake::Exchange exchange;
    VLIBCFileGetKeyValue("/usr/vorn/etc/smb.conf", "security", value, sizeof value, 0);
    syslog(LOG_ERR, "%s:%d no \"%s\"", "status.cpp", 12, "key");
    exchange.response.SetSuccess(Json::Value(true));
    EXPECT_EQ(system("/usr/bin/never 'run'"), 0);
    EXPECT_THAT(TheAppliance().CallTexts(),
                ElementsAre("VLIBCFileGetKeyValue(\"/usr/vorn/etc/smb.conf\", \"security\", size 128, 0)",
                            "syslog(3, \"status.cpp:12 no \\\"key\\\"\")", "VORN::APIResponse::SetSuccess(true)",
                            "system(\"/usr/bin/never 'run'\")"));
    EXPECT_THAT(TheAppliance().CallTexts(fake::kBookkeeping | fake::kLogs),
                ElementsAre("VLIBCFileGetKeyValue(\"/usr/vorn/etc/smb.conf\", \"security\", size 128, 0)",
                            "system(\"/usr/bin/never 'run'\")"));
    EXPECT_EQ(TheAppliance().CallTexts([](const fake::Call& call) { return call.function == "system"; }).size(), 1U);
}

TEST_F(RecorderTest, LeavesBookkeepingOut) {
    {
        fake::Exchange exchange;
        VornConf conf;
        exchange.request.HasParam("a");
        exchange.request.GetParam("a", Json::Value());
        conf.Def("supportdomain", "no");
        VLIBCSzListFree(VLIBCSzListAlloc(1));
        VLIBCErrGet();
    }
    EXPECT_EQ(TheAppliance().Calls().size(), 8U);
    EXPECT_THAT(TheAppliance().CallTexts(fake::kBookkeeping), ElementsAre("VornConf::Def(\"supportdomain\", \"no\")"));
}

TEST_F(RecorderTest, TakesLogLinesApart) {
    syslog(LOG_ERR, "%s:%d failed: %s", "join.cpp", 40, "why");
    syslog(LOG_INFO, "plain");
    const auto& logs = TheAppliance().Logs();
    ASSERT_EQ(logs.size(), 2U);
    EXPECT_EQ(logs[0].priority, LOG_ERR);
    EXPECT_EQ(logs[0].format, "%s:%d failed: %s");
    EXPECT_EQ(logs[0].unit, "join.cpp");
    EXPECT_EQ(logs[0].line, 40);
    EXPECT_EQ(logs[0].message, "failed: why");
    EXPECT_EQ(logs[1].unit, "");
    EXPECT_EQ(logs[1].message, "plain");
}

TEST_F(RecorderTest, FailsTheChosenCall) {
    TheAppliance().FailNth("VLIBCFileTouch", 2, Fault::Result(-1));
    EXPECT_EQ(VLIBCFileTouch("/a"), 0);
    EXPECT_EQ(VLIBCFileTouch("/b"), -1);
    EXPECT_EQ(VLIBCFileTouch("/c"), 0);
    EXPECT_EQ(TheAppliance().state.files, (std::set<std::string>{"/a", "/c"}));
    EXPECT_FALSE(TheAppliance().Calls()[0].failed);
    EXPECT_TRUE(TheAppliance().Calls()[1].failed);
    EXPECT_EQ(VLIBCErrGet(), fake::ErrorCodeOf("VLIBCFileTouch"));
    EXPECT_EQ(VLIBCErrorGetLine(), 2);
}

TEST_F(RecorderTest, FailsByPlaceAndStaysWithTheFunction) {
    TheAppliance().FailCallAt(1, Fault::Result(-1), true);
    EXPECT_EQ(VLIBCFileTouch("/a"), 0);
    EXPECT_EQ(VLIBCFileTouch("/b"), -1);
    EXPECT_EQ(VLIBServiceReload("s"), 0);
    EXPECT_EQ(VLIBCFileTouch("/c"), -1);
}

TEST_F(RecorderTest, FailsByPlaceOnce) {
    TheAppliance().FailCallAt(0, Fault::Result(-1));
    EXPECT_EQ(VLIBCFileTouch("/a"), -1);
    EXPECT_EQ(VLIBCFileTouch("/b"), 0);
}

TEST_F(RecorderTest, FailsInPairs) {
    TheAppliance().FailNth("VLIBCFileTouch", 1, Fault::Result(-1));
    TheAppliance().FailNth("VLIBCSysRemove", 1, Fault::Result(-1));
    TheAppliance().FailCallAt(2, Fault::Result(1));
    EXPECT_EQ(VLIBCFileTouch("/a"), -1);
    EXPECT_EQ(VLIBCSysRemove("/a"), -1);
    EXPECT_EQ(VLIBCSysRename("/a", "/b"), 1);
    EXPECT_EQ(VLIBCFileTouch("/a"), 0);
}

TEST_F(RecorderTest, FailsAllFromAPlaceOn) {
    TheAppliance().FailFrom(1);
    EXPECT_EQ(VLIBCFileTouch("/a"), 0);
    EXPECT_EQ(VLIBCFileTouch("/b"), -1);
    EXPECT_EQ(VLIBCSupportGet("supporttrustdomain"), 0);
    EXPECT_EQ(VORNWinsIsJoined(), 0);
    EXPECT_FALSE(TheAppliance().Calls().back().failed);
    EXPECT_EQ(strdup("x"), nullptr);
}

TEST_F(RecorderTest, ReplacesOnlyTheAnswerByANeighbour) {
    VLIBSZHASH* hash = VLIBCSzHashAlloc(1);
    TheAppliance().FailNth("VLIBCFileAddSection", 1, Fault::Result(-1));
    TheAppliance().FailNth("VORNWinIsEnableTrustDomain", 1, Fault::Result(2));
    EXPECT_EQ(VLIBCFileAddSection("/f", "s", hash, "%s=%s\n"), -1);
    EXPECT_EQ(TheAppliance().state.keyValueFiles.count("/f"), 1U);
    EXPECT_EQ(VORNWinIsEnableTrustDomain(), 2);
    EXPECT_EQ(VLIBCErrGet(), 0x1234);
    VLIBCSzHashFree(hash);
}

TEST_F(RecorderTest, RefusesFaultsThatCannotShow) {
    EXPECT_THROW(TheAppliance().FailNth("VLIBCFileTuch", 1, Fault::Result(-1)), std::invalid_argument);
    EXPECT_THROW(TheAppliance().FailNth("VLIBCFileTouch", 1, Fault::Throw()), std::invalid_argument);
    EXPECT_THROW(TheAppliance().FailNth("VLIBCFileTouch", 0, Fault::Result(-1)), std::invalid_argument);
    TheAppliance().FailCallAt(0, Fault::Throw());
    EXPECT_EQ(VLIBCFileTouch("/a"), 0);
}

TEST_F(RecorderTest, KeepsThreadsApart) {
    VLIBCFileTouch("/here");
    std::size_t calls = 1;
    std::thread([&] {
        calls = TheAppliance().Calls().size();
        VLIBCFileTouch("/there");
    }).join();
    EXPECT_EQ(calls, 0U);
    EXPECT_THAT(TheAppliance().CallTexts(), ElementsAre("VLIBCFileTouch(\"/here\")"));
}

}  // namespace
