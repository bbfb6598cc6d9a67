#include "tests/faults/oracles.h"

#include <json/writer.h>
#include <syslog.h>

#include <algorithm>

#include "tests/faults/expectation.h"

#if defined(__SANITIZE_ADDRESS__)
#define VORN_LEAK_CHECKER 1
#elif defined(__has_feature)
#if __has_feature(address_sanitizer)
#define VORN_LEAK_CHECKER 1
#endif
#endif
#ifdef VORN_LEAK_CHECKER
#include <sanitizer/lsan_interface.h>
#endif

namespace sweep {

namespace {

bool Same(const fake::Answer& left, const fake::Answer& right) {
    return left.success == right.success && left.code == right.code && left.data == right.data;
}

bool Same(const std::vector<fake::Answer>& left, const std::vector<fake::Answer>& right) {
    return std::equal(left.begin(), left.end(), right.begin(), right.end(),
                      [](const fake::Answer& one, const fake::Answer& other) { return Same(one, other); });
}

bool ShowsPassword(const std::string& text) {
    return text.find(kPassword) != std::string::npos;
}

bool ShowsPassword(const Json::Value& value) {
    if (value.isString()) {
        return ShowsPassword(value.asString());
    }
    return std::any_of(value.begin(), value.end(), [](const Json::Value& member) { return ShowsPassword(member); });
}

// The copies are given back with their content.
bool MayShowPassword(const fake::Call& call) {
    return call.function == "VORNWinJoin1" || call.function == "strdup" || call.function == "free";
}

}  // namespace

void CheckAnswerCount(const Run& run, Findings& findings) {
    const std::vector<fake::Answer>& answers = run.Answers();
    std::size_t least = run.thrown ? 0 : 1;
    std::size_t most = least;
    if (run.operation.answering == Answering::kProgress) {
        least = run.thrown ? 0 : 2;
        most = run.thrown ? 1 : 2;
    } else if (run.operation.answering == Answering::kHandsOn && !answers.empty() && answers.front().code == 117) {
        ++most;
    }
    if (answers.size() < least || answers.size() > most) {
        findings.Add("answer count", std::to_string(answers.size()) + " answers: " + AnswersText(run.thrown, answers));
    }
}

void CheckAnswers(const Run& run, Findings& findings) {
    const Expectation expected = Expect(run);
    if (!expected.missingRule.empty()) {
        findings.Add("answer", "no rule for " + expected.missingRule);
    } else if (run.thrown != expected.thrown || !Same(run.Answers(), expected.answers)) {
        findings.Add("answer", "expected " + AnswersText(expected.thrown, expected.answers) + ", got " +
                                   AnswersText(run.thrown, run.Answers()) + " " + run.exception);
    }
}

void CheckHandles(const Run& /*run*/, Findings& findings) {
    const fake::Appliance& appliance = fake::TheAppliance();
    if (appliance.LiveHandles() != 0) {
        findings.Add("handles", "not freed: " + appliance.LiveHandleNames());
    }
    for (const std::string& misuse : appliance.Misuses()) {
        findings.Add("handles", "misuse: " + misuse);
    }
}

void CheckPassword(const Run& run, Findings& findings) {
    for (const fake::Call& call : run.Calls()) {
        if (!MayShowPassword(call) &&
            std::any_of(call.arguments.begin(), call.arguments.end(),
                        [](const std::string& argument) { return ShowsPassword(argument); })) {
            findings.Add("password", "in " + call.Text());
        }
    }
    for (const fake::LogLine& line : fake::TheAppliance().Logs()) {
        if (ShowsPassword(line.format) || ShowsPassword(line.message)) {
            findings.Add("password", "in the log: " + line.message);
        }
    }
    for (const fake::Answer& answer : run.Answers()) {
        if (ShowsPassword(answer.data)) {
            findings.Add("password", "in an answer");
        }
    }
    for (const auto& file : run.After().keyValueFiles) {
        for (const auto& section : file.second) {
            for (const auto& entry : section.second) {
                if (ShowsPassword(entry.first) || ShowsPassword(entry.second)) {
                    findings.Add("password", "in " + file.first);
                }
            }
        }
    }
}

void CheckLogs(const Run& /*run*/, Findings& findings) {
    for (const fake::LogLine& line : fake::TheAppliance().Logs()) {
        if (line.priority != LOG_ERR) {
            findings.Add("log", "priority " + std::to_string(line.priority) + ": " + line.message);
        }
        if (line.unit != "domain.cpp" && line.unit != "domain_schedule.cpp") {
            findings.Add("log", "unit \"" + line.unit + "\": " + line.message);
        }
    }
}

void CheckRun(const Run& run, Findings& findings) {
    for (const Oracle oracle : {CheckAnswerCount, CheckAnswers, CheckHandles, CheckPassword, CheckLogs}) {
        oracle(run, findings);
    }
    for (const Oracle oracle : run.operation.oracles) {
        oracle(run, findings);
    }
}

Ending::Ending(const Run& run) : thrown(run.thrown), answers(run.Answers()) {
    for (const fake::Call& call : run.Calls()) {
        calls.push_back(call.function);
    }
}

void CheckFreshRun(const Operation& operation, const Scenario& scenario, const Ending& expected, Findings& findings) {
    const Plan noFaults;
    const Run run(operation, scenario, noFaults);
    const bool sameCalls =
        std::equal(expected.calls.begin(), expected.calls.end(), run.Calls().begin(), run.Calls().end(),
                   [](const std::string& function, const fake::Call& call) { return function == call.function; });
    if (run.thrown != expected.thrown || !Same(run.Answers(), expected.answers) || !sameCalls) {
        findings.Add("fresh run", "afterwards without faults: expected " +
                                      AnswersText(expected.thrown, expected.answers) + ", got " +
                                      AnswersText(run.thrown, run.Answers()) + (sameCalls ? "" : ", by other calls"));
    }
}

void CheckLeaks(Findings& findings) {
#ifdef VORN_LEAK_CHECKER
    if (__lsan_do_recoverable_leak_check() != 0) {
        findings.Add("leak", "the leak checker found memory that nothing points at");
    }
#else
    static_cast<void>(findings);
#endif
}

void Findings::Add(const std::string& oracle, const std::string& text) {
    texts.push_back(oracle + ": " + text);
}

bool Findings::Has(const std::string& oracle) const {
    return std::any_of(texts.begin(), texts.end(),
                       [&](const std::string& text) { return text.compare(0, oracle.size() + 1, oracle + ":") == 0; });
}

}  // namespace sweep
