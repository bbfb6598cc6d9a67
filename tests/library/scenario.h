// A day in the life of an appliance: every operation of the module and both bodies of its background tasks, in an order
// in which each finds what it needs.

#ifndef VORN_TESTS_LIBRARY_SCENARIO_H
#define VORN_TESTS_LIBRARY_SCENARIO_H

#include <functional>
#include <string>
#include <vector>

#include "tests/double/appliance.h"
#include "tests/library/module_library.h"

struct Step {
    std::string title;
    std::string api;  // empty: the body of the task that was started last runs, as the framework would run it
    int version;
    std::string method;
    std::string parameters;            // JSON
    std::vector<std::string> answers;  // JSON, each a success
};

// What a step led to.
struct Outcome {
    std::vector<fake::Answer> answers;
    std::vector<fake::LogLine> logs;
    std::vector<std::string> commands;  // for the shell; none ran
    double microseconds;
};

// An appliance that belongs to no domain yet and has a network with one around it.
void PrepareAppliance();

const std::vector<Step>& Scenario();

Outcome RunStep(const ModuleLibrary& module, const Step& step);

Json::Value ParseJson(const std::string& text);
std::string CompactJson(const Json::Value& value);

#endif
