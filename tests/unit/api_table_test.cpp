// The API table, and what the entry functions have in common.

#include "src/api_table.h"

#include <cstdint>
#include <string>
#include <tuple>
#include <vector>

#include "tests/unit/module_test.h"

namespace {

using ::testing::ElementsAre;
using ::testing::IsEmpty;
using unit::FailsWith;
using unit::FromJson;
using unit::Logs;
using unit::Succeeds;

constexpr const char* kDomain = "VORN.Core.Directory.Domain";
constexpr const char* kConf = "VORN.Core.Directory.Domain.Conf";
constexpr const char* kSchedule = "VORN.Core.Directory.Domain.Schedule";

using Row = std::tuple<std::string, std::int32_t, std::string, VORN::APIFunction>;

TEST(ApiTable, HoldsTheTwelveMethodsInTheirOrder) {
    std::vector<Row> rows;
    for (const VORN::APIEntry* entry = GetAPITable(); entry->api != nullptr; ++entry) {
        rows.emplace_back(entry->api, entry->version, entry->method, entry->function);
    }
    EXPECT_THAT(
        rows,
        ElementsAre(Row(kDomain, 1, "get", DomainGet), Row(kDomain, 1, "set", DomainSet),
                    Row(kDomain, 1, "test_dc", DomainTestDC), Row(kDomain, 1, "get_domain_list", DomainGetDomainList),
                    Row(kDomain, 2, "get_domain_list", DomainGetDomainList_V2),
                    Row(kDomain, 1, "update_start", DomainUpdateStart),
                    Row(kDomain, 1, "update_status", DomainUpdateStatus),
                    Row(kDomain, 1, "update_stop", DomainUpdateStop), Row(kConf, 1, "set", DomainSetOption),
                    Row(kConf, 1, "get", DomainGetOption), Row(kSchedule, 1, "get", DomainScheduleGet),
                    Row(kSchedule, 1, "set", DomainScheduleSet)));
}

TEST(ApiTable, EndsWithARowOfZerosAfterTheTwelfth) {
    const VORN::APIEntry& end = GetAPITable()[12];
    EXPECT_EQ(end.api, nullptr);
    EXPECT_EQ(end.version, 0);
    EXPECT_EQ(end.method, nullptr);
    EXPECT_EQ(end.function, nullptr);
}

TEST(ApiTable, IsTheSameObjectEachTime) {
    EXPECT_EQ(GetAPITable(), gTable);
    EXPECT_EQ(GetAPITable(), gTable);
}

// A request that a method can answer at once, told by its name in the table.
struct Method {
    const char* api;
    int version;
    const char* method;
    const char* parameters;
};

class EntryFunctions : public unit::ModuleTest {
protected:
    EntryFunctions() {
        Prepare();
    }

    void Restart() {
        ModuleTest::Restart();
        Prepare();
    }

    void Prepare() {
        BeMember();
        state.domains = {"LAB"};
        state.fqdns["LAB"] = "lab.test";
        state.trustSetting = 1;
        state.dnsServers = {"10.0.0.1"};
    }

