// One call of an operation on a fresh appliance, some platform calls made to fail.

#ifndef VORN_TESTS_FAULTS_RUN_H
#define VORN_TESTS_FAULTS_RUN_H

#include <cstddef>
#include <optional>
#include <string>
#include <vector>

#include "tests/double/appliance.h"
#include "tests/faults/model.h"

namespace sweep {

struct Point {
    std::size_t call;  // its place among all calls, from 0
    fake::Fault fault;
};

// Every `of`th scenario, from that of this number on, the first being 1: a long sweep can run in several processes.
struct Part {
    std::size_t number = 1;
    std::size_t of = 1;
};

// Which calls fail.
struct Plan {
    // As the program's options: "--fail 17=-1 --sticky".
    std::string Options() const;

    std::vector<Point> points;
    bool sticky = false;              // also every later call of the same function
    std::optional<std::size_t> from;  // every call from this place on
};

// Carries a plan out. Shows the appliance as the run left it, so only until the next run.
class Run {
public:
    Run(const Operation& itsOperation, const Scenario& itsScenario, const Plan& itsPlan);
    Run(const Run&) = delete;
    Run& operator=(const Run&) = delete;

    const std::vector<fake::Call>& Calls() const;
    const std::vector<fake::Answer>& Answers() const;
    const fake::State& After() const;
    const fake::State& Before() const;

    // The fault at a call, or null when it was left alone.
    const fake::Fault* FaultAt(std::size_t call) const;
    // Whether the call had its effect: left alone, or only its answer replaced.
    bool Worked(std::size_t call) const;
    // A failure by a negative result or an exception.
    bool Failed(std::size_t call) const;

    // The places of the calls of a function whose text holds `where`.
    std::vector<std::size_t> PlacesOf(const std::string& function, const std::string& where = "") const;
    std::optional<std::size_t> FirstOf(const std::string& function, const std::string& where = "") const;
    bool Called(const std::string& function, const std::string& where = "") const;

    // The calls as lines, failed ones marked.
    std::string Trace() const;

    const Operation& operation;
    const Scenario& scenario;
    const Plan& plan;
    bool thrown = false;
    std::string exception;

private:
    void FindFaults();

    fake::Appliance& appliance;
    std::vector<std::optional<fake::Fault>> faults;
};

// Whether a fault is a failure by the function's declaration.
bool IsDeclared(const std::string& function, const fake::Fault& fault);

}  // namespace sweep

#endif
