#include "tests/double/recording.h"

#include <json/writer.h>

#include <algorithm>
#include <cstring>
#include <utility>

namespace fake {
namespace {

// A result that isn't a failure by the declaration: the work is done, only the answer differs.
bool IsNeighbour(const std::string& function, const Fault& fault) {
    const FunctionFailures* row = FindFailures(function);
    return row != nullptr && std::any_of(row->values.begin(), row->values.end(), [&](const FailureValue& value) {
               return !value.declared && value.fault == fault;
           });
}

Json::StreamWriterBuilder CompactWriter() {
    Json::StreamWriterBuilder builder;
    builder["indentation"] = "";
    builder["commentStyle"] = "None";
    builder["emitUTF8"] = true;
    return builder;
}

}  // namespace

std::string Quoted(const std::string& text) {
    static const char digits[] = "0123456789abcdef";
    std::string quoted = "\"";
    for (const char character : text) {
        const unsigned byte = static_cast<unsigned char>(character);
        if (character == '"' || character == '\\') {
            quoted += '\\';
            quoted += character;
        } else if (byte < 0x20U || byte == 0x7fU) {
            quoted += "\\x";
            quoted += digits[byte >> 4U];
            quoted += digits[byte & 0xfU];
        } else {
            quoted += character;
        }
    }
    return quoted + "\"";
}

std::string Quoted(const char* text) {
    return text == nullptr ? "null" : Quoted(std::string(text));
}

std::string Number(int number) {
    return std::to_string(number);
}

std::string Flag(bool flag) {
    return flag ? "true" : "false";
}

std::string SizeText(int size) {
    return "size " + std::to_string(size);
}

std::string Compact(const Json::Value& value) {
    static const Json::StreamWriterBuilder builder = CompactWriter();
    return Json::writeString(builder, value);
}

std::string Named(const void* pointer, const char* name) {
    return pointer == nullptr ? "null" : name;
}

Recording::Recording(const char* functionName, std::vector<std::string> arguments)
    : function(functionName),
      index(TheAppliance().Calls().size()),
      fault(TheAppliance().Record(function, std::move(arguments))) {
    if (!fault) {
        return;
    }
    neighbour = IsNeighbour(function, *fault);
    if (fault->kind == Fault::Kind::kThrow) {
        SetLastError();
        throw InjectedException(function);
    }
}

bool Recording::Fails() const {
    return fault && !neighbour;
}

int Recording::Answer(int natural) const {
    return fault ? fault->result : natural;
}

int Recording::Failure(int natural) {
    SetLastError();
    return Answer(natural);
}

std::nullptr_t Recording::FailureNull() {
    SetLastError();
    return nullptr;
}

bool Recording::FailureFalse() {
    SetLastError();
    return false;
}

bool Recording::Live(const void* handle, HandleKind kind) {
    if (handle != nullptr && TheAppliance().IsLive(handle, kind)) {
        return true;
    }
    Misuse(handle == nullptr ? "null argument" : std::string("not a live ") + NameOf(kind));
    return false;
}

void Recording::Fill(char* buffer, int size, const std::string& text) {
    if (buffer == nullptr || size <= 0) {
        return;
    }
    const auto room = static_cast<std::size_t>(size);
    std::memset(buffer, 'Z', room);
    const std::size_t length = std::min(text.size(), room - 1);
    std::memcpy(buffer, text.data(), length);
    buffer[length] = '\0';
}

void Recording::Spoil(char* buffer, int size) {
    Fill(buffer, size, TheAppliance().state.staleText);
}

bool Recording::BadBuffer(const char* buffer, int size) {
    if (buffer == nullptr || size <= 0) {
        Misuse("no buffer");
        return true;
    }
    if (std::any_of(buffer, buffer + size, [](char byte) { return byte != '\0'; })) {
        Misuse("a buffer that isn't zeroed");
    }
    return false;
}

void Recording::Misuse(const std::string& text) {
    TheAppliance().AddMisuse(Text() + ": " + text);
}

std::string Recording::Text() const {
    // A test's hook may have reset the appliance during the call.
    const std::vector<Call>& calls = TheAppliance().Calls();
    return index < calls.size() ? calls[index].Text() : function;
}

void Recording::SetLastError() {
    LastError& error = TheAppliance().state.lastError;
    error.code = ErrorCodeOf(function);
    error.file = "platform.c";
    error.line = TheAppliance().CountOf(function);
}

}  // namespace fake
