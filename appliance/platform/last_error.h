// How an operation of the platform fails: it leaves the calling thread's last error, with the place that found it.

#ifndef VORN_APPLIANCE_PLATFORM_LAST_ERROR_H
#define VORN_APPLIANCE_PLATFORM_LAST_ERROR_H

#include <new>
#include <string>

#include "appliance/base/error_code.h"
#include "appliance/base/log.h"
#include "appliance/base/sqlite.h"
#include "appliance/platform/contract.h"

namespace appliance {

// The last part of a source's path, at compile time: what a log line shows.
constexpr const char* SourceName(const char* path) {
    const char* name = path;
    for (const char* place = path; *place != '\0'; ++place) {
        if (*place == '/') {
            name = place + 1;
        }
    }
    return name;
}

}  // namespace appliance

// Sets the last error to `code` with this source and line, and is `result` (by default -1): `return VORN_FAIL(NotFound);`
#define VORN_FAIL(code) VORN_FAIL_WITH(code, -1)
#define VORN_FAIL_WITH(code, result) \
    (VLIBCErrSetEx(static_cast<int>(appliance::ErrorCode::code), appliance::SourceName(__FILE__), __LINE__), (result))

// Runs the body of an operation with C linkage so that no exception leaves it. `failure` is what the operation answers
// when one tries to.
#define VORN_GUARD(failure, ...)                            \
    try {                                                   \
        __VA_ARGS__                                         \
    } catch (const std::bad_alloc&) {                       \
        return VORN_FAIL_WITH(OutOfMemory, failure);        \
    } catch (const appliance::SqliteError& error) {         \
        appliance::Log(LOG_ERR, error.what());              \
        return VORN_FAIL_WITH(Database, failure);           \
    } catch (const std::exception& error) {                 \
        appliance::Log(LOG_ERR, std::string(error.what())); \
        return VORN_FAIL_WITH(Internal, failure);           \
    }

#endif
