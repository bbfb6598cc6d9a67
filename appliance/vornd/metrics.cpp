#include "appliance/vornd/metrics.h"

#include <array>
#include <cmath>
#include <cstdio>

namespace appliance {
namespace {

// Modules choose their codes; what is beyond this many counts is counted without its code.
constexpr std::size_t kMostCounts = 2000;
constexpr int kOtherCode = -1;

std::string Labels(const std::pair<std::string, std::string>& method) {
    return "api=\"" + method.first + "\",method=\"" + method.second + "\"";
}

}  // namespace

std::string FigureNumber(double value) {
    std::array<char, 40> text{};
    const bool isWhole = value == std::floor(value) && std::fabs(value) < 1e15;
    const int size = std::snprintf(text.data(), text.size(), isWhole ? "%.0f" : "%.10g", value);
    return {text.data(), static_cast<std::size_t>(size)};
}

std::string FigureText(const std::string& name, const char* type, const char* help, const std::string& lines) {
    return lines.empty() ? lines : "# HELP " + name + " " + help + "\n# TYPE " + name + " " + type + "\n" + lines;
}

std::string FigureText(const std::string& name, const char* type, const char* help, double value) {
    return FigureText(name, type, help, name + " " + FigureNumber(value) + "\n");
}

void Metrics::Count(const Reply& reply, std::chrono::microseconds took) {
    const Method method(reply.api, reply.method);
    std::pair<Method, int> key(method, reply.code);
    if (requests_.size() >= kMostCounts && requests_.count(key) == 0) {
        key.second = kOtherCode;
    }
    ++requests_[key];
    if (method.first.empty()) {
        return;
    }
    Histogram& times = times_[method];
    const double seconds = std::chrono::duration<double>(took).count();
    for (std::size_t index = 0; index < kBounds.size(); ++index) {
        if (seconds <= kBounds[index]) {
            ++times.upTo[index];
        }
    }
    ++times.count;
    times.sum += seconds;
}

std::string Metrics::Render(const Gauges& gauges) const {
    std::string requests;
    for (const auto& [key, count] : requests_) {
        const std::string code = key.second == kOtherCode ? "other" : std::to_string(key.second);
        requests +=
            "vorn_requests_total{" + Labels(key.first) + ",code=\"" + code + "\"} " + std::to_string(count) + "\n";
    }
    std::string times;
    for (const auto& [method, histogram] : times_) {
        const std::string labels = Labels(method);
        for (std::size_t index = 0; index < kBounds.size(); ++index) {
            times += "vorn_request_seconds_bucket{" + labels + ",le=\"" + FigureNumber(kBounds[index]) + "\"} " +
                     std::to_string(histogram.upTo[index]) + "\n";
        }
        times += "vorn_request_seconds_bucket{" + labels + ",le=\"+Inf\"} " + std::to_string(histogram.count) + "\n" +
                 "vorn_request_seconds_sum{" + labels + "} " + FigureNumber(histogram.sum) + "\n" +
                 "vorn_request_seconds_count{" + labels + "} " + std::to_string(histogram.count) + "\n";
    }
    const auto gauge = [](const char* name, const char* help, std::size_t value) {
        return FigureText(name, "gauge", help, static_cast<double>(value));
    };
    return FigureText("vorn_requests_total", "counter",
                      "Requests by API, method and code of the answer; 0 is success, without a method: refused before.",
                      requests) +
           FigureText("vorn_request_seconds", "histogram", "From a request's last byte to its answer.", times) +
           gauge("vorn_calls_running", "Calls that run.", gauges.runningCalls) +
           gauge("vorn_calls_waiting", "Calls that wait for a thread.", gauges.waitingCalls) +
           gauge("vorn_log_ins_running", "Passwords that are being checked.", gauges.runningLogIns) +
           gauge("vorn_log_ins_waiting", "Log-ins that wait for their check.", gauges.waitingLogIns) +
           gauge("vorn_connections", "Connections that are open.", gauges.connections) +
           gauge("vorn_sessions", "Sessions of administrators who have logged in.", gauges.sessions);
}

}  // namespace appliance
