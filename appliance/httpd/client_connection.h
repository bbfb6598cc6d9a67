// One connection of a client: what comes in must be a request that leaves no doubt, and come in time.

#ifndef VORN_APPLIANCE_HTTPD_CLIENT_CONNECTION_H
#define VORN_APPLIANCE_HTTPD_CLIENT_CONNECTION_H

#include <boost/asio/io_context.hpp>
#include <boost/beast/http/parser.hpp>
#include <boost/beast/http/string_body.hpp>
#include <chrono>
#include <cstddef>
#include <functional>
#include <memory>
#include <optional>
#include <string>
#include <string_view>

#include "appliance/httpd/access_log.h"
#include "appliance/httpd/client_request.h"
#include "appliance/httpd/client_stream.h"
#include "appliance/httpd/door_limits.h"
#include "appliance/httpd/door_metrics.h"
#include "appliance/httpd/door_reply.h"
#include "appliance/httpd/site.h"

namespace appliance {

class ClientConnection : public std::enable_shared_from_this<ClientConnection> {
public:
    using Clock = std::chrono::steady_clock;

    // What a connection needs of its server; outlives it.
    struct Services {
        boost::asio::io_context& loop;
        Site& site;
        DoorMetrics& metrics;
        const DoorLimits& limits;
        bool strictTransport;                                 // browsers may insist on https:// from now on
        std::function<void(const AccessLine&)> log;           // called for each answer
        std::function<void(const ClientConnection&)> closed;  // called once, at its end
    };

    ClientConnection(std::unique_ptr<ClientStream> stream, ClientAddress client, const Services& services);
    ~ClientConnection();
    ClientConnection(const ClientConnection&) = delete;
    ClientConnection& operator=(const ClientConnection&) = delete;

    void Start();
    // To be called every kTick: ends what took too long.
    void Tick(Clock::time_point now);

    // Whether the connection may be closed for a newcomer: 2 when nothing is lost by it, 1 when it is a request whose
    // client takes its time, 0 when it may not. `since` tells how long it has been so.
    int Dispensable(Clock::time_point now) const;
    Clock::time_point since() const {
        return since_;
    }

    // Closes at once.
    void Close();
    // The server ends: an idle connection is closed, a request on its way is refused, and one that runs is answered as
    // the last one.
    void Drain();

private:
    enum class State { Handshaking, Idle, Header, Continuing, Body, Calling, Answering, Lingering, Closed };
    using Parser = boost::beast::http::request_parser<boost::beast::http::string_body>;
    using Error = boost::system::error_code;

    void Drive();
    bool Step();
    bool StepHandshake();
    bool StepIdle();
    bool StepHeader();
    bool StepContinue();
    bool StepBody();
    bool StepAnswer();
    bool StepLinger();
    bool Read();
    void TakeHeader(std::size_t length);
    void RefuseBody(Error error);
    void Dispatch();
    void Answer(DoorReply reply, bool keepOpen);
    void Refuse(ServerCode code);
    void OnAnswered();
    void WriteLog();
    void Enter(State state, std::chrono::milliseconds limit);
    void BecomeIdle();
    void Linger();
    void WaitFor(ClientStream::Result::Kind what);
    bool WaitOrClose(ClientStream::Result::Kind what);
    void Consume(std::size_t count);

    const std::unique_ptr<ClientStream> stream_;
    const ClientAddress client_;
    const Services& services_;
    State state_ = State::Handshaking;
    bool driving_ = false;
    bool waitsForRead_ = false;
    bool waitsForWrite_ = false;
    bool readable_ = false;  // something has come since the connection became idle
    bool draining_ = false;
    Clock::time_point since_;  // when the state was entered; with a request, when it began
    Clock::time_point deadline_;

    // The request. What has come and is not yet understood, which may be the begin of the next one.
    std::string input_;
    std::size_t scanned_ = 0;
    std::optional<Parser> parser_;
    ClientRequest request_;
    std::string verb_;
    std::string target_;
    bool keepOpen_ = false;
    bool oldVersion_ = false;
    Clock::time_point complete_;

    // The answer.
    DoorReply reply_;
    std::string output_;        // its header, and a small content
    std::string_view content_;  // a large one
    std::size_t written_ = 0;
    std::size_t headerSize_ = 0;
    std::chrono::microseconds took_{0};
    Clock::time_point answerEnd_;
};

}  // namespace appliance

#endif
