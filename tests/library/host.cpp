// Loads the built module, calls all of its operations against the imitated appliance, and shows what is said.

#include <cstdio>
#include <exception>
#include <set>

#include "tests/library/module_library.h"
#include "tests/library/scenario.h"

namespace {

void ShowTable(const ModuleLibrary& module) {
    int rows = 0;
    for (const VORN::APIEntry* row = module.Table(); row->api != nullptr; ++row) {
        std::printf("  %-38s version %d  %s\n", row->api, row->version, row->method);
        ++rows;
    }
    std::printf("  %d operations in the API table\n", rows);
}

void Show(std::size_t number, const Step& step, const Outcome& outcome) {
    std::printf("\n%2zu. %s\n", number, step.title.c_str());
    if (step.api.empty()) {
        std::printf("    runs      the body of the task, with the parameters of the request that started it\n");
    } else {
        std::printf("    request   %s version %d %s %s\n", step.api.c_str(), step.version, step.method.c_str(),
                    step.parameters.c_str());
    }
    for (const fake::Answer& answer : outcome.answers) {
        if (answer.success) {
            std::printf("    %s   success %s\n", step.api.empty() ? "shows  " : "answer ",
                        CompactJson(answer.data).c_str());
        } else {
            std::printf("    %s   error %d %s\n", step.api.empty() ? "shows  " : "answer ", answer.code,
                        CompactJson(answer.data).c_str());
        }
    }
    for (const fake::LogLine& line : outcome.logs) {
        const std::string message = line.message.substr(0, line.message.find('\n'));
        std::printf("    log       %s:%d %s\n", line.unit.c_str(), line.line, message.c_str());
    }
    for (const std::string& command : outcome.commands) {
        std::printf("    shell     %s (not run)\n", command.c_str());
    }
    std::printf("    took      %.0f microseconds\n", outcome.microseconds);
}

bool AsExpected(const Step& step, const Outcome& outcome) {
    bool same = outcome.answers.size() == step.answers.size();
    for (std::size_t i = 0; same && i < step.answers.size(); ++i) {
        same = outcome.answers[i].success && outcome.answers[i].data == ParseJson(step.answers[i]);
    }
    if (!same) {
        std::printf("    EXPECTED ");
        for (const std::string& answer : step.answers) {
            std::printf(" success %s", answer.c_str());
        }
        std::printf("\n");
    }
    return same;
}

int Run(const char* path) {
    const ModuleLibrary module(path);
    std::printf("Loaded %s\n", path);
    ShowTable(module);

    PrepareAppliance();
    std::set<VORN::APIFunction> functions;
    int bodies = 0;
    int wrong = 0;
    std::size_t number = 0;
    for (const Step& step : Scenario()) {
        const Outcome outcome = RunStep(module, step);
        Show(++number, step, outcome);
        wrong += AsExpected(step, outcome) ? 0 : 1;
        if (step.api.empty()) {
            ++bodies;
        } else {
            functions.insert(module.Function(step.api, step.version, step.method));
        }
    }
    std::printf("\n%zu operations and %d task bodies called in %zu steps, %d answered otherwise than expected\n",
                functions.size(), bodies, number, wrong);
    return wrong == 0 ? 0 : 1;
}

}  // namespace

int main(int argc, char** argv) {
    if (argc != 2) {
        std::fprintf(stderr, "usage: %s vorn_directory_domain.so\n", argv[0]);
        return 2;
    }
    try {
        return Run(argv[1]);
    } catch (const std::exception& failure) {
        std::fprintf(stderr, "%s\n", failure.what());
        return 1;
    }
}
