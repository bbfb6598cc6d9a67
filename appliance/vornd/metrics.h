// What the server has done since its start, in the text form of Prometheus. Lives on the server's thread.

#ifndef VORN_APPLIANCE_VORND_METRICS_H
#define VORN_APPLIANCE_VORND_METRICS_H

#include <array>
#include <chrono>
#include <cstddef>
#include <cstdint>
#include <map>
#include <string>
#include <utility>

#include "appliance/vornd/reply.h"

namespace appliance {

inline constexpr const char kFiguresType[] = "text/plain; version=0.0.4";

class Metrics {
public:
    // The server's state at a moment.
    struct Gauges {
        std::size_t runningCalls = 0;
        std::size_t waitingCalls = 0;
        std::size_t runningLogIns = 0;
        std::size_t waitingLogIns = 0;
        std::size_t connections = 0;
        std::size_t sessions = 0;
    };

    // Counts an answer that took so long from the request's last byte on.
    void Count(const Reply& reply, std::chrono::microseconds took);

    // No name of a domain, a user or a host is in it.
    std::string Render(const Gauges& gauges) const;

private:
    // Upper bounds in seconds: from what is read from a file to a join that takes its time.
    static constexpr std::array<double, 10> kBounds{0.002, 0.005, 0.01, 0.05, 0.25, 1, 5, 20, 60, 300};
    struct Histogram {
        std::array<std::uint64_t, kBounds.size()> upTo{};  // each with those of the smaller bounds
        std::uint64_t count = 0;
        double sum = 0;
    };
    using Method = std::pair<std::string, std::string>;

    std::map<std::pair<Method, int>, std::uint64_t> requests_;
    std::map<Method, Histogram> times_;
};

// A line of the text form with its "# HELP" and "# TYPE".
std::string FigureText(const std::string& name, const char* type, const char* help, const std::string& lines);
std::string FigureText(const std::string& name, const char* type, const char* help, double value);

// A number as the text form has it.
std::string FigureNumber(double value);

}  // namespace appliance

#endif
