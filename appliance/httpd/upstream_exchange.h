// One request to vornd and its answer, on a connection that it borrows from the pool.

#ifndef VORN_APPLIANCE_HTTPD_UPSTREAM_EXCHANGE_H
#define VORN_APPLIANCE_HTTPD_UPSTREAM_EXCHANGE_H

#include <boost/asio/io_context.hpp>
#include <boost/asio/posix/stream_descriptor.hpp>
#include <boost/beast/http/parser.hpp>
#include <boost/beast/http/string_body.hpp>
#include <chrono>
#include <cstddef>
#include <memory>
#include <optional>
#include <string>

#include "appliance/httpd/backend.h"

namespace appliance {

class UpstreamExchange : public std::enable_shared_from_this<UpstreamExchange> {
public:
    using Socket = boost::asio::posix::stream_descriptor;
    using Clock = std::chrono::steady_clock;

    // The pool, as an exchange sees it; outlives it.
    class Owner {
    public:
        // A connection: a new one, or one used before when `reused` is true, which then tells which it is. Null with
        // errno when there is none; EAGAIN says to try again in a moment.
        virtual std::unique_ptr<Socket> Connect(bool& reused) = 0;
        // False when no more bytes of answers can be kept. ReleaseBytes gives them back.
        virtual bool KeepBytes(std::size_t count) = 0;
        virtual std::shared_ptr<void> HandOverBytes(std::size_t count) = 0;
        virtual void ReleaseBytes(std::size_t count) = 0;
        // The end; called once. `socket` is one that can be used again, or null.
        virtual void Ended(UpstreamExchange& exchange, std::unique_ptr<Socket> socket, BackendReply reply) = 0;

    protected:
        ~Owner() = default;
    };

    UpstreamExchange(Owner& owner, const BackendRequest& request, Backend::Handler handler,
                     std::chrono::milliseconds connectLimit);
    ~UpstreamExchange();
    UpstreamExchange(const UpstreamExchange&) = delete;
    UpstreamExchange& operator=(const UpstreamExchange&) = delete;

    void Start();
    // The pool ends: nothing is told to it any more.
    void Abandon();
    // Ends what took too long, and tries again to connect.
    void Tick(Clock::time_point now);
    Backend::Handler TakeHandler() {
        return std::move(handler_);
    }

private:
    enum class State { Connecting, Sending, Receiving, Ended };
    using Body = boost::beast::http::string_body;

    void Connect(bool mayReuse);
    void Send();
    void Receive();
    bool Parse(const char* bytes, std::size_t size);
    void Finish();
    void Lost();
    void End(std::unique_ptr<Socket> socket, BackendReply reply);
    void WaitFor(Socket::wait_type what);
    bool TakeFields(BackendReply& reply) const;

    Owner& owner_;
    Backend::Handler handler_;
    State state_ = State::Connecting;
    const bool isRepeatable_;  // asks and changes nothing
    const Clock::time_point connectEnd_;
    const Clock::time_point end_;
    std::unique_ptr<Socket> socket_;
    bool mayReuse_ = true;
    bool isReused_ = false;
    std::string text_;  // of the request
    std::size_t sent_ = 0;
    std::string unread_;  // of the answer: behind what the parser has taken
    std::size_t kept_ = 0;
    std::optional<boost::beast::http::response_parser<Body>> parser_;
};

}  // namespace appliance

#endif
