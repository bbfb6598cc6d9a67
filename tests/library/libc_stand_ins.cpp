#include "tests/library/libc_stand_ins.h"

#include <cstdarg>
#include <cstdio>
#include <string>

#include "tests/double/appliance.h"

std::function<void()> whileAsleep;

namespace {

void Log(int priority, const char* format, std::va_list arguments) {
    char text[4096] = {};
    std::vsnprintf(text, sizeof(text), format, arguments);
    fake::TheAppliance().RecordLog(priority, format, text);
}

}  // namespace

// The declarations of the C library differ in what they promise, hence no header of theirs here. The functions that
// begin with "__wrap_" are the imitated appliance's.
extern "C" {

int __wrap_system(const char* command);
unsigned int __wrap_sleep(unsigned int seconds);
int __wrap_access(const char* path, int mode);
int __wrap_unlink(const char* path);

int system(const char* command);
unsigned int sleep(unsigned int seconds);
int access(const char* path, int mode) noexcept;
int unlink(const char* path) noexcept;
void syslog(int priority, const char* format, ...) __attribute__((format(printf, 2, 3)));
void __syslog_chk(int priority, int flag, const char* format, ...) __attribute__((format(printf, 3, 4)));

int system(const char* command) {
    return __wrap_system(command);
}

unsigned int sleep(unsigned int seconds) {
    const unsigned int left = __wrap_sleep(seconds);
    if (whileAsleep) {
        whileAsleep();
    }
    return left;
}

int access(const char* path, int mode) noexcept {
    return __wrap_access(path, mode);
}

int unlink(const char* path) noexcept {
    return __wrap_unlink(path);
}

void syslog(int priority, const char* format, ...) {
    std::va_list arguments;
    va_start(arguments, format);
    Log(priority, format, arguments);
    va_end(arguments);
}

// What syslog is called in a build with checked buffers.
void __syslog_chk(int priority, int /*flag*/, const char* format, ...) {
    std::va_list arguments;
    va_start(arguments, format);
    Log(priority, format, arguments);
    va_end(arguments);
}
}
