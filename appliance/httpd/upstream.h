// The connections to vornd.

#ifndef VORN_APPLIANCE_HTTPD_UPSTREAM_H
#define VORN_APPLIANCE_HTTPD_UPSTREAM_H

#include <boost/asio/io_context.hpp>
#include <chrono>
#include <cstddef>
#include <memory>
#include <string>
#include <unordered_map>
#include <vector>

#include "appliance/httpd/backend.h"
#include "appliance/httpd/door_limits.h"
#include "appliance/httpd/door_metrics.h"
#include "appliance/httpd/upstream_exchange.h"

namespace appliance {

// Keeps up to kUpstreamIdle connections open, looks at each before it is used again, and sends nothing twice that may have
// been delivered.
class Upstream : public Backend, private UpstreamExchange::Owner {
public:
    // `socket` is the path of vornd's socket. The other arguments outlive this.
    Upstream(boost::asio::io_context& loop, std::string socket, const DoorLimits& limits, DoorMetrics& metrics);
    ~Upstream() override;
    Upstream(const Upstream&) = delete;
    Upstream& operator=(const Upstream&) = delete;

    void Ask(BackendRequest request, Handler handler) override;
    // To be called every kTick.
    void Tick();
    std::size_t Running() const {
        return exchanges_.size();
    }
    bool IsIdle() const {
        return exchanges_.empty() && idle_.empty();
    }
    void CloseIdle() {
        idle_.clear();
    }

private:
    using Socket = UpstreamExchange::Socket;
    using Clock = UpstreamExchange::Clock;
    struct Idle {
        std::unique_ptr<Socket> socket;
        Clock::time_point since;
    };

    std::unique_ptr<Socket> Connect(bool& reused) override;
    bool KeepBytes(std::size_t count) override;
    std::shared_ptr<void> HandOverBytes(std::size_t count) override;
    void ReleaseBytes(std::size_t count) override;
    void Ended(UpstreamExchange& exchange, std::unique_ptr<Socket> socket, BackendReply reply) override;

    boost::asio::io_context& loop_;
    const std::string path_;
    const DoorLimits& limits_;
    DoorMetrics& metrics_;
    const std::shared_ptr<std::size_t> kept_ = std::make_shared<std::size_t>(0);  // bytes of answers in memory
    std::vector<Idle> idle_;
    std::unordered_map<UpstreamExchange*, std::shared_ptr<UpstreamExchange>> exchanges_;
};

}  // namespace appliance

#endif