    fake::Answer Ask(const Method& asked) {
        for (const VORN::APIEntry* entry = GetAPITable(); entry->api != nullptr; ++entry) {
            if (std::string(entry->api) == asked.api && entry->version == asked.version &&
                std::string(entry->method) == asked.method) {
                return Call(entry->function, FromJson(asked.parameters));
            }
        }
        ADD_FAILURE() << asked.api << " has no method " << asked.method;
        return {};
    }
};

TEST_F(EntryFunctions, GetReadsTheMembership) {
    const fake::Answer answer = Ask({kDomain, 1, "get", "{}"});
    EXPECT_TRUE(answer.success);
    EXPECT_EQ(answer.data["domain_name"], "LAB");
}

TEST_F(EntryFunctions, SetChecksARequestedMembership) {
    EXPECT_THAT(Ask({kDomain, 1, "set", "{}"}), FailsWith(2618));
    EXPECT_THAT(appliance.Logs(), ElementsAre(Logs("domain.cpp", "%s:%d cannot get the paramter: %s",
                                                   "cannot get the paramter: enable_domain")));
}

TEST_F(EntryFunctions, TestDcTestsTheMembership) {
    EXPECT_THAT(Ask({kDomain, 1, "test_dc", "{}"}), Succeeds(R"({"test_join_success": true})"));
}

TEST_F(EntryFunctions, TheTwoVersionsOfTheDomainListDiffer) {
    EXPECT_THAT(Ask({kDomain, 1, "get_domain_list", "{}"}), Succeeds(R"({"domain_list": ["LAB"]})"));
    EXPECT_THAT(Ask({kDomain, 2, "get_domain_list", "{}"}),
                Succeeds(R"({"domain_list": [["LAB", "LAB", "lab.test"]]})"));
}

TEST_F(EntryFunctions, UpdateStartStartsATask) {
    EXPECT_THAT(Ask({kDomain, 1, "update_start", "{}"}), Succeeds(R"({"task_id": "DomainUpdate1"})"));
}

TEST_F(EntryFunctions, UpdateStatusReadsATask) {
    EXPECT_THAT(Ask({kDomain, 1, "update_status", R"({"task_id": "none"})"}), FailsWith(117, "1001"));
}

TEST_F(EntryFunctions, UpdateStopStopsTheTasks) {
    Ask({kDomain, 1, "update_start", "{}"});
    EXPECT_THAT(Ask({kDomain, 1, "update_stop", "{}"}), Succeeds("null"));
    EXPECT_EQ(state.stoppedTasks.size(), 1U);
}

TEST_F(EntryFunctions, ConfSetChecksTheOptions) {
    EXPECT_THAT(Ask({kConf, 1, "set", R"({"enable_sync_time": 1})"}), FailsWith(2618));
    EXPECT_THAT(appliance.Logs(), ElementsAre(Logs("domain.cpp", "%s:%d wrong the paramter: %s",
                                                   "wrong the paramter: enable_sync_time")));
}

TEST_F(EntryFunctions, ConfGetReadsTheOptions) {
    const fake::Answer answer = Ask({kConf, 1, "get", "{}"});
    EXPECT_TRUE(answer.success);
    EXPECT_EQ(answer.data["domain_nested_group"], 1);
}

TEST_F(EntryFunctions, ScheduleGetReadsTheSchedule) {
    EXPECT_THAT(Ask({kSchedule, 1, "get", "{}"}), Succeeds(R"({"date_type": 2})"));
}

TEST_F(EntryFunctions, ScheduleSetChecksTheSchedule) {
    EXPECT_THAT(Ask({kSchedule, 1, "set", "{}"}), FailsWith(2618));
    EXPECT_THAT(appliance.Logs(), ElementsAre(Logs("domain_schedule.cpp", "%s:%d cannot get the paramter: %s",
                                                   "cannot get the paramter: date_type")));
}

// A request that gets far: it reads, allocates and answers.
std::vector<Method> FarReachingRequests() {
    return {
        {kDomain, 1, "get", "{}"},
        {kDomain, 1, "set", R"({"enable_domain": true, "domain_name": "lab.test", "username": "joiner",
                               "password": "Canary-1", "dns": "10.0.0.2", "manage_mode": 1})"},
        {kDomain, 1, "test_dc", "{}"},
        {kDomain, 1, "get_domain_list", "{}"},
        {kDomain, 2, "get_domain_list", "{}"},
        {kDomain, 1, "update_start", "{}"},
        {kDomain, 1, "update_status", R"({"task_id": "none"})"},
        {kDomain, 1, "update_stop", "{}"},
        {kConf, 1, "set", R"({"enable_sync_time": true, "disable_domain_admins": true})"},
        {kConf, 1, "get", "{}"},
        {kSchedule, 1, "get", "{}"},
        {kSchedule, 1, "set", R"({"date_type": 0, "week_name": "0,6", "hour": 3, "min": 30})"},
    };
}

// Requests that fail, and so record a code in their handler.
std::vector<Method> FailingRequests() {
    return {
        {kDomain, 1, "set", "{}"},
        {kDomain, 1, "update_start", R"({"domain_name": 5})"},
        {kDomain, 1, "update_status", "{}"},
        {kConf, 1, "set", R"({"domain_nested_group": "1"})"},
        {kSchedule, 1, "set", R"({"date_type": 9, "hour": 3, "min": 30})"},
    };
}

std::string Text(const Method& method) {
    return std::string(method.api) + "/" + method.method + " version " + std::to_string(method.version) + " " +
           method.parameters;
}

// The exception leaves the entry function as it was thrown, and nothing of the operation is left.
TEST_F(EntryFunctions, AnExceptionReachesTheCallerAndTheHandlerIsGone) {
    for (const Method& method : FarReachingRequests()) {
        Restart();
        Ask(method);
        const std::vector<fake::Call> calls = appliance.Calls();
        for (std::size_t index = 0; index < calls.size(); ++index) {
            const std::string& thrower = calls[index].function;
            const fake::FunctionFailures* failures = fake::FindFailures(thrower);
            if (failures == nullptr || failures->values.empty() ||
                failures->values.back().fault.kind != fake::Fault::Kind::kThrow) {
                continue;
            }
            Restart();
            appliance.FailCallAt(index, fake::Fault::Throw());
            std::string caught;
            try {
                Ask(method);
            } catch (const fake::InjectedException& exception) {
                caught = exception.what();
            }
            EXPECT_EQ(caught, fake::InjectedException(thrower).what()) << Text(method);
            EXPECT_EQ(appliance.LiveHandles(), 0) << Text(method) << ": " << appliance.LiveHandleNames();
            EXPECT_THAT(appliance.Answers(), IsEmpty()) << Text(method);
        }
    }
}

// Every request, after every other one and on the same appliance, is answered as if it were the first.
TEST_F(EntryFunctions, ARequestLeavesNothingBehindThatChangesALaterOne) {
    std::vector<Method> methods = FarReachingRequests();
    for (const Method& method : FailingRequests()) {
        methods.push_back(method);
    }
    for (const Method& later : methods) {
        Restart();
        const fake::Answer alone = Ask(later);
        const std::vector<std::string> callsAlone = appliance.CallTexts();
        for (const Method& earlier : methods) {
            Restart();
            Ask(earlier);
            Restart();
            const fake::Answer answer = Ask(later);
            const std::string place = Text(later) + " after " + Text(earlier);
            EXPECT_EQ(answer.success, alone.success) << place;
            EXPECT_EQ(answer.code, alone.code) << place;
            EXPECT_EQ(answer.data, alone.data) << place;
            EXPECT_EQ(appliance.CallTexts(), callsAlone) << place;
        }
    }
}

}  // namespace
