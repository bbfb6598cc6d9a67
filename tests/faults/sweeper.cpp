#include "tests/faults/sweeper.h"

#include <algorithm>
#include <chrono>
#include <iomanip>
#include <sstream>

#include "tests/faults/expectation.h"

namespace sweep {

namespace {

constexpr std::size_t kMostReports = 20;

const std::vector<fake::FailureValue>& ValuesOf(const std::string& function) {
    static const std::vector<fake::FailureValue> none;
    const fake::FunctionFailures* row = fake::FindFailures(function);
    return row == nullptr ? none : row->values;
}

}  // namespace

void Totals::Add(const Totals& other) {
    scenarios += other.scenarios;
    calls += other.calls;
    runs += other.runs;
    edgesReached += other.edgesReached;
    edges += other.edges;
    failures += other.failures;
    seconds += other.seconds;
}

std::string Totals::Text() const {
    std::ostringstream text;
    text << "scenarios " << scenarios << ", calls " << calls << ", runs " << runs << ", edges " << edgesReached
         << " of " << edges << ", " << std::fixed << std::setprecision(1) << seconds << " s";
    if (failures != 0) {
        text << ", FAILURES " << failures;
    }
    return text.str();
}

Sweeper::Sweeper(const Operation& itsOperation, std::string itsProgram, std::ostream& itsOut)
    : operation(itsOperation),
      program(std::move(itsProgram)),
      out(itsOut),
      known(operation.functions.begin(), operation.functions.end()) {}

Totals Sweeper::Sweep(const std::string& scenario, const Part& part, bool pairs) {
    const auto begin = std::chrono::steady_clock::now();
    for (std::size_t i = 0; i < operation.scenarios.size(); ++i) {
        const Scenario& one = operation.scenarios[i];
        if (scenario.empty() ? i % part.of == part.number - 1 : one.name == scenario) {
            SweepScenario(one, pairs);
        }
    }
    if (scenario.empty() && part.of == 1) {
        CheckEdges();
    }
    totals.seconds = std::chrono::duration<double>(std::chrono::steady_clock::now() - begin).count();
    return totals;
}

bool Sweeper::Show(const Scenario& scenario, const Plan& plan) {
    const std::size_t before = totals.failures;
    {
        const Run run(operation, scenario, plan);
        out << operation.name << " " << scenario.name << plan.Options() << "\n" << run.Trace();
        for (const fake::LogLine& line : fake::TheAppliance().Logs()) {
            out << "    log: " << line.message << "\n";
        }
        const Expectation expected = Expect(run);
        out << "expected " << AnswersText(expected.thrown, expected.answers) << "\n"
            << "got      " << AnswersText(run.thrown, run.Answers()) << " " << run.exception << "\n";
    }
    const Plan noFaults;
    const Ending natural(Run(operation, scenario, noFaults));
    Check(scenario, natural, plan);
    return totals.failures == before;
}

void Sweeper::SweepScenario(const Scenario& scenario, bool pairs) {
    const Plan noFaults;
    const Ending natural(Run(operation, scenario, noFaults));
    ++totals.scenarios;
    const std::vector<std::string> calls = Check(scenario, natural, noFaults);
    totals.calls += calls.size();
    for (std::size_t place = 0; place < calls.size(); ++place) {
        for (const fake::FailureValue& value : ValuesOf(calls[place])) {
            SweepPoint(scenario, natural, {place, value.fault}, pairs);
        }
        if (fake::DefaultFault(calls[place]) != nullptr) {
            Plan plan;
            plan.from = place;
            Check(scenario, natural, plan);
        }
    }
    Findings findings;
    CheckLeaks(findings);
    Report(scenario.name, noFaults, findings);
}

void Sweeper::SweepPoint(const Scenario& scenario, const Ending& natural, const Point& point, bool pairs) {
    const std::vector<std::string> calls = Check(scenario, natural, {{point}, false, std::nullopt});
    const std::string& function = calls[point.call];
    const auto behind = calls.begin() + static_cast<std::ptrdiff_t>(point.call) + 1;
    const bool again = std::find(behind, calls.end(), function) != calls.end();
    if (again && !(operation.endless && operation.endless(function, point.fault))) {
        Check(scenario, natural, {{point}, true, std::nullopt});
    }
    if (!pairs) {
        return;
    }
    for (std::size_t place = point.call + 1; place < calls.size(); ++place) {
        for (const fake::FailureValue& value : ValuesOf(calls[place])) {
            Check(scenario, natural, {{point, {place, value.fault}}, false, std::nullopt});
        }
    }
}

std::vector<std::string> Sweeper::Check(const Scenario& scenario, const Ending& natural, const Plan& plan) {
    ++totals.runs;
    Findings findings;
    std::vector<std::string> calls;
    {
        const Run run(operation, scenario, plan);
        CheckRun(run, findings);
        NoteEdges(run, findings);
        for (const fake::Call& call : run.Calls()) {
            calls.push_back(call.function);
        }
    }
    CheckFreshRun(operation, scenario, natural, findings);
    Report(scenario.name, plan, findings);
    return calls;
}

void Sweeper::NoteEdges(const Run& run, Findings& findings) {
    for (std::size_t place = 0; place < run.Calls().size(); ++place) {
        const std::string& function = run.Calls()[place].function;
        if (called.insert(function).second && known.count(function) == 0) {
            findings.Add("edges", function + " is called and not listed");
        }
        if (const fake::Fault* fault = run.FaultAt(place)) {
            reached.emplace(function, fault->Text());
        }
    }
}

void Sweeper::CheckEdges() {
    Findings findings;
    for (const std::string& function : known) {
        if (called.count(function) == 0) {
            findings.Add("edges", function + " is listed and no scenario reaches it");
        }
        for (const fake::FailureValue& value : ValuesOf(function)) {
            ++totals.edges;
            if (reached.count({function, value.fault.Text()}) != 0) {
                ++totals.edgesReached;
            } else {
                findings.Add("edges", function + " = " + value.fault.Text() + " was never exercised");
            }
        }
    }
    Report("", {}, findings);
}

void Sweeper::Report(const std::string& scenario, const Plan& plan, const Findings& findings) {
    for (const std::string& text : findings.texts) {
        ++totals.failures;
        if (totals.failures > kMostReports) {
            continue;
        }
        out << operation.name << " " << scenario << ": " << text << "\n";
        if (!scenario.empty()) {
            out << "    repeat: " << program << " --operation " << operation.name << " --scenario " << scenario
                << plan.Options() << "\n";
        }
        if (totals.failures == kMostReports) {
            out << "    (no more of this operation are shown)\n";
        }
    }
}

}  // namespace sweep
