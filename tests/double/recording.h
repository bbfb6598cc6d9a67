// The frame of every imitated operation: records the call, checks its arguments, applies an injected fault.

#ifndef VORN_TESTS_DOUBLE_RECORDING_H
#define VORN_TESTS_DOUBLE_RECORDING_H

#include <json/value.h>

#include <cstddef>
#include <optional>
#include <string>
#include <vector>

#include "tests/double/appliance.h"

namespace fake {

// Arguments as texts.
std::string Quoted(const char* text);
std::string Quoted(const std::string& text);
std::string Number(int number);
std::string Flag(bool flag);
std::string SizeText(int size);
std::string Compact(const Json::Value& value);
std::string Named(const void* pointer, const char* name);

class Recording {
public:
    // Throws InjectedException when the call is to fail by an exception.
    Recording(const char* functionName, std::vector<std::string> arguments);
    Recording(const Recording&) = delete;
    Recording& operator=(const Recording&) = delete;

    // Whether a fault makes the call fail before it has any effect.
    bool Fails() const;

    // The end of a call that worked. A fault may replace the answer.
    int Answer(int natural) const;

    // The end of a call that failed, by a fault or by itself: sets the last error.
    int Failure(int natural);
    std::nullptr_t FailureNull();
    bool FailureFalse();

    // Records a misuse and answers true when any of the pointers is null.
    template <typename... Pointers>
    bool Null(const Pointers*... pointers) {
        const bool null = ((pointers == nullptr) || ...);
        if (null) {
            Misuse("null argument");
        }
        return null;
    }

    // Records a misuse and answers false when the handle isn't live.
    bool Live(const void* handle, HandleKind kind);

    // A buffer: filled to its whole size around the text, or left with a text that nobody may look at.
    void Fill(char* buffer, int size, const std::string& text);
    void Spoil(char* buffer, int size);
    bool BadBuffer(const char* buffer, int size);

    void Misuse(const std::string& text);
    std::string Text() const;

private:
    void SetLastError();

    std::string function;
    std::size_t index;
    std::optional<Fault> fault;
    bool neighbour = false;
};

}  // namespace fake

#endif
