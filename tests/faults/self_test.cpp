#include "tests/faults/self_test.h"

#include <syslog.h>

#include <functional>
#include <sstream>
#include <string>
#include <vector>

#include "platform/core.h"
#include "platform/domain.h"
#include "platform/network.h"
#include "src/api_table.h"
#include "tests/faults/appliances.h"
#include "tests/faults/operations.h"
#include "tests/faults/sweeper.h"

namespace sweep {

namespace {

using Body = std::function<void(VORN::APIRequest*, VORN::APIResponse*)>;

// A wrong operation, and how the report of it must begin, behind the scenario's name.
struct Case {
    const char* name;
    const char* oracle;
    Operation operation;
};

// An operation that answers null and does what `body` does ahead of it.
Operation Small(const std::vector<std::string>& functions, const Body& body) {
    Operation operation;
    operation.name = "Small";
    operation.body = [body](VORN::APIRequest* request, VORN::APIResponse* response) {
        body(request, response);
        response->SetSuccess(Json::Value());
    };
    operation.functions = functions;
    operation.functions.emplace_back("VORN::APIResponse::SetSuccess");
    operation.scenarios = {{"only", Json::Value(Json::objectValue), Workgroup(), Json::Value(), {}}};
    return operation;
}

// One of the module's operations with another rule in front of its own, or with another body.
Operation WithRule(Operation operation, const Rule& rule) {
    operation.rules.insert(operation.rules.begin(), rule);
    return operation;
}

Operation WithBody(Operation operation, const Body& body) {
    operation.body = body;
    return operation;
}

Operation WithScenario(Operation operation, const Scenario& scenario) {
    operation.scenarios = {scenario};
    return operation;
}

Scenario ScenarioNamed(const Operation& operation, const std::string& name) {
    for (const Scenario& scenario : operation.scenarios) {
        if (scenario.name == name) {
            return scenario;
        }
    }
    return {};
}

void Log(int priority, const char* unit) {
    syslog(priority, "%s:%d a line", unit, 1);
}

// ---- Answers, handles, logs ----

void AddCommonCases(std::vector<Case>& cases) {
    cases.push_back({"a second answer", "answer count", Small({}, [](VORN::APIRequest*, VORN::APIResponse* response) {
                         response->SetSuccess(Json::Value());
                     })});
    Operation silent = Small({}, {});
    silent.body = [](VORN::APIRequest*, VORN::APIResponse*) {};
    cases.push_back({"no answer", "answer count", silent});

    Operation wrongData = WithScenario(DomainTestDCOperation(), ScenarioNamed(DomainTestDCOperation(), "works"));
    wrongData.scenarios.front().data["test_join_success"] = false;
    cases.push_back({"wrong data", "answer", wrongData});
    cases.push_back({"a wrong code", "answer",
                     WithRule(DomainTestDCOperation(), {"WINIQuery1", "", "", When::kNegative, Stops(2617)})});
    cases.push_back({"a failure that is ignored", "answer",
                     WithRule(DomainGetOperation(), {"VORNNetDNSListGet", "", "", When::kAny, Ignored()})});
    cases.push_back({"a neighbour taken for a failure", "answer",
                     WithRule(DomainGetOptionOperation(), {"VLIBCFileGetSection", "", "", When::kAny, Stops(2617)})});
    Operation noRule = DomainTestDCOperation();
    noRule.rules.clear();
    cases.push_back({"a missing rule", "answer", noRule});

    cases.push_back({"a list that is not freed", "handles",
                     Small({"VLIBCSzListAlloc", "VLIBCSzListFree"}, [](VORN::APIRequest*, VORN::APIResponse*) {
                         // Kept, so that only the appliance misses it and not the leak checker.
                         static std::vector<VLIBSZLIST*>& kept = *new std::vector<VLIBSZLIST*>;
                         kept.push_back(VLIBCSzListAlloc(1));
                     })});
    cases.push_back(
        {"a null argument", "handles",
         Small({"VLIBServiceReload"}, [](VORN::APIRequest*, VORN::APIResponse*) { VLIBServiceReload(nullptr); })});
    cases.push_back({"another priority", "log",
                     Small({"syslog"}, [](VORN::APIRequest*, VORN::APIResponse*) { Log(LOG_WARNING, "domain.cpp"); })});
    cases.push_back({"another unit", "log",
                     Small({"syslog"}, [](VORN::APIRequest*, VORN::APIResponse*) { Log(LOG_ERR, "join.cpp"); })});
    cases.push_back(
        {"memory of the last run", "fresh run", Small({"VLIBCSupportGet"}, [](VORN::APIRequest*, VORN::APIResponse*) {
             static int runs = 0;
             if (++runs > 1) {
                 VLIBCSupportGet("x");
             }
         })});
    cases.push_back({"an unlisted function", "edges",
                     Small({}, [](VORN::APIRequest*, VORN::APIResponse*) { VLIBCSupportGet("x"); })});
    cases.push_back({"a function that nothing reaches", "edges",
                     Small({"VLIBCSupportGet"}, [](VORN::APIRequest*, VORN::APIResponse*) {})});
}

void AddPasswordCases(std::vector<Case>& cases) {
    const std::vector<std::pair<const char*, Body>> leaks = {
        {"the password in the log",
         [](VORN::APIRequest*, VORN::APIResponse*) { syslog(LOG_ERR, "%s:%d %s", "domain.cpp", 1, kPassword); }},
        {"the password in an answer",
         [](VORN::APIRequest*, VORN::APIResponse* response) { response->SetError(1, Json::Value(kPassword)); }},
        {"the password in a file",
         [](VORN::APIRequest*, VORN::APIResponse*) { VORNWinsSetSectionKey("global", "x", kPassword); }},
    };
    for (const auto& leak : leaks) {
        cases.push_back({leak.first, "password", Small({}, leak.second)});
    }
}

// ---- What the operations have of their own ----

void AddOwnCases(std::vector<Case>& cases) {
    // A join that fails at once and puts nothing back.
    const Operation set = DomainSetOperation();
    const Operation failing = WithScenario(set, ScenarioNamed(set, "fails-by-password"));
    cases.push_back(
        {"a trust setting that stays changed", "put back", WithBody(failing, [](VORN::APIRequest*, VORN::APIResponse*) {
             VORNWinIsEnableTrustDomain();
             VORNWinSetTrustDomain(1);
         })});
    cases.push_back(
        {"servers that stay changed", "put back", WithBody(failing, [](VORN::APIRequest*, VORN::APIResponse*) {
             VLIBSZLIST* none = VLIBCSzListAlloc(1);
             VLIBCSzListFree(none);
             VLIBSZLIST* servers = VLIBCSzListAlloc(1);
             if (servers != nullptr) {
                 VLIBCSzListPush(&servers, "10.0.0.7");
                 VLIBCSzListPush(&servers, "10.0.0.8");
                 VORNNetDNSListSet(servers);
                 VLIBCSzListFree(servers);
             }
         })});
    cases.push_back({"a join status that stays", "join status",
                     WithBody(failing, [](VORN::APIRequest*, VORN::APIResponse*) { VORNWinIsEnableTrustDomain(); })});
    cases.push_back(
        {"settings changed without the lock", "files",
         WithBody(WithScenario(set, ScenarioNamed(set, "leave")),
                  [](VORN::APIRequest*, VORN::APIResponse*) { VLIBCFileRemoveKey(kSettings, "domain_dns"); })});
    cases.push_back({"a marker that stays", "marker",
                     WithBody(DomainMonitorUpdatingOperation(), [](VORN::APIRequest*, VORN::APIResponse*) {})});
    cases.push_back({"a marker that is never made", "marker",
                     WithBody(DomainUpdateStartOperation(),
                              [](VORN::APIRequest*, VORN::APIResponse*) { VLIBCFileTouch("/tmp/elsewhere"); })});
    cases.push_back({"a fetch that is left out", "fetches",
                     WithBody(DomainUpdateStartForkOperation(),
                              [](VORN::APIRequest*, VORN::APIResponse*) { VLIBCReadPidFile(kUserPid); })});
    cases.push_back({"a step after a join that failed", "steps",
                     WithBody(failing, [](VORN::APIRequest*, VORN::APIResponse*) { VLIBServiceReload("samba"); })});
    cases.push_back({"services reloaded for nothing", "reloads",
                     WithBody(DomainSetOptionOperation(), [](VORN::APIRequest*, VORN::APIResponse* response) {
                         VLIBServiceReload("samba");
                         response->SetSuccess(Json::Value());
                     })});
}

}  // namespace

bool SelfTest(std::ostream& out) {
    std::vector<Case> cases;
    AddCommonCases(cases);
    AddPasswordCases(cases);
    AddOwnCases(cases);
    std::size_t found = 0;
    for (const Case& one : cases) {
        std::ostringstream report;
        Sweeper(one.operation, "sweep", report).Sweep("", Part(), false);
        if (report.str().find(std::string(": ") + one.oracle + ": ") != std::string::npos) {
            ++found;
        } else {
            out << one.name << ": not found by \"" << one.oracle << "\"\n" << report.str();
        }
    }
    out << "sweep self-test: " << found << " of " << cases.size() << " found\n";
    return found == cases.size();
}

}  // namespace sweep
