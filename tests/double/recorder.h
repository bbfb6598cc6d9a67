// What was called, logged and answered, and which calls are to fail.

#ifndef VORN_TESTS_DOUBLE_RECORDER_H
#define VORN_TESTS_DOUBLE_RECORDER_H

#include <json/value.h>

#include <cstddef>
#include <functional>
#include <optional>
#include <string>
#include <unordered_map>
#include <vector>

#include "tests/double/fault.h"

namespace fake {

struct Call {
    std::string function;
    std::vector<std::string> arguments;  // a text is quoted, a buffer shows its size only
    bool failed = false;                 // by an injected fault, also by one that only replaced the answer
    std::optional<Fault> fault;          // that fault

    std::string Text() const;
};

struct LogLine {
    int priority = 0;
    std::string format;
    std::string unit;  // what leads the text as "unit:line "; empty when nothing does
    int line = 0;
    std::string message;  // the text behind it
};

struct Answer {
    bool success = false;
    int code = 0;
    Json::Value data;
};

// Kinds of calls that CallTexts can leave out.
enum CallKinds : unsigned {
    kNoCalls = 0,
    kRequestReads = 1U << 0,  // HasParam, GetParam
    kContainers = 1U << 1,    // lists and hashes
    kConfObjects = 1U << 2,   // VornConf's constructor and destructor
    kLastError = 1U << 3,     // the getters of the last error
    kAnswers = 1U << 4,       // SetSuccess, SetError
    kLogs = 1U << 5,          // syslog
    kCopies = 1U << 6,        // strdup, free
    kBookkeeping = kRequestReads | kContainers | kConfObjects | kLastError | kAnswers,
    kAllBookkeeping = kBookkeeping | kLogs | kCopies,
};

unsigned KindOf(const Call& call);

class Recorder {
public:
    const std::vector<Call>& Calls() const;
    std::vector<std::string> CallTexts(unsigned leftOut = kNoCalls) const;
    std::vector<std::string> CallTexts(const std::function<bool(const Call&)>& filter) const;
    int CountOf(const std::string& function) const;
    const std::vector<LogLine>& Logs() const;
    const std::vector<Answer>& Answers() const;

    // The `nth` call of `function`, counted from 1, fails; with `sticky` every later one too. Throws
    // std::invalid_argument for a function that can't fail this way. Any number of faults may be set.
    void FailNth(const std::string& function, int nth, const Fault& fault, bool sticky = false);

    // The call with this place in Calls() fails; with `sticky` every later one of the same function too. A fault that
    // the function can't show is left out.
    void FailCallAt(std::size_t index, const Fault& fault, bool sticky = false);

    // Every call from this place in Calls() on fails with the function's default fault, if it has one.
    void FailFrom(std::size_t index);

    // Records a call and tells the fault by which it is to fail.
    std::optional<Fault> Record(const std::string& function, std::vector<std::string> arguments);
    void RecordLog(int priority, const std::string& format, const std::string& text);
    void RecordAnswer(bool success, int code, const Json::Value& data);

protected:
    void ResetRecorder();

private:
    struct Plan {
        std::optional<std::string> function;
        std::size_t first = 0;  // of the function's calls, or of all when there is no function
        std::optional<Fault> fault;
        bool sticky = false;
    };

    std::optional<Fault> FaultOf(const std::string& function, std::size_t index, std::size_t nth);

    std::vector<Call> calls;
    std::vector<LogLine> logs;
    std::vector<Answer> answers;
    std::vector<Plan> plans;
    std::unordered_map<std::string, std::size_t> counts;
};

}  // namespace fake

#endif
