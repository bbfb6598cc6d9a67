// What the tests of "set" share: requests, and an appliance on which a join fails.

#ifndef VORN_TESTS_UNIT_SET_TEST_H
#define VORN_TESTS_UNIT_SET_TEST_H

#include <algorithm>
#include <string>
#include <vector>

#include "src/api_table.h"
#include "tests/unit/module_test.h"

namespace unit {

constexpr const char* kJoinStatusPath = "/var/log/winlock.state";
constexpr const char* kSettingsPath = "/etc/vorninfo.conf";

// The parameters with the members of another object (as JSON text) added or replaced.
inline Json::Value With(Json::Value parameters, const std::string& json) {
    const Json::Value added = FromJson(json);
    for (const std::string& key : added.getMemberNames()) {
        parameters[key] = added[key];
    }
    return parameters;
}

inline Json::Value With(const std::string& json) {
    return With(JoinRequest(), json);
}

inline Json::Value Without(Json::Value parameters, const std::string& key) {
    parameters.removeMember(key);
    return parameters;
}

inline Json::Value LeaveRequest() {
    return FromJson(R"({"enable_domain": false})");
}

class SetTest : public ModuleTest {
protected:
    SetTest() {
        state.dnsServers = {"192.0.2.1", "192.0.2.2"};
    }

    void Restart() {
        ModuleTest::Restart();
        state.dnsServers = {"192.0.2.1", "192.0.2.2"};
    }

    // The platform refuses to join and leaves this status.
    void MakeJoinFail(const std::string& message = "Error System.", const std::string& key = "stat") {
        state.joinResult = -1;
        state.joinStatus = fake::JoinStatus{key, message};
    }

    // Calls "set" with an exception on its way out; nothing is answered then.
    template <typename Exception>
    void ExpectThrow(const Json::Value& parameters) {
        fake::Exchange exchange(parameters);
        EXPECT_THROW(DomainSet(&exchange.request, &exchange.response), Exception);
        EXPECT_THAT(appliance.Answers(), ::testing::IsEmpty());
    }

    // The calls of these functions, in their order.
    std::vector<std::string> CallsOf(const std::vector<std::string>& functions) const {
        return appliance.CallTexts([&functions](const fake::Call& call) {
            return std::find(functions.begin(), functions.end(), call.function) != functions.end();
        });
    }

    // The texts of all log lines, without what leads them.
    std::vector<std::string> Messages() const {
        std::vector<std::string> messages;
        for (const fake::LogLine& line : appliance.Logs()) {
            messages.push_back(line.message);
        }
        return messages;
    }
};

}  // namespace unit

#endif
