#include "tests/double/recorder.h"

#include <algorithm>
#include <stdexcept>
#include <utility>

#include "tests/double/failures.h"

namespace fake {
namespace {

bool StartsWith(const std::string& text, const std::string& prefix) {
    return text.compare(0, prefix.size(), prefix) == 0;
}

bool CanShow(const std::string& function, const Fault& fault) {
    const FunctionFailures* row = FindFailures(function);
    if (row == nullptr) {
        return false;
    }
    const bool throws = fault.kind == Fault::Kind::kThrow;
    return std::any_of(row->values.begin(), row->values.end(), [throws](const FailureValue& value) {
        return (value.fault.kind == Fault::Kind::kThrow) == throws;
    });
}

bool IsLineNumber(const std::string& text) {
    return !text.empty() && text.size() < 10 && text.find_first_not_of("0123456789") == std::string::npos;
}

}  // namespace

std::string Call::Text() const {
    std::string text = function + "(";
    for (std::size_t index = 0; index < arguments.size(); ++index) {
        text += (index == 0 ? "" : ", ") + arguments[index];
    }
    return text + ")";
}

unsigned KindOf(const Call& call) {
    const std::string& name = call.function;
    if (StartsWith(name, "VORN::APIRequest::")) {
        return kRequestReads;
    }
    if (StartsWith(name, "VLIBCSzList") || StartsWith(name, "VLIBCSzHash")) {
        return kContainers;
    }
    if (name == "VornConf::VornConf" || name == "VornConf::~VornConf") {
        return kConfObjects;
    }
    if (name == "VLIBCErrGet" || name == "VLIBCErrorGetFile" || name == "VLIBCErrorGetLine") {
        return kLastError;
    }
    if (StartsWith(name, "VORN::APIResponse::")) {
        return kAnswers;
    }
    if (name == "syslog") {
        return kLogs;
    }
    return name == "strdup" || name == "free" ? kCopies : kNoCalls;
}

const std::vector<Call>& Recorder::Calls() const {
    return calls;
}

std::vector<std::string> Recorder::CallTexts(unsigned leftOut) const {
    return CallTexts([leftOut](const Call& call) { return (KindOf(call) & leftOut) == 0; });
}

std::vector<std::string> Recorder::CallTexts(const std::function<bool(const Call&)>& filter) const {
    std::vector<std::string> texts;
    for (const Call& call : calls) {
        if (filter(call)) {
            texts.push_back(call.Text());
        }
    }
    return texts;
}

int Recorder::CountOf(const std::string& function) const {
    const auto found = counts.find(function);
    return found == counts.end() ? 0 : static_cast<int>(found->second);
}

const std::vector<LogLine>& Recorder::Logs() const {
    return logs;
}

const std::vector<Answer>& Recorder::Answers() const {
    return answers;
}

void Recorder::FailNth(const std::string& function, int nth, const Fault& fault, bool sticky) {
    if (nth < 1) {
        throw std::invalid_argument("calls are counted from 1");
    }
    if (!CanShow(function, fault)) {
        throw std::invalid_argument(function + " can't fail by " + fault.Text());
    }
    plans.push_back({function, static_cast<std::size_t>(nth), fault, sticky});
}

void Recorder::FailCallAt(std::size_t index, const Fault& fault, bool sticky) {
    plans.push_back({std::nullopt, index, fault, sticky});
}

void Recorder::FailFrom(std::size_t index) {
    plans.push_back({std::nullopt, index, std::nullopt, true});
}

std::optional<Fault> Recorder::Record(const std::string& function, std::vector<std::string> arguments) {
    const std::size_t index = calls.size();
    const std::size_t nth = ++counts[function];
    const std::optional<Fault> fault = FaultOf(function, index, nth);
    calls.push_back({function, std::move(arguments), fault.has_value(), fault});
    return fault;
}

std::optional<Fault> Recorder::FaultOf(const std::string& function, std::size_t index, std::size_t nth) {
    for (Plan& plan : plans) {
        if (!plan.function && !plan.fault) {
            const Fault* fault = index < plan.first ? nullptr : DefaultFault(function);
            if (fault != nullptr) {
                return *fault;
            }
            continue;
        }
        if (!plan.function && index == plan.first) {
            plan.function = function;
            plan.first = nth;
        }
        if (plan.function != function || nth < plan.first || (nth > plan.first && !plan.sticky)) {
            continue;
        }
        if (CanShow(function, *plan.fault)) {
            return plan.fault;
        }
    }
    return std::nullopt;
}

void Recorder::RecordLog(int priority, const std::string& format, const std::string& text) {
    LogLine line{priority, format, "", 0, text};
    const std::size_t colon = text.find_first_of(": \n");
    const std::size_t space = text.find(' ');
    if (colon != std::string::npos && colon > 0 && space != std::string::npos && colon < space) {
        const std::string number = text.substr(colon + 1, space - colon - 1);
        if (IsLineNumber(number)) {
            line.unit = text.substr(0, colon);
            line.line = std::stoi(number);
            line.message = text.substr(space + 1);
        }
    }
    logs.push_back(line);
}

void Recorder::RecordAnswer(bool success, int code, const Json::Value& data) {
    answers.push_back({success, code, data});
}

void Recorder::ResetRecorder() {
    calls.clear();
    logs.clear();
    answers.clear();
    plans.clear();
    counts.clear();
}

}  // namespace fake
