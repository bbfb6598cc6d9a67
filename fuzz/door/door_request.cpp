// A client's bytes through the door's connection, with a backend that answers everything.

#include <poll.h>
#include <sys/socket.h>

#include <algorithm>
#include <array>
#include <boost/asio/io_context.hpp>
#include <boost/asio/post.hpp>
#include <memory>
#include <string>
#include <string_view>
#include <utility>
#include <vector>

#include "appliance/httpd/client_connection.h"
#include "appliance/httpd/header_rules.h"
#include "fuzz/door/door.h"
#include "fuzz/door/framing_model.h"

namespace fuzz {
namespace {

using appliance::BackendReply;
using appliance::BackendRequest;

constexpr std::size_t kMostRounds = 100000;

void Expect(bool rule, const std::string& text) {
    if (!rule) {
        throw DoorRuleBroken(text);
    }
}

class AnyAnswer : public appliance::Backend {
public:
    explicit AnyAnswer(boost::asio::io_context& loop) : loop_(loop) {}

    void Ask(BackendRequest request, Handler handler) override {
        asked.push_back(request);
        BackendReply reply;
        reply.outcome = BackendReply::Outcome::Answered;
        reply.isJson = true;
        reply.status = 200;
        reply.body = R"({"success": true, "data": {"session": "token"}})";
        boost::asio::post(loop_, [handler = std::move(handler), reply] { handler(reply); });
    }
    std::vector<BackendRequest> asked;

private:
    boost::asio::io_context& loop_;
};

// One client and one connection of the door.
class Exchange {
public:
    Exchange() : site_(page_, backend_, limits_, [] { return std::string("figures\n"); }) {
        std::array<int, 2> sockets{};
        Expect(socketpair(AF_UNIX, SOCK_STREAM | SOCK_NONBLOCK | SOCK_CLOEXEC, 0, sockets.data()) == 0, "no sockets");
        client_.Reset(sockets[0]);
        auto stream = std::make_unique<appliance::ClientStream>(loop_, appliance::FileDescriptor(sockets[1]));
        connection_ = std::make_shared<appliance::ClientConnection>(
            std::move(stream), appliance::ClientAddress{"10.0.0.5", false}, services_);
    }

    void Run(std::string_view bytes, std::size_t piece) {
        connection_->Start();
        for (std::size_t round = 0; !closed_; ++round) {
            Expect(round < kMostRounds, "the connection does not end");
            if (!bytes.empty()) {
                const ssize_t sent = send(client_.get(), bytes.data(), std::min(piece, bytes.size()), MSG_NOSIGNAL);
                bytes.remove_prefix(sent > 0                     ? static_cast<std::size_t>(sent)
                                    : sent < 0 && errno == EPIPE ? bytes.size()
                                                                 : 0);
            } else {
                shutdown(client_.get(), SHUT_WR);
            }
            loop_.restart();
            loop_.poll();
            Receive();
        }
        Receive();
    }

    std::string received;
    std::vector<std::string> lines;

    const std::vector<BackendRequest>& asked() const {
        return backend_.asked;
    }

private:
    void Receive() {
        std::array<char, 65536> bytes;
        for (;;) {
            const ssize_t got = recv(client_.get(), bytes.data(), bytes.size(), 0);
            if (got <= 0) {
                return;
            }
            received.append(bytes.data(), static_cast<std::size_t>(got));
        }
    }

