// The door's own figures, in the text form that Prometheus reads. No names of users, methods or addresses are in them.

#ifndef VORN_APPLIANCE_HTTPD_DOOR_METRICS_H
#define VORN_APPLIANCE_HTTPD_DOOR_METRICS_H

#include <array>
#include <chrono>
#include <cstddef>
#include <cstdint>
#include <string>
#include <string_view>

namespace appliance {

class DoorMetrics {
public:
    static constexpr std::size_t kBuckets = 12;

    void CountConnection() {
        ++accepted_;
    }
    // One that there was no place for.
    void CountRefusal() {
        ++refused_;
    }
    void CountHandshakeFailure() {
        ++handshakesFailed_;
    }
    void CountUpstreamFailure() {
        ++upstreamFailures_;
    }
    void CountReceived(std::size_t bytes) {
        received_ += bytes;
    }
    void CountSent(std::size_t bytes) {
        sent_ += bytes;
    }
    // An answered request: its verb and status, and the time from its last byte to the answer's first one.
    void CountRequest(std::string_view verb, int status, std::chrono::microseconds took);

    // `open` connections of clients at this moment, `running` requests at vornd; `lostLines` of the access log so far.
    std::string Text(std::size_t open, std::size_t running, std::uint64_t lostLines) const;

private:
    static constexpr std::size_t kVerbs = 4;    // GET, HEAD, POST, any other
    static constexpr std::size_t kClasses = 4;  // 2xx to 5xx

    std::uint64_t accepted_ = 0;
    std::uint64_t refused_ = 0;
    std::uint64_t handshakesFailed_ = 0;
    std::uint64_t upstreamFailures_ = 0;
    std::uint64_t received_ = 0;
    std::uint64_t sent_ = 0;
    std::array<std::array<std::uint64_t, kClasses>, kVerbs> requests_{};
    std::array<std::uint64_t, kBuckets + 1> latencies_{};  // the last one: longer than any bucket
    std::chrono::microseconds latencySum_{0};
};

}  // namespace appliance

#endif
