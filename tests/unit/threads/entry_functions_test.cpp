// Requests served at the same time: several threads, each with an appliance of its own, call every entry function and
// both task bodies. Each answer must be the one of a single thread.

#include <gtest/gtest.h>

#include <condition_variable>
#include <mutex>
#include <string>
#include <thread>
#include <vector>

#include "src/api_table.h"
#include "tests/unit/module_test.h"

namespace {

constexpr int kThreads = 4;
constexpr int kRounds = 25;

// A request of an entry function, or of the body of a task.
struct Request {
    const char* name;
    VORN::APIFunction function;
    VORN::APITaskFunction body;
    const char* parameters;
};

std::vector<Request> Requests() {
    return {
        {"get", DomainGet, nullptr, "{}"},
        {"set: join", DomainSet, nullptr,
         R"({"enable_domain": true, "domain_name": "other.test", "username": "joiner", "password": "Canary-1",
             "dns": "192.0.2.3", "manage_mode": 0,
             "advance_domain_conf": {"enable_advance_option": true, "kdc": "192.0.2.9", "register_nics": ["eth0"]}})"},
        {"set: leave", DomainSet, nullptr, R"({"enable_domain": false})"},
        {"set: wrong", DomainSet, nullptr, R"({"enable_domain": 1})"},
        {"test_dc", DomainTestDC, nullptr, "{}"},
        {"get_domain_list 1", DomainGetDomainList, nullptr, "{}"},
        {"get_domain_list 2", DomainGetDomainList_V2, nullptr, "{}"},
        {"update_start", DomainUpdateStart, nullptr, R"({"domain_name": "LAB"})"},
        {"update_status", DomainUpdateStatus, nullptr, R"({"task_id": "none"})"},
        {"update_stop", DomainUpdateStop, nullptr, "{}"},
        {"options set", DomainSetOption, nullptr,
         R"({"enable_sync_time": true, "enable_server_signing": true, "domain_nested_group": 7,
             "disable_domain_admins": true})"},
        {"options get", DomainGetOption, nullptr, "{}"},
        {"schedule get", DomainScheduleGet, nullptr, "{}"},
        {"schedule set", DomainScheduleSet, nullptr, R"({"date_type": 0, "week_name": "0,6", "hour": 3, "min": 30})"},
        {"worker: all", nullptr, DomainUpdateStartFork, "{}"},
        {"worker: one", nullptr, DomainUpdateStartFork, R"({"domain_name": "OTHER"})"},
        {"monitor", nullptr, DomainMonitorUpdating, "{}"},
    };
}

// The calling thread's appliance, a member of "LAB" with something to find for each request. The threads differ in
// `number`, so that an answer meant for another thread is told from the own one.
fake::Appliance& Prepare(int number) {
    fake::Appliance& appliance = fake::TheAppliance();
    appliance.Reset();
    fake::State& state = appliance.state;
    const std::string suffix = std::to_string(number);
    state.domainName = "LAB" + suffix;
    state.workgroup = "GROUP" + suffix;
    state.ownDomain = state.domainName;
    state.firstFlag = 1;
    state.secondFlag = 1;
    state.joinedFlag = 1;
    state.adsJoined = number;
    state.testJoinResult = number % 2 == 0 ? 0 : -1;
    state.trustSetting = number % 2;
    state.domains = {"LAB" + suffix, "OTHER" + suffix};
    state.fqdns["LAB" + suffix] = "lab" + suffix + ".test";
    state.unitNames = {"Sales" + suffix};
    state.unitValues = {"ou=Sales" + suffix};
    state.dnsServers = {"192.0.2." + suffix};
    state.pollingError = 1000 + number;
    state.keyValueFiles[unit::kSmbConfPath]["global"] = {{"security", "ads"}, {"workgroup", "LAB"}};
    state.keyValueFiles[unit::kSmbInfoPath]["global"] = {{"winbind expand groups", suffix}};
    return appliance;
}

// All that a request did: its calls, its log lines and its answers are among them. Then what is wrong with it.
std::vector<std::string> Trace(const Request& request, int number) {
    fake::Appliance& appliance = Prepare(number);
    {
        fake::Exchange exchange(unit::FromJson(request.parameters));
        if (request.function != nullptr) {
            request.function(&exchange.request, &exchange.response);
        } else {
            request.body(&exchange.request, &exchange.response, nullptr);
        }
    }
    std::vector<std::string> trace = appliance.CallTexts();
    trace.push_back("not freed: " + appliance.LiveHandleNames());
    for (const std::string& misuse : appliance.Misuses()) {
        trace.push_back("misuse: " + misuse);
    }
    return trace;
}

std::vector<std::vector<std::string>> Traces(int number, int first) {
    const std::vector<Request> requests = Requests();
    std::vector<std::vector<std::string>> traces(requests.size());
    for (std::size_t step = 0; step < requests.size(); ++step) {
        const std::size_t index = (step + static_cast<std::size_t>(first)) % requests.size();
        traces[index] = Trace(requests[index], number);
    }
    return traces;
}

// Lets all threads go on together once the last has arrived.
class Gate {
public:
    void Pass() {
        std::unique_lock<std::mutex> lock(mutex);
        if (++arrived == kThreads) {
            everyone.notify_all();
        } else {
            everyone.wait(lock, [this] { return arrived == kThreads; });
        }
    }

private:
    std::mutex mutex;
    std::condition_variable everyone;
    int arrived = 0;
};

TEST(SimultaneousRequests, AreAnsweredLikeSingleOnes) {
    std::vector<std::vector<std::vector<std::string>>> alone;
    for (int number = 0; number < kThreads; ++number) {
        alone.push_back(Traces(number, 0));
    }

    std::vector<std::vector<std::vector<std::vector<std::string>>>> together(kThreads);
    Gate gate;
    std::vector<std::thread> threads;
    for (int number = 0; number < kThreads; ++number) {
        threads.emplace_back([number, &gate, &own = together[static_cast<std::size_t>(number)]] {
            gate.Pass();
            for (int round = 0; round < kRounds; ++round) {
                // At any time the threads are at different requests, and at the same one in other rounds.
                own.push_back(Traces(number, round % 5 * number));
            }
        });
    }
    for (std::thread& thread : threads) {
        thread.join();
    }

    const std::vector<Request> requests = Requests();
    for (std::size_t number = 0; number < together.size(); ++number) {
        ASSERT_EQ(together[number].size(), static_cast<std::size_t>(kRounds));
        for (const auto& traces : together[number]) {
            for (std::size_t index = 0; index < requests.size(); ++index) {
                EXPECT_EQ(traces[index], alone[number][index]) << requests[index].name << " in thread " << number;
            }
        }
    }
}

TEST(SimultaneousRequests, LeaveNothingUnfreedAndMisuseNothing) {
    for (const std::vector<std::string>& trace : Traces(1, 0)) {
        ASSERT_FALSE(trace.empty());
        EXPECT_EQ(trace.back(), "not freed: ");
    }
}

}  // namespace