    boost::asio::io_context loop_{1};
    appliance::DoorLimits limits_;
    appliance::DoorMetrics metrics_;
    AnyAnswer backend_{loop_};
    const appliance::Page page_{"/nonexistent"};
    appliance::Site site_;
    bool closed_ = false;
    const appliance::ClientConnection::Services services_{
        loop_,
        site_,
        metrics_,
        limits_,
        false,
        [this](const appliance::AccessLine& line) { lines.push_back(appliance::FormatAccess(line)); },
        [this](const appliance::ClientConnection&) { closed_ = true; }};
    appliance::FileDescriptor client_;
    std::shared_ptr<appliance::ClientConnection> connection_;
};

// The status of each answer; they must follow each other without a byte between, and nothing behind the last.
std::vector<int> StatusesOf(std::string_view received) {
    std::vector<int> statuses;
    bool ended = false;
    while (!received.empty()) {
        Expect(!ended, "an answer behind the last one");
        const std::size_t end = received.find("\r\n\r\n");
        Expect(received.substr(0, 9) == "HTTP/1.1 " && end != std::string_view::npos,
               "no answer: " + std::string(received));
        const std::string_view header = received.substr(0, end + 2);
        const int status = std::stoi(std::string(header.substr(9, 3)));
        received.remove_prefix(end + 4);
        if (status == 100) {
            continue;
        }
        statuses.push_back(status);
        ended = header.find("\r\nConnection: close\r\n") != std::string_view::npos;
        constexpr std::string_view kLength = "\r\nContent-Length: ";
        const std::size_t length = header.find(kLength);
        Expect(length != std::string_view::npos, "an answer without a length");
        Expect(header.find("\r\nContent-Security-Policy: ") != std::string_view::npos, "an answer without a policy");
        const std::size_t size = std::stoul(std::string(header.substr(length + kLength.size(), 12)));
        // Answers to HEAD have none; whose answer this is can't be told here.
        if (received.size() >= size && (received.substr(0, 9) != "HTTP/1.1 " || size == 0)) {
            received.remove_prefix(size);
        }
    }
    return statuses;
}

void CheckPassedOn(const BackendRequest& request) {
    Expect(request.verb == "GET" || request.verb == "POST", "passed on the verb " + request.verb);
    Expect(!request.target.empty() && request.target.front() == '/' && request.target.size() < 400 &&
               std::all_of(request.target.begin(), request.target.end(),
                           [](char letter) {
                               return letter > ' ' && letter < '\x7F' && letter != '?' && letter != '#' &&
                                      letter != '%';
                           }),
           "passed on the target " + request.target);
    Expect(request.session.empty() || appliance::IsToken(request.session), "passed on the session " + request.session);
    Expect(request.csrf.empty() || appliance::IsToken(request.csrf), "passed on the token " + request.csrf);
    const bool isOwn = request.background && request.session.empty();  // the door's own question
    Expect(request.client == (isOwn && request.verb == "GET" ? "" : "10.0.0.5"),
           "passed on the client " + request.client);
    Expect(request.body.size() <= appliance::kBodyLimit, "passed on a large body");
    const bool needsNone = request.target == "/session/login" || request.target == "/session/link" ||
                           (isOwn && (request.target == "/session" || request.target == "/metrics"));
    Expect(needsNone || !request.session.empty(), "passed on a call without a session");
}

}  // namespace

void RunDoorRequest(const std::uint8_t* data, std::size_t size) {
    if (size == 0) {
        return;
    }
    constexpr std::array<std::size_t, 8> kPieces{1 << 20, 1, 2, 3, 7, 64, 1000, 8192};
    const std::string bytes(data + 1, data + size);
    Exchange exchange;
    exchange.Run(bytes, std::max(kPieces[data[0] % kPieces.size()], size / 300));
    const std::vector<int> statuses = StatusesOf(exchange.received);
    for (const BackendRequest& request : exchange.asked()) {
        CheckPassedOn(request);
    }
    const auto calls = std::count_if(exchange.asked().begin(), exchange.asked().end(),
                                     [](const BackendRequest& request) { return request.verb == "POST"; });
    Expect(static_cast<std::size_t>(calls) <= statuses.size(), "more is called than answered");
    const std::vector<std::string> bodies = BodiesOf(bytes);
    // One more is the refusal of what is no request.
    Expect(statuses.size() <= bodies.size() + 1,
           std::to_string(statuses.size()) + " answers to " + std::to_string(bodies.size()) + " requests");
    auto next = bodies.begin();
    for (const BackendRequest& request : exchange.asked()) {
        if (request.verb == "POST") {
            next = std::find(next, bodies.end(), request.body);
            Expect(next != bodies.end(), "passed on a body that is none");
            ++next;
        }
    }
    for (const std::string& line : exchange.lines) {
        Expect(line.size() < 1200 &&
                   std::all_of(line.begin(), line.end(), [](char letter) { return letter >= ' ' && letter < '\x7F'; }),
               "logged " + line);
    }
}

}  // namespace fuzz
