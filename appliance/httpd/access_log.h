// A line for each request.

#ifndef VORN_APPLIANCE_HTTPD_ACCESS_LOG_H
#define VORN_APPLIANCE_HTTPD_ACCESS_LOG_H

#include <chrono>
#include <cstddef>
#include <cstdint>
#include <string>
#include <string_view>

#include "appliance/base/system_log.h"

namespace appliance {

// What a line tells. Nothing that could be a secret has a place in it: no header field, no body, no query.
struct AccessLine {
    std::string_view client;
    std::string_view verb;    // empty for what was no request
    std::string_view target;  // as it was sent
    int status = 0;
    std::size_t bytes = 0;  // of the answer's content
    std::chrono::milliseconds took{0};
};

// "10.0.0.5 POST /webapi/... 200 153 bytes 12 ms". Of the target the path up to "?", at most 200 bytes of it; whatever is
// no plain letter is shown as \xNN.
std::string FormatAccess(const AccessLine& line);

// Hands lines to the system's logger, or to the terminal. A logger that is busy holds up no request: what it does not take
// at once is counted as lost.
class AccessLog {
public:
    // `socket` is the logger's; with `terminal` the lines go to standard error instead.
    explicit AccessLog(bool terminal, std::string socket = "/dev/log");

    void Write(const AccessLine& line);
    std::uint64_t lost() const {
        return lost_;
    }

private:
    const bool terminal_;
    SystemLog log_;
    std::uint64_t lost_ = 0;
};

}  // namespace appliance

#endif
