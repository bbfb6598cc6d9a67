// What "set" does after a join or after leaving.

#include <algorithm>
#include <set>

#include "tests/faults/appliances.h"
#include "tests/faults/run.h"
#include "tests/faults/set_operation.h"

namespace sweep {

namespace {

constexpr int kEventJoined = 0x11800404;
constexpr int kEventLeft = 0x11800506;
const char* const kWebFolders = "webdav-httpd-pure";

std::string EventText(int event, const std::string& name) {
    return "VORNLogSet1(2, 1, " + std::to_string(event) + ", " + Quoted(name) + ", \"\", \"\", \"\")";
}

// The calls that only stand behind a join or behind leaving.
std::vector<std::string> Steps(const Run& run) {
    static const std::set<std::string> functions = {
        "VORNGroupAddDomainAdminGroup", "VLIBServiceReload",    "VORNLogSet1",
        "VORNDomainUserHomeInclude",    "VLIBServiceIsEnabled", "VLIBServiceRestart"};
    std::vector<std::string> steps;
    for (const fake::Call& call : run.Calls()) {
        if (functions.count(call.function) != 0) {
            steps.push_back(call.Text());
        }
    }
    return steps;
}

bool WebFoldersAreEnabled(const Run& run) {
    const std::optional<std::size_t> asked = run.FirstOf("VLIBServiceIsEnabled");
    const fake::Fault* fault = asked ? run.FaultAt(*asked) : nullptr;
    return fault != nullptr ? fault->result == 1 : run.Before().enabledServices.count(kWebFolders) != 0;
}

std::vector<std::string> StepsAfterJoin(const Run& run) {
    const auto setting = run.Before().settings.find("enableduserhome");
    const bool userHomes = setting != run.Before().settings.end() && setting->second == "yes";
    std::vector<std::string> steps = {
        "VORNGroupAddDomainAdminGroup()",
        "VLIBServiceReload(\"samba\")",
        "VLIBServiceReload(\"nmbd\")",
        "VLIBServiceReload(\"winbindd\")",
        EventText(kEventJoined, run.scenario.parameters["domain_name"].asString()),
        std::string("VORNDomainUserHomeInclude(") + (userHomes ? "1)" : "0)"),
        "VLIBServiceIsEnabled(" + Quoted(kWebFolders) + ")",
    };
    if (WebFoldersAreEnabled(run)) {
        steps.push_back("VLIBServiceRestart(" + Quoted(kWebFolders) + ")");
    }
    return steps;
}

// A step that fails leaves a line, and nothing else does.
void CheckLine(const Run& run, const std::string& function, bool negative, const std::string& line,
               Findings& findings) {
    const std::optional<std::size_t> step = run.FirstOf(function);
    const fake::Fault* fault = step ? run.FaultAt(*step) : nullptr;
    const bool failed = fault != nullptr && (negative ? fault->result < 0 : fault->result == -1);
    const std::vector<fake::LogLine>& logs = fake::TheAppliance().Logs();
    const auto lines =
        std::count_if(logs.begin(), logs.end(), [&](const fake::LogLine& one) { return one.message == line; });
    if (lines != (failed ? 1 : 0)) {
        findings.Add("steps", std::to_string(lines) + " times logged: " + line);
    }
}

std::string Listed(const std::vector<std::string>& steps) {
    std::string text;
    for (const std::string& step : steps) {
        text += step + " ";
    }
    return text;
}

}  // namespace

void CheckStepsAfterwards(const Run& run, Findings& findings) {
    const std::vector<std::string> steps = Steps(run);
    std::vector<std::string> expected;
    if (JoinFacts(run).joined) {
        expected = StepsAfterJoin(run);
    } else if (run.Called("VORNWinJoin1", "joinMode 0") && !run.Answers().empty() && run.Answers().back().success) {
        expected.push_back(EventText(kEventLeft, "WORKGROUP"));
    }
    // An exception cuts the steps short; when it is the last answer's, the event of leaving has been written.
    const bool whole = steps == expected;
    const bool begun = steps.size() <= expected.size() && std::equal(steps.begin(), steps.end(), expected.begin());
    const bool left = steps.size() == 1 && steps.front() == EventText(kEventLeft, "WORKGROUP");
    if (!(run.thrown ? begun || left : whole)) {
        findings.Add("steps", "expected " + Listed(expected) + "got " + Listed(steps));
    }
    CheckLine(run, "VORNDomainUserHomeInclude", false, "VORNDomainUserHomeInclude failed.", findings);
    CheckLine(run, "VLIBServiceRestart", true, "restart webdav failed.", findings);
}

}  // namespace sweep
