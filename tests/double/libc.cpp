// The libc calls of the module, sent here by the linker. None reaches the real machine.

#include <algorithm>
#include <cerrno>
#include <cstdarg>
#include <cstdio>
#include <cstring>

#include "tests/double/recording.h"

using fake::HandleKind;
using fake::Number;
using fake::Quoted;
using fake::Recording;
using fake::State;
using fake::TheAppliance;

extern "C" {

char* __real_strdup(const char* text);
void __real_free(void* memory);
int __real_system(const char* command);
unsigned int __real_sleep(unsigned int seconds);
int __real_unlink(const char* path);

int __wrap_system(const char* command);
unsigned int __wrap_sleep(unsigned int seconds);
int __wrap_access(const char* path, int mode);
int __wrap_unlink(const char* path);
void __wrap_syslog(int priority, const char* format, ...) __attribute__((format(printf, 2, 3)));
char* __wrap_strdup(const char* text);
void __wrap_free(void* memory);

__attribute__((weak)) int LLVMFuzzerTestOneInput(const unsigned char* data, std::size_t size);
}

namespace {

// The fuzzer is linked into its target and has threads of its own, which wait with sleep and start processes. It is
// told from the module by its threads having no appliance.
bool CalledByFuzzer() {
    return LLVMFuzzerTestOneInput != nullptr && !fake::HasAppliance();
}

std::string CopyText(const char* copy, std::size_t length) {
    const bool wiped = length > 0 && std::all_of(copy, copy + length, [](char byte) { return byte == '\0'; });
    return wiped ? "wiped" : Quoted(std::string(copy, strnlen(copy, length)));
}

}  // namespace

int __wrap_system(const char* command) {
    if (CalledByFuzzer()) {
        return __real_system(command);
    }
    const Recording call("system", {Quoted(command)});
    State& state = TheAppliance().state;
    if (command != nullptr) {
        state.commands.emplace_back(command);
    }
    return call.Answer(state.systemResult);
}

unsigned int __wrap_sleep(unsigned int seconds) {
    if (CalledByFuzzer()) {
        return __real_sleep(seconds);
    }
    const Recording call("sleep", {std::to_string(seconds)});
    TheAppliance().state.sleptSeconds += seconds;
    return static_cast<unsigned int>(call.Answer(0));
}

int __wrap_access(const char* path, int mode) {
    Recording call("access", {Quoted(path), Number(mode)});
    if (call.Null(path) || call.Fails()) {
        errno = EACCES;
        return call.Answer(-1);
    }
    if (!TheAppliance().state.Exists(path)) {
        errno = ENOENT;
        return -1;
    }
    return call.Answer(0);
}

int __wrap_unlink(const char* path) {
    if (CalledByFuzzer()) {
        return __real_unlink(path);
    }
    Recording call("unlink", {Quoted(path)});
    if (call.Null(path) || call.Fails()) {
        errno = EACCES;
        return call.Answer(-1);
    }
    if (!TheAppliance().state.Remove(path)) {
        errno = ENOENT;
        return -1;
    }
    return call.Answer(0);
}

void __wrap_syslog(int priority, const char* format, ...) {
    const int error = errno;
    std::va_list arguments;
    va_start(arguments, format);
    std::va_list again;
    va_copy(again, arguments);
    const int length = std::vsnprintf(nullptr, 0, format, arguments);
    va_end(arguments);
    std::string text(length < 0 ? 0U : static_cast<std::size_t>(length), '\0');
    if (length > 0) {
        errno = error;  // for %m
        std::vsnprintf(&text[0], text.size() + 1, format, again);
    }
    va_end(again);
    const Recording call("syslog", {Number(priority), Quoted(text)});
    TheAppliance().RecordLog(priority, format, text);
    errno = error;
}

char* __wrap_strdup(const char* text) {
    if (!fake::HasAppliance()) {
        return __real_strdup(text);
    }
    Recording call("strdup", {Quoted(text)});
    if (call.Null(text) || call.Fails()) {
        errno = ENOMEM;
        return nullptr;
    }
    char* copy = __real_strdup(text);
    TheAppliance().AddHandle(copy, HandleKind::kCopy, call.Text(), std::strlen(text));
    return copy;
}

void __wrap_free(void* memory) {
    if (memory != nullptr && fake::HasAppliance() && TheAppliance().IsLive(memory, HandleKind::kCopy)) {
        const std::string text = CopyText(static_cast<const char*>(memory), TheAppliance().SizeOf(memory));
        const Recording call("free", {text});
        TheAppliance().RemoveHandle(memory);
    }
    __real_free(memory);
}
