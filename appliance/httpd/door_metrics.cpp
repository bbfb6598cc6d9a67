#include "appliance/httpd/door_metrics.h"

#include <algorithm>
#include <cstdio>

namespace appliance {
namespace {

constexpr std::array<std::string_view, 4> kVerbNames{"GET", "HEAD", "POST", "other"};
constexpr std::array<std::string_view, 4> kClassNames{"2xx", "3xx", "4xx", "5xx"};

struct Bucket {
    std::chrono::microseconds limit;
    std::string_view name;  // in seconds
};
constexpr std::array<Bucket, DoorMetrics::kBuckets> kBucketList{{
    {std::chrono::microseconds(500), "0.0005"},
    {std::chrono::milliseconds(1), "0.001"},
    {std::chrono::microseconds(2500), "0.0025"},
    {std::chrono::milliseconds(5), "0.005"},
    {std::chrono::milliseconds(10), "0.01"},
    {std::chrono::milliseconds(50), "0.05"},
    {std::chrono::milliseconds(100), "0.1"},
    {std::chrono::milliseconds(500), "0.5"},
    {std::chrono::seconds(1), "1"},
    {std::chrono::seconds(5), "5"},
    {std::chrono::seconds(30), "30"},
    {std::chrono::seconds(300), "300"},
}};

void Describe(std::string& text, std::string_view name, std::string_view kind, std::string_view help) {
    text += "# HELP ";
    text += name;
    text += ' ';
    text += help;
    text += "\n# TYPE ";
    text += name;
    text += ' ';
    text += kind;
    text += '\n';
}

void AddSample(std::string& text, std::string_view name, std::string_view labels, std::uint64_t value) {
    text += name;
    text += labels;
    text += ' ';
    text += std::to_string(value);
    text += '\n';
}

void AddFigure(std::string& text, std::string_view name, std::string_view kind, std::string_view help,
               std::uint64_t value) {
    Describe(text, name, kind, help);
    AddSample(text, name, "", value);
}

}  // namespace

void DoorMetrics::CountRequest(std::string_view verb, int status, std::chrono::microseconds took) {
    const auto* const name = std::find(kVerbNames.begin(), kVerbNames.end() - 1, verb);
    const auto verbIndex = static_cast<std::size_t>(name - kVerbNames.begin());
    const int highest = static_cast<int>(kClasses) + 1;
    const auto classIndex = static_cast<std::size_t>(std::min(std::max(status / 100, 2), highest) - 2);
    ++requests_[verbIndex][classIndex];
    const auto* const bucket =
        std::find_if(kBucketList.begin(), kBucketList.end(), [took](const Bucket& one) { return took <= one.limit; });
    ++latencies_[static_cast<std::size_t>(bucket - kBucketList.begin())];
    latencySum_ += took;
}

std::string DoorMetrics::Text(std::size_t open, std::size_t running, std::uint64_t lostLines) const {
    std::string text;
    AddFigure(text, "vorn_httpd_connections", "gauge", "Connections of clients that are open.", open);
    AddFigure(text, "vorn_httpd_connections_total", "counter", "Connections taken on.", accepted_);
    AddFigure(text, "vorn_httpd_connections_refused_total", "counter", "Connections there was no place for.", refused_);
    AddFigure(text, "vorn_httpd_handshakes_failed_total", "counter", "TLS handshakes that failed.", handshakesFailed_);
    AddFigure(text, "vorn_httpd_received_bytes_total", "counter", "Bytes of requests.", received_);
    AddFigure(text, "vorn_httpd_sent_bytes_total", "counter", "Bytes of answers.", sent_);
    AddFigure(text, "vorn_httpd_upstream_requests", "gauge", "Requests that vornd has yet to answer.", running);
    AddFigure(text, "vorn_httpd_upstream_failures_total", "counter", "Requests that vornd did not answer.",
              upstreamFailures_);
    AddFigure(text, "vorn_httpd_log_lines_lost_total", "counter", "Lines that the logger did not take.", lostLines);
    Describe(text, "vorn_httpd_requests_total", "counter", "Requests answered, by verb and class of status.");
    std::uint64_t total = 0;
    for (std::size_t verb = 0; verb < kVerbs; ++verb) {
        for (std::size_t status = 0; status < kClasses; ++status) {
            const std::uint64_t count = requests_[verb][status];
            total += count;
            AddSample(
                text, "vorn_httpd_requests_total",
                "{verb=\"" + std::string(kVerbNames[verb]) + "\",status=\"" + std::string(kClassNames[status]) + "\"}",
                count);
        }
    }
    const std::string_view duration = "vorn_httpd_request_duration_seconds";
    Describe(text, duration, "histogram", "Time from a request's last byte to the first one of its answer.");
    std::uint64_t upTo = 0;
    for (std::size_t index = 0; index < kBuckets; ++index) {
        upTo += latencies_[index];
        AddSample(text, "vorn_httpd_request_duration_seconds_bucket",
                  "{le=\"" + std::string(kBucketList[index].name) + "\"}", upTo);
    }
    AddSample(text, "vorn_httpd_request_duration_seconds_bucket", "{le=\"+Inf\"}", total);
    char sum[64] = {};
    static_cast<void>(std::snprintf(sum, sizeof sum, "%lld.%06lld",
                                    static_cast<long long>(latencySum_.count() / 1000000),
                                    static_cast<long long>(latencySum_.count() % 1000000)));
    text += "vorn_httpd_request_duration_seconds_sum ";
    text += sum;
    text += '\n';
    AddSample(text, "vorn_httpd_request_duration_seconds_count", "", total);
    return text;
}

}  // namespace appliance
