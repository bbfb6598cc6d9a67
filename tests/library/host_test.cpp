// The built module in a host that supplies everything the appliance would.

#include <gtest/gtest.h>
#include <malloc.h>

#include <cstddef>
#include <fstream>
#include <iterator>
#include <set>
#include <string>
#include <vector>

#include "tests/library/module_library.h"
#include "tests/library/scenario.h"

namespace {

using fake::TheAppliance;

constexpr const char* kModule = VORN_MODULE;

struct Row {
    const char* api;
    int version;
    const char* method;
    const char* symbol;
};

constexpr Row kRows[] = {
    {"VORN.Core.Directory.Domain", 1, "get", "_Z9DomainGetPN4VORN10APIRequestEPNS_11APIResponseE"},
    {"VORN.Core.Directory.Domain", 1, "set", "_Z9DomainSetPN4VORN10APIRequestEPNS_11APIResponseE"},
    {"VORN.Core.Directory.Domain", 1, "test_dc", "_Z12DomainTestDCPN4VORN10APIRequestEPNS_11APIResponseE"},
    {"VORN.Core.Directory.Domain", 1, "get_domain_list",
     "_Z19DomainGetDomainListPN4VORN10APIRequestEPNS_11APIResponseE"},
    {"VORN.Core.Directory.Domain", 2, "get_domain_list",
     "_Z22DomainGetDomainList_V2PN4VORN10APIRequestEPNS_11APIResponseE"},
    {"VORN.Core.Directory.Domain", 1, "update_start", "_Z17DomainUpdateStartPN4VORN10APIRequestEPNS_11APIResponseE"},
    {"VORN.Core.Directory.Domain", 1, "update_status", "_Z18DomainUpdateStatusPN4VORN10APIRequestEPNS_11APIResponseE"},
    {"VORN.Core.Directory.Domain", 1, "update_stop", "_Z16DomainUpdateStopPN4VORN10APIRequestEPNS_11APIResponseE"},
    {"VORN.Core.Directory.Domain.Conf", 1, "set", "_Z15DomainSetOptionPN4VORN10APIRequestEPNS_11APIResponseE"},
    {"VORN.Core.Directory.Domain.Conf", 1, "get", "_Z15DomainGetOptionPN4VORN10APIRequestEPNS_11APIResponseE"},
    {"VORN.Core.Directory.Domain.Schedule", 1, "get", "_Z17DomainScheduleGetPN4VORN10APIRequestEPNS_11APIResponseE"},
    {"VORN.Core.Directory.Domain.Schedule", 1, "set", "_Z17DomainScheduleSetPN4VORN10APIRequestEPNS_11APIResponseE"},
};

constexpr const char* kWorkerBody = "_Z21DomainUpdateStartForkPN4VORN10APIRequestEPNS_11APIResponseEPv";
constexpr const char* kMonitorBody = "_Z21DomainMonitorUpdatingPN4VORN10APIRequestEPNS_11APIResponseEPv";

template <typename Function>
Function As(void* address) {
    return reinterpret_cast<Function>(address);
}

int MappingsOf(const std::string& name) {
    std::ifstream maps("/proc/self/maps");
    int count = 0;
    for (std::string line; std::getline(maps, line);) {
        count += line.find(name) != std::string::npos ? 1 : 0;
    }
    return count;
}

[[maybe_unused]] long ResidentPages() {
    std::ifstream statm("/proc/self/statm");
    long total = 0;
    long resident = 0;
    statm >> total >> resident;
    return resident;
}

class LoadedModule : public testing::Test {
protected:
    LoadedModule() {
        PrepareAppliance();
    }
    ~LoadedModule() override {
        // The state holds addresses of the module, which goes away now.
        TheAppliance().Reset();
    }

