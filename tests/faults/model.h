// What the fault sweep knows of an operation: its scenarios, the effect that each failure must have, and how it answers.
//
// The rules are written from what the operations promise, not from how they run: a rule names a platform function, where
// its call stands, the results that count as a failure there, and the effect. What a run must answer follows by taking
// the rules of its failed calls in the order of the calls.

#ifndef VORN_TESTS_FAULTS_MODEL_H
#define VORN_TESTS_FAULTS_MODEL_H

#include <json/value.h>

#include <cstddef>
#include <functional>
#include <optional>
#include <string>
#include <vector>

#include "platform/webapi.h"
#include "tests/double/appliance.h"

namespace sweep {

class Run;
struct Scenario;

// Where the rules have got to.
struct Outcome {
    // The first recorded code is the one that counts.
    void Record(int newCode);

    int code = 2600;
    bool failing = false;  // whatever follows, the end is a failure
    bool stopped = false;  // what follows is clean-up and the answer
    bool thrown = false;
    std::vector<fake::Answer> earlier;   // answers ahead of the last one
    std::optional<fake::Answer> ending;  // the last answer, where it is neither success with `data` nor `code`
    Json::Value data;                    // of the answer of success, before Operation::shape
};

// One call as a rule sees it.
struct Event {
    int Result() const;

    const fake::Call& call;
    const fake::Fault* fault;  // null when the call was left alone
    std::size_t nth;           // of the calls of this function, from 1
    const Scenario& scenario;
};

// What a failure, or a result of the scenario's own, does.
struct Effect {
    std::function<void(Outcome&, const Event&)> apply;
    bool asUsual = false;  // the scenario's own effect at this call comes about as well
};

Effect Ignored();           // as if the call had not been made to fail
Effect GoesOn();            // the opposite of what the scenario's own result would have done
Effect Records(int code);   // and goes on
Effect Stops(int code);     // records and goes to the clean-up
Effect StopsWithoutCode();  // the client receives 2600
Effect FailsLater();        // a later step finds the code
Effect ThrowsLater();       // nothing that follows keeps the scenario's own exception from coming
Effect Edits(std::function<void(Outcome&, const Event&)> edit);

// The results that have a rule's effect. A null and a false are a failure wherever they can be shown.
enum class When { kAny, kFails, kNegative, kZeroOrLess, kZero, kNotZero, kZeroOrMore, kOne, kMinusOne, kThrows };

struct Rule {
    const char* function;
    const char* where;  // a part of the call's text; empty for every call of the function
    const char* after;  // a function that was called before; empty for every place
    When when;
    Effect effect;
    Effect otherwise = Ignored();
};

// A result of the scenario's own that has an effect, at the calls of `function` whose text holds `where`.
struct Natural {
    std::string function;
    std::string where;
    Effect effect;
};

struct Scenario {
    std::string name;
    Json::Value parameters;
    fake::State before;
    Json::Value data;  // of the answer of success; see Operation::shape
    std::vector<Natural> naturals;
};

class Findings {
public:
    void Add(const std::string& oracle, const std::string& text);
    bool Has(const std::string& oracle) const;

    std::vector<std::string> texts;
};

using Oracle = void (*)(const Run& run, Findings& findings);

// How often an operation answers.
enum class Answering {
    kOnce,
    kProgress,  // at its start and at its end
    kHandsOn,   // the framework answers for it, perhaps after an answer of 117
};

struct Operation {
    std::string name;
    std::function<void(VORN::APIRequest*, VORN::APIResponse*)> body;
    Answering answering = Answering::kOnce;
    std::vector<std::string> functions;  // what it may call
    std::vector<Rule> rules;
    std::vector<Scenario> scenarios;
    std::vector<Oracle> oracles;                           // beside those that every operation has
    std::function<Json::Value(const Json::Value&)> shape;  // from Outcome::data to the answer; none: as it is
    std::function<bool(const std::string& function, const fake::Fault& fault)> endless;  // when it never stops failing
};

}  // namespace sweep

#endif
