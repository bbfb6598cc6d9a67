// The fault sweep: makes every platform call of every operation fail, alone and in pairs, and checks what comes of it.

#include <exception>
#include <iostream>
#include <stdexcept>

#include "tests/faults/operations.h"
#include "tests/faults/options.h"
#include "tests/faults/self_test.h"
#include "tests/faults/sweeper.h"

namespace {

const sweep::Scenario& ScenarioOf(const sweep::Operation& operation, const std::string& name) {
    for (const sweep::Scenario& scenario : operation.scenarios) {
        if (scenario.name == name) {
            return scenario;
        }
    }
    throw std::invalid_argument(operation.name + " has no scenario " + name);
}

void List() {
    for (const sweep::Operation& operation : sweep::Operations()) {
        for (const sweep::Scenario& scenario : operation.scenarios) {
            std::cout << operation.name << " " << scenario.name << "\n";
        }
    }
}

bool SweepAll(const sweep::Options& options, const std::string& program) {
    sweep::Totals totals;
    for (const sweep::Operation& operation : sweep::Operations()) {
        const sweep::Totals own = sweep::Sweeper(operation, program, std::cout).Sweep("", sweep::Part(), options.pairs);
        std::cout << "sweep " << operation.name << ": " << own.Text() << std::endl;
        totals.Add(own);
    }
    std::cout << "sweep: " << totals.Text() << std::endl;
    return totals.failures == 0;
}

bool Execute(const sweep::Options& options, const std::string& program) {
    if (options.list) {
        List();
        return true;
    }
    if (options.selfTest) {
        return sweep::SelfTest(std::cout);
    }
    if (options.operation.empty()) {
        return SweepAll(options, program);
    }
    const sweep::Operation* operation = sweep::FindOperation(options.operation);
    if (operation == nullptr) {
        throw std::invalid_argument("there is no operation " + options.operation);
    }
    sweep::Sweeper sweeper(*operation, program, std::cout);
    if (options.single) {
        return sweeper.Show(ScenarioOf(*operation, options.scenario), options.plan);
    }
    if (!options.scenario.empty()) {
        ScenarioOf(*operation, options.scenario);
    }
    const sweep::Totals totals = sweeper.Sweep(options.scenario, options.part, options.pairs);
    std::cout << "sweep " << operation->name << ": " << totals.Text() << std::endl;
    return totals.failures == 0;
}

}  // namespace

int main(int count, char** arguments) {
    try {
        return Execute(sweep::ParseOptions(count, arguments), arguments[0]) ? 0 : 1;
    } catch (const std::exception& error) {
        std::cerr << error.what() << "\n\n" << sweep::kUsage;
        return 2;
    }
}