    const ModuleLibrary module{kModule};
};

TEST_F(LoadedModule, LoadingCallsNothingOfTheAppliance) {
    module.Table();
    EXPECT_TRUE(TheAppliance().Calls().empty());
}

TEST_F(LoadedModule, TableHasTheTwelveOperationsInTheirOrder) {
    const VORN::APIEntry* row = module.Table();
    for (const Row& expected : kRows) {
        ASSERT_NE(row->api, nullptr);
        EXPECT_STREQ(row->api, expected.api);
        EXPECT_EQ(row->version, expected.version);
        EXPECT_STREQ(row->method, expected.method);
        ++row;
    }
}

TEST_F(LoadedModule, TableEndsWithZeros) {
    const VORN::APIEntry& end = module.Table()[std::size(kRows)];
    EXPECT_EQ(end.api, nullptr);
    EXPECT_EQ(end.version, 0);
    EXPECT_EQ(end.method, nullptr);
    EXPECT_EQ(end.function, nullptr);
}

TEST_F(LoadedModule, TableIsTheExportedOne) {
    EXPECT_EQ(module.Table(), As<const VORN::APIEntry*>(module.Symbol("gTable")));
}

TEST_F(LoadedModule, TableNamesTheExportedEntryFunctions) {
    for (const Row& row : kRows) {
        EXPECT_EQ(module.Function(row.api, row.version, row.method), As<VORN::APIFunction>(module.Symbol(row.symbol)))
            << row.symbol;
    }
}

TEST_F(LoadedModule, EveryStepAnswersAsExpected) {
    for (const Step& step : Scenario()) {
        SCOPED_TRACE(step.title);
        const Outcome outcome = RunStep(module, step);
        ASSERT_EQ(outcome.answers.size(), step.answers.size());
        for (std::size_t i = 0; i < step.answers.size(); ++i) {
            EXPECT_TRUE(outcome.answers[i].success) << outcome.answers[i].code;
            EXPECT_EQ(CompactJson(outcome.answers[i].data), step.answers[i]);
        }
    }
    EXPECT_EQ(TheAppliance().LiveHandles(), 0) << TheAppliance().LiveHandleNames();
    EXPECT_EQ(TheAppliance().Misuses(), std::vector<std::string>());
}

TEST_F(LoadedModule, ScenarioCallsEveryOperationAndBothBodies) {
    std::set<VORN::APIFunction> functions;
    std::set<VORN::APITaskFunction> bodies;
    for (const Step& step : Scenario()) {
        RunStep(module, step);
        if (step.api.empty()) {
            bodies.insert(TheAppliance().state.startedBody);
        } else {
            functions.insert(module.Function(step.api, step.version, step.method));
        }
    }
    EXPECT_EQ(functions.size(), std::size(kRows));
    EXPECT_EQ(bodies, (std::set<VORN::APITaskFunction>{As<VORN::APITaskFunction>(module.Symbol(kWorkerBody)),
                                                       As<VORN::APITaskFunction>(module.Symbol(kMonitorBody))}));
}

TEST_F(LoadedModule, EveryOperationAnswersAnEmptyRequestOnce) {
    for (const Row& row : kRows) {
        PrepareAppliance();
        fake::Exchange exchange;
        As<VORN::APIFunction>(module.Symbol(row.symbol))(&exchange.request, &exchange.response);
        EXPECT_EQ(TheAppliance().Answers().size(), 1U) << row.symbol;
    }
}

TEST_F(LoadedModule, ShellCommandsAndSleepEndAtTheImitatedAppliance) {
    for (const Step& step : Scenario()) {
        RunStep(module, step);
    }
    EXPECT_EQ(TheAppliance().state.commands.size(), 2U);
    EXPECT_GT(TheAppliance().state.sleptSeconds, 0U);
}

TEST_F(LoadedModule, LogLinesEndAtTheImitatedAppliance) {
    fake::Exchange exchange;
    module.Function(kRows[1].api, 1, "set")(&exchange.request, &exchange.response);
    ASSERT_EQ(TheAppliance().Logs().size(), 1U);
    EXPECT_EQ(TheAppliance().Logs()[0].unit, "domain.cpp");
}

TEST_F(LoadedModule, AnExceptionOfTheApplianceReachesTheHost) {
    TheAppliance().FailNth("VORN::APIRequest::HasParam", 1, fake::Fault::Throw());
    fake::Exchange exchange;
    const VORN::APIFunction set = module.Function(kRows[1].api, 1, "set");
    EXPECT_THROW(set(&exchange.request, &exchange.response), fake::InjectedException);
    EXPECT_EQ(TheAppliance().LiveHandles(), 0) << TheAppliance().LiveHandleNames();
}

TEST(ReloadedModule, IsGoneAfterItIsUnloaded) {
    PrepareAppliance();
    {
        const ModuleLibrary module(kModule);
        EXPECT_GT(MappingsOf("vorn_directory_domain.so"), 0);
    }
    EXPECT_EQ(MappingsOf("vorn_directory_domain.so"), 0);
}

void LoadUseAndUnload() {
    PrepareAppliance();
    {
        const ModuleLibrary module(kModule);
        for (const Step& step : Scenario()) {
            RunStep(module, step);
        }
    }
    TheAppliance().Reset();
}

TEST(ReloadedModule, DoesNotGrowInAHundredRounds) {
    constexpr int kRounds = 100;
    constexpr std::size_t kSmallestChunk = 32;  // what one allocation takes at least
    for (int i = 0; i < kRounds; ++i) {
        LoadUseAndUnload();
    }
    const int mappings = MappingsOf("");
    const std::size_t allocated = mallinfo2().uordblks;
    [[maybe_unused]] const long resident = ResidentPages();
    for (int i = 0; i < kRounds; ++i) {
        LoadUseAndUnload();
    }
    EXPECT_EQ(MappingsOf(""), mappings);
    // Less than one allocation for each round: what the allocator keeps for itself varies a little.
    EXPECT_LT(mallinfo2().uordblks, allocated + kRounds * kSmallestChunk);
#ifndef VORN_EMULATED
    // An emulator's own memory would be counted too, and it keeps what it has translated.
    EXPECT_LE(ResidentPages(), resident + 32);
#endif
}

TEST(ReloadedModule, HasOneTableHoweverOftenItIsLoaded) {
    const ModuleLibrary first(kModule);
    const ModuleLibrary second(kModule);
    EXPECT_EQ(first.Table(), second.Table());
}

}  // namespace
