// The DNS servers of the appliance: reader and writer.

#include <string>
#include <vector>

#include "src/domain.h"
#include "src/domain/internal.h"
#include "tests/unit/module_test.h"

namespace {

using ::testing::ElementsAre;
using ::testing::IsEmpty;
using ::testing::Optional;
using unit::Logs;

using Texts = std::vector<std::string>;

class DnsList : public unit::ModuleTest {
protected:
    DnsList() : handler(&exchange.request, &exchange.response) {}

    fake::Exchange exchange;
    DomainServiceHandler handler;
};

TEST_F(DnsList, IsReadInThePlatformsOrder) {
    state.dnsServers = {"192.0.2.2", "192.0.2.1", "2001:db8::1"};
    Texts servers;
    EXPECT_TRUE(GetDNSList(servers));
    EXPECT_THAT(servers, ElementsAre("192.0.2.2", "192.0.2.1", "2001:db8::1"));
    EXPECT_THAT(appliance.CallTexts(),
                ElementsAre("VLIBCSzListAlloc(1024)", "VORNNetDNSListGet(list)", "VLIBCSzListGet(list, 0)",
                            "VLIBCSzListGet(list, 1)", "VLIBCSzListGet(list, 2)", "VLIBCSzListFree(list)"));
}

TEST_F(DnsList, ReplacesWhatTheCallerHad) {
    state.dnsServers = {"192.0.2.1"};
    Texts servers = {"old", "older"};
    EXPECT_TRUE(GetDNSList(servers));
    EXPECT_THAT(servers, ElementsAre("192.0.2.1"));
}

TEST_F(DnsList, IsEmptyWhenThereAreNoServers) {
    Texts servers = {"old"};
    EXPECT_TRUE(GetDNSList(servers));
    EXPECT_THAT(servers, IsEmpty());
    EXPECT_EQ(appliance.CountOf("VLIBCSzListGet"), 0);
}

TEST_F(DnsList, PassesOverNullEntriesAndKeepsEmptyOnes) {
    state.dnsServers = {std::nullopt, "192.0.2.1", std::nullopt, "", "192.0.2.2", std::nullopt};
    Texts servers;
    EXPECT_TRUE(GetDNSList(servers));
    EXPECT_THAT(servers, ElementsAre("192.0.2.1", "", "192.0.2.2"));
}

TEST_F(DnsList, IsReadAlsoFromAListThatStaysWhereItIs) {
    state.listGrowthReplacesList = false;
    state.dnsServers = {"192.0.2.1"};
    Texts servers;
    EXPECT_TRUE(GetDNSList(servers));
    EXPECT_THAT(servers, ElementsAre("192.0.2.1"));
}

TEST_F(DnsList, CountsAPositiveResultOfTheReaderAsDone) {
    state.dnsServers = {"192.0.2.1"};
    appliance.FailNth("VORNNetDNSListGet", 1, fake::Fault::Result(1));
    Texts servers;
    EXPECT_TRUE(GetDNSList(servers));
    EXPECT_THAT(servers, ElementsAre("192.0.2.1"));
    EXPECT_THAT(appliance.Logs(), IsEmpty());
}

TEST_F(DnsList, StaysAsItWasWhenTheReadFails) {
    state.dnsServers = {"192.0.2.1"};
    appliance.FailNth("VORNNetDNSListGet", 1, fake::Fault::Result(-1));
    Texts servers = {"old"};
    EXPECT_FALSE(GetDNSList(servers));
    EXPECT_THAT(servers, ElementsAre("old"));
    EXPECT_THAT(appliance.Logs(), ElementsAre(Logs("domain.cpp", "%s:%d Cannot get dns list", "Cannot get dns list")));
    EXPECT_THAT(appliance.CallTexts(fake::kLogs),
                ElementsAre("VLIBCSzListAlloc(1024)", "VORNNetDNSListGet(list)", "VLIBCSzListFree(list)"));
}

TEST_F(DnsList, StaysAsItWasWhenTheReaderHasNoMemory) {
    state.dnsServers = {"192.0.2.1"};
    appliance.FailNth("VLIBCSzListAlloc", 1, fake::Fault::Null());
    Texts servers = {"old"};
    EXPECT_FALSE(GetDNSList(servers));
    EXPECT_THAT(servers, ElementsAre("old"));
    EXPECT_THAT(appliance.Logs(), ElementsAre(Logs("domain.cpp", "%s:%d Cannot alloc memory", "Cannot alloc memory")));
    EXPECT_THAT(appliance.CallTexts(fake::kLogs), ElementsAre("VLIBCSzListAlloc(1024)"));
}

TEST_F(DnsList, IsWrittenInOrder) {
    EXPECT_TRUE(handler.SetDNSList({"192.0.2.3", "192.0.2.1", "192.0.2.2"}));
    EXPECT_THAT(state.dnsServers, ElementsAre(Optional(std::string("192.0.2.3")), Optional(std::string("192.0.2.1")),
                                              Optional(std::string("192.0.2.2"))));
    EXPECT_EQ(handler.error, 2600);
    EXPECT_THAT(appliance.Logs(), IsEmpty());
    EXPECT_THAT(appliance.CallTexts(),
                ElementsAre("VLIBCSzListAlloc(1024)", R"(VLIBCSzListPush(list, "192.0.2.3"))",
                            R"(VLIBCSzListPush(list, "192.0.2.1"))", R"(VLIBCSzListPush(list, "192.0.2.2"))",
                            R"(VORNNetDNSListSet(["192.0.2.3", "192.0.2.1", "192.0.2.2"]))", "VLIBCSzListFree(list)"));
}

TEST_F(DnsList, ReadsBackWhatWasWritten) {
    const Texts written = {"192.0.2.3", "192.0.2.1", "192.0.2.2"};
    ASSERT_TRUE(handler.SetDNSList(written));
    Texts servers;
    EXPECT_TRUE(GetDNSList(servers));
    EXPECT_EQ(servers, written);
}

TEST_F(DnsList, IsWrittenEmptyWhenEmpty) {
    state.dnsServers = {"192.0.2.1"};
    EXPECT_TRUE(handler.SetDNSList({}));
    EXPECT_THAT(state.dnsServers, IsEmpty());
    EXPECT_THAT(appliance.CallTexts(),
                ElementsAre("VLIBCSzListAlloc(1024)", "VORNNetDNSListSet([])", "VLIBCSzListFree(list)"));
}

TEST_F(DnsList, CountsPositiveResultsOfTheWriterAsDone) {
    appliance.FailNth("VLIBCSzListPush", 1, fake::Fault::Result(1));
    appliance.FailNth("VORNNetDNSListSet", 1, fake::Fault::Result(1));
    EXPECT_TRUE(handler.SetDNSList({"192.0.2.3"}));
    EXPECT_THAT(state.dnsServers, ElementsAre(Optional(std::string("192.0.2.3"))));
    EXPECT_EQ(handler.error, 2600);
    EXPECT_THAT(appliance.Logs(), IsEmpty());
}

TEST_F(DnsList, IsNotWrittenWithoutMemory) {
    state.dnsServers = {"192.0.2.1"};
    appliance.FailNth("VLIBCSzListAlloc", 1, fake::Fault::Null());
    EXPECT_FALSE(handler.SetDNSList({"192.0.2.3"}));
    EXPECT_THAT(state.dnsServers, ElementsAre(Optional(std::string("192.0.2.1"))));
    EXPECT_EQ(handler.error, 2617);
    EXPECT_THAT(appliance.Logs(), ElementsAre(Logs("domain.cpp", "%s:%d Cannot alloc memory", "Cannot alloc memory")));
    EXPECT_THAT(appliance.CallTexts(fake::kLogs), ElementsAre("VLIBCSzListAlloc(1024)"));
}

TEST_F(DnsList, IsNotWrittenWhenAnEntryCannotBeAdded) {
    for (const int nth : {1, 2, 3}) {
        SCOPED_TRACE(nth);
        Restart();
        state.dnsServers = {"192.0.2.1"};
        handler.error = 2600;
        appliance.FailNth("VLIBCSzListPush", nth, fake::Fault::Result(-1));
        EXPECT_FALSE(handler.SetDNSList({"192.0.2.3", "192.0.2.4", "192.0.2.5"}));
        EXPECT_THAT(state.dnsServers, ElementsAre(Optional(std::string("192.0.2.1"))));
        EXPECT_EQ(handler.error, 2617);
        EXPECT_THAT(appliance.Logs(),
                    ElementsAre(Logs("domain.cpp", "%s:%d Cannot push the list", "Cannot push the list")));
        EXPECT_EQ(appliance.CountOf("VLIBCSzListPush"), nth);
        EXPECT_EQ(appliance.CountOf("VORNNetDNSListSet"), 0);
        EXPECT_EQ(appliance.CountOf("VLIBCSzListFree"), 1);
    }
}

TEST_F(DnsList, IsFreedWhenThePlatformRefusesIt) {
    state.dnsServers = {"192.0.2.1"};
    appliance.FailNth("VORNNetDNSListSet", 1, fake::Fault::Result(-1));
    EXPECT_FALSE(handler.SetDNSList({"192.0.2.3"}));
    EXPECT_THAT(state.dnsServers, ElementsAre(Optional(std::string("192.0.2.1"))));
    EXPECT_EQ(handler.error, 2617);
    EXPECT_THAT(appliance.Logs(), ElementsAre(Logs("domain.cpp", "%s:%d Cannot set the list", "Cannot set the list")));
    EXPECT_EQ(appliance.CountOf("VLIBCSzListFree"), 1);
}

TEST_F(DnsList, LeavesACodeThatWasRecordedBefore) {
    handler.SetError(2618);
    appliance.FailNth("VORNNetDNSListSet", 1, fake::Fault::Result(-1));
    EXPECT_FALSE(handler.SetDNSList({"192.0.2.3"}));
    EXPECT_EQ(handler.error, 2618);
}

}  // namespace
