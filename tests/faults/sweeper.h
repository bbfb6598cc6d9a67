// The sweep of one operation: every scenario without faults, with each call made to fail in each of its ways, once and
// from there on, with all calls from a place on failing, and with every pair of failures.

#ifndef VORN_TESTS_FAULTS_SWEEPER_H
#define VORN_TESTS_FAULTS_SWEEPER_H

#include <cstddef>
#include <ostream>
#include <set>
#include <string>
#include <utility>
#include <vector>

#include "tests/faults/oracles.h"
#include "tests/faults/run.h"

namespace sweep {

struct Totals {
    void Add(const Totals& other);
    // "scenarios 31, calls 812, runs 41234, edges 97 of 97, 12.3 s"
    std::string Text() const;

    std::size_t scenarios = 0;
    std::size_t calls = 0;  // of the runs without faults
    std::size_t runs = 0;
    std::size_t edgesReached = 0;
    std::size_t edges = 0;
    std::size_t failures = 0;
    double seconds = 0;
};

class Sweeper {
public:
    // Failures are written to `out`, each with the options that repeat it behind `program`.
    Sweeper(const Operation& itsOperation, std::string itsProgram, std::ostream& itsOut);

    // All scenarios and the edges; or one scenario, when its name is not empty, or a part of them. Without pairs it is a
    // quick look.
    Totals Sweep(const std::string& scenario, const Part& part, bool pairs);

    // One run, shown call by call. True when all is well.
    bool Show(const Scenario& scenario, const Plan& plan);

private:
    void SweepScenario(const Scenario& scenario, bool pairs);
    void SweepPoint(const Scenario& scenario, const Ending& natural, const Point& point, bool pairs);
    // Carries the plan out and answers the functions that were called, in their order.
    std::vector<std::string> Check(const Scenario& scenario, const Ending& natural, const Plan& plan);
    void NoteEdges(const Run& run, Findings& findings);
    void CheckEdges();
    void Report(const std::string& scenario, const Plan& plan, const Findings& findings);

    const Operation& operation;
    std::string program;
    std::ostream& out;
    Totals totals;
    std::set<std::string> known;
    std::set<std::string> called;
    std::set<std::pair<std::string, std::string>> reached;  // function and value
};

}  // namespace sweep

#endif
