#include "tests/faults/expectation.h"

#include <json/writer.h>

#include <cstring>
#include <unordered_map>
#include <utility>

namespace sweep {

namespace {

bool Holds(const fake::Call& call, const std::string& part) {
    return part.empty() || call.Text().find(part) != std::string::npos;
}

bool Applies(When when, const fake::Fault& fault) {
    if (fault.kind == fake::Fault::Kind::kThrow) {
        return when == When::kThrows;
    }
    if (fault.kind != fake::Fault::Kind::kResult) {
        return when == When::kAny || when == When::kFails;
    }
    switch (when) {
        case When::kAny:
            return true;
        case When::kNegative:
            return fault.result < 0;
        case When::kZeroOrLess:
            return fault.result <= 0;
        case When::kZero:
            return fault.result == 0;
        case When::kNotZero:
            return fault.result != 0;
        case When::kZeroOrMore:
            return fault.result >= 0;
        case When::kOne:
            return fault.result == 1;
        case When::kMinusOne:
            return fault.result == -1;
        case When::kFails:
        case When::kThrows:
            break;
    }
    return false;
}

// Takes the calls of a run one by one.
class Folding {
public:
    explicit Folding(const Run& itsRun) : run(itsRun) {
        outcome.data = run.scenario.data;
        if (run.operation.answering == Answering::kProgress) {
            Json::Value progress;
            progress["status"] = "updating";
            outcome.earlier.push_back({true, 0, progress});
        }
    }

    Expectation Result() {
        for (std::size_t place = 0; place < run.Calls().size() && !outcome.thrown; ++place) {
            const fake::Call& call = run.Calls()[place];
            Take({call, run.FaultAt(place), ++counts[call.function], run.scenario});
        }
        if (!outcome.thrown) {
            outcome.earlier.push_back(Ending());
        }
        return {outcome.thrown, outcome.earlier, missingRule};
    }

private:
    void Take(const Event& event) {
        const bool throws = event.fault != nullptr && event.fault->kind == fake::Fault::Kind::kThrow;
        if (throws) {
            // No operation catches one, so this holds for every function; a rule may add to it.
            if (const Rule* rule = Find(event)) {
                rule->effect.apply(outcome, event);
            }
            outcome.thrown = true;
            return;
        }
        if (outcome.stopped) {
            return;
        }
        const Effect* effect = EffectOf(event);
        if (effect != nullptr) {
            effect->apply(outcome, event);
        }
        if (effect == nullptr || effect->asUsual) {
            for (const Natural& natural : run.scenario.naturals) {
                if (natural.function == event.call.function && Holds(event.call, natural.where)) {
                    natural.effect.apply(outcome, event);
                }
            }
        }
    }

    const Effect* EffectOf(const Event& event) {
        if (event.fault == nullptr) {
            return nullptr;
        }
        const Rule* rule = Find(event);
        if (rule == nullptr) {
            missingRule = event.call.Text() + " = " + event.fault->Text();
            return nullptr;
        }
        return Applies(rule->when, *event.fault) ? &rule->effect : &rule->otherwise;
    }

    const Rule* Find(const Event& event) const {
        const bool throws = event.fault->kind == fake::Fault::Kind::kThrow;
        for (const Rule& rule : run.operation.rules) {
            if (event.call.function == rule.function && (rule.when == When::kThrows) == throws &&
                Holds(event.call, rule.where) && (*rule.after == '\0' || counts.count(rule.after) != 0)) {
                return &rule;
            }
        }
        return nullptr;
    }

    fake::Answer Ending() const {
        if (outcome.ending) {
            return *outcome.ending;
        }
        if (outcome.failing) {
            return {false, outcome.code, Json::Value()};
        }
        return {true, 0, run.operation.shape ? run.operation.shape(outcome.data) : outcome.data};
    }

    const Run& run;
    Outcome outcome;
    std::unordered_map<std::string, std::size_t> counts;
    std::string missingRule;
};

}  // namespace

void Outcome::Record(int newCode) {
    if (code == 2600) {
        code = newCode;
    }
}

int Event::Result() const {
    return fault->result;
}

Effect Ignored() {
    return {[](Outcome&, const Event&) {}, true};
}

Effect GoesOn() {
    return {[](Outcome&, const Event&) {}, false};
}

Effect Records(int code) {
    return {[code](Outcome& outcome, const Event&) { outcome.Record(code); }, true};
}

Effect Stops(int code) {
    return {[code](Outcome& outcome, const Event&) {
                outcome.Record(code);
                outcome.failing = true;
                outcome.stopped = true;
            },
            false};
}

Effect StopsWithoutCode() {
    return Stops(2600);
}

Effect FailsLater() {
    return {[](Outcome& outcome, const Event&) { outcome.failing = true; }, true};
}

Effect ThrowsLater() {
    return {[](Outcome& outcome, const Event&) { outcome.thrown = true; }, true};
}

Effect Edits(std::function<void(Outcome&, const Event&)> edit) {
    return {std::move(edit), false};
}

Expectation Expect(const Run& run) {
    return Folding(run).Result();
}

std::string AnswersText(bool thrown, const std::vector<fake::Answer>& answers) {
    Json::StreamWriterBuilder writer;
    writer["indentation"] = "";
    std::string text;
    for (const fake::Answer& answer : answers) {
        text += answer.success ? "success " : "error " + std::to_string(answer.code) + " ";
        text += Json::writeString(writer, answer.data) + "; ";
    }
    return text + (thrown ? "an exception" : "no exception");
}

}  // namespace sweep
