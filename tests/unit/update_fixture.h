// What the tests of the background refresh share: tasks in the framework, pid files, and task bodies run by hand.

#ifndef VORN_TESTS_UNIT_UPDATE_FIXTURE_H
#define VORN_TESTS_UNIT_UPDATE_FIXTURE_H

#include <string>
#include <vector>

#include "src/api_table.h"
#include "src/domain.h"
#include "tests/unit/module_test.h"

namespace fake {

inline bool operator==(const FetchedDomains& left, const FetchedDomains& right) {
    return left.kind == right.kind && left.domains == right.domains;
}

}  // namespace fake

namespace unit {

constexpr const char* kMarker = "/tmp/domain_updating";
constexpr const char* kUserPid = "/tmp/domain_user.pid";
constexpr const char* kGroupPid = "/tmp/domain_group.pid";

class UpdateTest : public ModuleTest {
protected:
    // A task of this module that the framework knows; `record` is JSON text.
    void AddTask(const std::string& id, const std::string& record) {
        state.tasks.push_back({id, "admin", "DomainUpdate", FromJson(record), false});
    }

    // Calls an entry function that may answer more than once.
    std::vector<fake::Answer> CallFreely(VORN::APIFunction function, const std::string& parameters) {
        const auto before = static_cast<std::ptrdiff_t>(appliance.Answers().size());
        fake::Exchange exchange(FromJson(parameters));
        function(&exchange.request, &exchange.response);
        return {appliance.Answers().begin() + before, appliance.Answers().end()};
    }

    // Runs the body of a task, as the framework would after the start request made the marker.
    std::vector<fake::Answer> RunTask(VORN::APITaskFunction body, const std::string& parameters = "{}") {
        const auto before = static_cast<std::ptrdiff_t>(appliance.Answers().size());
        state.files.insert(kMarker);
        fake::Exchange exchange(FromJson(parameters));
        body(&exchange.request, &exchange.response, nullptr);
        return {appliance.Answers().begin() + before, appliance.Answers().end()};
    }

    bool HasMarker() const {
        return state.files.count(kMarker) != 0;
    }
};

// A member of "LAB" with another domain in sight, and trusted domains enabled.
class FetchTest : public UpdateTest {
protected:
    FetchTest() {
        Prepare();
    }

    void Restart() {
        ModuleTest::Restart();
        Prepare();
    }

private:
    void Prepare() {
        BeMember();
        state.trustSetting = 1;
        state.domains = {"LAB", "OTHER"};
    }
};

}  // namespace unit

#endif
