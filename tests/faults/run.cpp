#include "tests/faults/run.h"

#include <exception>

namespace sweep {

namespace {

void Inject(fake::Appliance& appliance, const Plan& plan) {
    for (const Point& point : plan.points) {
        appliance.FailCallAt(point.call, point.fault, plan.sticky);
    }
    if (plan.from) {
        appliance.FailFrom(*plan.from);
    }
}

}  // namespace

std::string Plan::Options() const {
    std::string text;
    for (const Point& point : points) {
        text += " --fail " + std::to_string(point.call) + "=" + point.fault.Text();
    }
    if (sticky) {
        text += " --sticky";
    }
    if (from) {
        text += " --from " + std::to_string(*from);
    }
    return text;
}

Run::Run(const Operation& itsOperation, const Scenario& itsScenario, const Plan& itsPlan)
    : operation(itsOperation), scenario(itsScenario), plan(itsPlan), appliance(fake::TheAppliance()) {
    appliance.Reset();
    appliance.state = scenario.before;
    Inject(appliance, plan);
    fake::Exchange exchange(scenario.parameters);
    try {
        operation.body(&exchange.request, &exchange.response);
    } catch (const std::exception& caught) {
        thrown = true;
        exception = caught.what();
    }
    FindFaults();
}

const std::vector<fake::Call>& Run::Calls() const {
    return appliance.Calls();
}

const std::vector<fake::Answer>& Run::Answers() const {
    return appliance.Answers();
}

const fake::State& Run::After() const {
    return appliance.state;
}

const fake::State& Run::Before() const {
    return scenario.before;
}

const fake::Fault* Run::FaultAt(std::size_t call) const {
    return faults[call] ? &*faults[call] : nullptr;
}

bool Run::Worked(std::size_t call) const {
    return !faults[call] || !IsDeclared(Calls()[call].function, *faults[call]);
}

bool Run::Failed(std::size_t call) const {
    return !Worked(call);
}

std::vector<std::size_t> Run::PlacesOf(const std::string& function, const std::string& where) const {
    std::vector<std::size_t> places;
    for (std::size_t place = 0; place < Calls().size(); ++place) {
        const fake::Call& call = Calls()[place];
        if (call.function == function && (where.empty() || call.Text().find(where) != std::string::npos)) {
            places.push_back(place);
        }
    }
    return places;
}

std::optional<std::size_t> Run::FirstOf(const std::string& function, const std::string& where) const {
    const std::vector<std::size_t> places = PlacesOf(function, where);
    return places.empty() ? std::nullopt : std::optional<std::size_t>(places.front());
}

bool Run::Called(const std::string& function, const std::string& where) const {
    return FirstOf(function, where).has_value();
}

std::string Run::Trace() const {
    std::string text;
    for (std::size_t place = 0; place < Calls().size(); ++place) {
        text += "    " + std::to_string(place) + " " + Calls()[place].Text();
        text += faults[place] ? " <- " + faults[place]->Text() + "\n" : "\n";
    }
    return text;
}

// A call's record tells only whether it failed; by what, the plan tells.
void Run::FindFaults() {
    faults.resize(Calls().size());
    for (std::size_t place = 0; place < Calls().size(); ++place) {
        const fake::Call& call = Calls()[place];
        if (!call.failed) {
            continue;
        }
        for (const Point& point : plan.points) {
            const bool later = plan.sticky && place > point.call && Calls()[point.call].function == call.function;
            if (!faults[place] && (place == point.call || later)) {
                faults[place] = point.fault;
            }
        }
        if (!faults[place] && plan.from) {
            faults[place] = *fake::DefaultFault(call.function);
        }
    }
}

bool IsDeclared(const std::string& function, const fake::Fault& fault) {
    const fake::FunctionFailures* row = fake::FindFailures(function);
    if (row == nullptr) {
        return false;
    }
    for (const fake::FailureValue& value : row->values) {
        if (value.fault == fault) {
            return value.declared;
        }
    }
    return false;
}

}  // namespace sweep
