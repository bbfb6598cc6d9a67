// One connection of a client. Lives on the server's thread; the calls that it brings run on those of the pool.

#ifndef VORN_APPLIANCE_VORND_CONNECTION_H
#define VORN_APPLIANCE_VORND_CONNECTION_H

#include <boost/asio/io_context.hpp>
#include <boost/asio/local/stream_protocol.hpp>
#include <boost/asio/steady_timer.hpp>
#include <boost/beast/core/flat_buffer.hpp>
#include <boost/beast/http/message.hpp>
#include <boost/beast/http/parser.hpp>
#include <boost/beast/http/string_body.hpp>
#include <chrono>
#include <cstddef>
#include <functional>
#include <memory>
#include <optional>
#include <string_view>

#include "appliance/vornd/access.h"
#include "appliance/vornd/gate.h"
#include "appliance/vornd/lanes.h"

namespace appliance {

class Connection : public std::enable_shared_from_this<Connection> {
public:
    using Socket = boost::asio::local::stream_protocol::socket;

    // What a connection needs of its server; outlives it.
    struct Services {
        boost::asio::io_context& loop;
        Gate& gate;
        Lanes& lanes;
        Metrics& metrics;
        std::function<void(Connection&)> closed;  // called once, at its end
    };

    Connection(Socket socket, Access access, const Services& services);

    void Start();

    // Between two requests, or before the first one: it may be closed with nothing lost.
    bool IsIdle() const {
        return state_ == State::Idle || state_ == State::Lingering;
    }
    std::chrono::steady_clock::time_point idleSince() const {
        return idleSince_;
    }
    Access access() const {
        return access_;
    }

    // Closes at once.
    void Close();

    // The server ends: an idle connection is closed, a request on its way is refused, and a call that runs is answered
    // as the last one.
    void Drain();

private:
    enum class State { Idle, Reading, Calling, Answering, Lingering, Closed };
    using Error = boost::system::error_code;
    using Body = boost::beast::http::string_body;

    void WaitForRequest();
    void ReadHeader();
    void OnHeader(Error error, std::size_t size);
    void ReadBody();
    void OnRequest(Error error);
    void OnReadError(Error error);
    void Dispatch(Work work);
    void Finish(const Work& work, Reply reply, bool keepOpen);
    void Answer(Reply reply, bool keepOpen);
    void Send(Reply reply);
    void OnAnswered(Error error);
    void Linger();
    void LimitTime(std::chrono::milliseconds limit);
    void OnTimeOut();
    void WipeRequest();

    Socket socket_;
    const Access access_;
    const Services& services_;
    State state_ = State::Idle;
    bool draining_ = false;
    bool keepOpen_ = false;
    std::chrono::steady_clock::time_point idleSince_;
    std::chrono::steady_clock::time_point complete_;  // when the present request was
    boost::asio::steady_timer timer_;
    boost::beast::flat_buffer buffer_;
    std::optional<boost::beast::http::request_parser<Body>> parser_;
    std::optional<boost::beast::http::response<Body>> response_;
    WebRequest request_;
    bool answerIsSecret_ = false;
};

}  // namespace appliance

#endif
