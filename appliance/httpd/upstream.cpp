#include "appliance/httpd/upstream.h"

#include <sys/socket.h>
#include <sys/un.h>

#include <algorithm>
#include <boost/asio/post.hpp>
#include <cerrno>
#include <cstring>
#include <utility>

#include "appliance/base/file.h"

namespace appliance {
namespace {

// Nothing to read and no end: a connection on which nothing has happened since its last answer.
bool IsQuiet(int socket) {
    char byte = 0;
    return recv(socket, &byte, 1, MSG_PEEK | MSG_DONTWAIT) < 0 && errno == EAGAIN;
}

}  // namespace

Upstream::Upstream(boost::asio::io_context& loop, std::string socket, const DoorLimits& limits, DoorMetrics& metrics)
    : loop_(loop), path_(std::move(socket)), limits_(limits), metrics_(metrics) {}

Upstream::~Upstream() {
    for (const auto& [exchange, owner] : exchanges_) {
        exchange->Abandon();
    }
}

void Upstream::Ask(BackendRequest request, Handler handler) {
    if (exchanges_.size() >= kUpstreamConnections) {
        boost::asio::post(loop_, [handler = std::move(handler)] {
            BackendReply reply;
            reply.outcome = BackendReply::Outcome::Busy;
            handler(std::move(reply));
        });
        return;
    }
    const auto exchange = std::make_shared<UpstreamExchange>(static_cast<Owner&>(*this), request, std::move(handler),
                                                             limits_.upstreamConnect);
    explicit_bzero(request.body.data(), request.body.size());
    exchanges_.emplace(exchange.get(), exchange);
    exchange->Start();
}

std::unique_ptr<Upstream::Socket> Upstream::Connect(bool& reused) {
    while (reused && !idle_.empty()) {
        std::unique_ptr<Socket> socket = std::move(idle_.back().socket);
        idle_.pop_back();
        if (IsQuiet(socket->native_handle())) {
            return socket;
        }
    }
    reused = false;
    sockaddr_un address{};
    address.sun_family = AF_UNIX;
    if (path_.size() >= sizeof address.sun_path) {
        errno = ENAMETOOLONG;
        return nullptr;
    }
    std::memcpy(address.sun_path, path_.data(), path_.size());
    FileDescriptor descriptor(::socket(AF_UNIX, SOCK_STREAM | SOCK_CLOEXEC | SOCK_NONBLOCK, 0));
    if (!descriptor || connect(descriptor.get(), static_cast<const sockaddr*>(static_cast<const void*>(&address)),
                               sizeof address) != 0) {
        return nullptr;
    }
    auto socket = std::make_unique<Socket>(loop_);
    boost::system::error_code error;
    socket->assign(descriptor.get(), error);
    if (error) {
        errno = error.value() == EAGAIN ? EIO : error.value();
        return nullptr;
    }
    descriptor.Release();
    return socket;
}

bool Upstream::KeepBytes(std::size_t count) {
    if (*kept_ + count > kAnswersHeld) {
        return false;
    }
    *kept_ += count;
    return true;
}

std::shared_ptr<void> Upstream::HandOverBytes(std::size_t count) {
    // The client may outlive this pool.
    return {nullptr, [kept = kept_, count](void*) { *kept -= count; }};
}

void Upstream::ReleaseBytes(std::size_t count) {
    *kept_ -= count;
}

void Upstream::Ended(UpstreamExchange& exchange, std::unique_ptr<Socket> socket, BackendReply reply) {
    if (socket != nullptr && idle_.size() < kUpstreamIdle) {
        idle_.push_back({std::move(socket), Clock::now()});
    }
    if (reply.outcome != BackendReply::Outcome::Answered) {
        metrics_.CountUpstreamFailure();
    }
    // The caller of Ask may be at work still.
    boost::asio::post(
        loop_, [handler = exchange.TakeHandler(), reply = std::move(reply)]() mutable { handler(std::move(reply)); });
    exchanges_.erase(&exchange);
}

void Upstream::Tick() {
    const Clock::time_point now = Clock::now();
    std::vector<std::shared_ptr<UpstreamExchange>> exchanges;
    exchanges.reserve(exchanges_.size());
    for (const auto& [exchange, owner] : exchanges_) {
        exchanges.push_back(owner);
    }
    for (const std::shared_ptr<UpstreamExchange>& exchange : exchanges) {
        exchange->Tick(now);
    }
    const auto isOver = [&](const Idle& idle) {
        return now - idle.since >= limits_.upstreamIdle || !IsQuiet(idle.socket->native_handle());
    };
    idle_.erase(std::remove_if(idle_.begin(), idle_.end(), isOver), idle_.end());
}

}  // namespace appliance
