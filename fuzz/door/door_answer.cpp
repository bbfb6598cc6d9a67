// vornd's bytes through the door's side of the connection to it.

#include <sys/socket.h>
#include <sys/un.h>
#include <unistd.h>

#include <algorithm>
#include <array>
#include <boost/asio/io_context.hpp>
#include <cstring>
#include <optional>
#include <string>

#include "appliance/base/file.h"
#include "appliance/httpd/upstream.h"
#include "fuzz/door/door.h"

namespace fuzz {
namespace {

using appliance::BackendReply;

constexpr std::size_t kMostRounds = 100000;

void Expect(bool rule, const std::string& text) {
    if (!rule) {
        throw DoorRuleBroken(text);
    }
}

// The place that vornd listens at, for all runs of this process.
class Place {
public:
    Place() {
        std::string folder = "/tmp/fuzz-door.XXXXXX";
        Expect(mkdtemp(folder.data()) != nullptr, "no temporary folder");
        folder_ = folder;
        sockaddr_un address{};
        address.sun_family = AF_UNIX;
        const std::string name = path();
        std::memcpy(address.sun_path, name.data(), name.size());
        listener_.Reset(socket(AF_UNIX, SOCK_STREAM | SOCK_NONBLOCK | SOCK_CLOEXEC, 0));
        Expect(bind(listener_.get(), static_cast<const sockaddr*>(static_cast<const void*>(&address)),
                    sizeof address) == 0 &&
                   listen(listener_.get(), 8) == 0,
               "no socket");
    }
    ~Place() {
        unlink(path().c_str());
        rmdir(folder_.c_str());
    }
    Place(const Place&) = delete;
    Place& operator=(const Place&) = delete;

    std::string path() const {
        return folder_ + "/vornd.sock";
    }
    appliance::FileDescriptor Take() const {
        return appliance::FileDescriptor(accept4(listener_.get(), nullptr, nullptr, SOCK_CLOEXEC | SOCK_NONBLOCK));
    }

private:
    std::string folder_;
    appliance::FileDescriptor listener_;
};

bool IsOf(const std::string& text, const char* letters) {
    return text.find_first_not_of(letters) == std::string::npos;
}

void CheckReply(const BackendReply& reply) {
    if (reply.outcome != BackendReply::Outcome::Answered) {
        Expect(reply.body.empty(), "a body of no answer");
        return;
    }
    Expect(reply.status >= 200 && reply.status <= 599, "status " + std::to_string(reply.status));
    Expect(reply.body.size() <= appliance::kAnswerSize, "a large answer");
    Expect(IsOf(reply.retryAfter, "0123456789"), "Retry-After " + reply.retryAfter);
    Expect(IsOf(reply.allow, "ABCDEFGHIJKLMNOPQRSTUVWXYZ0123456789, ") && reply.allow.size() <= 64,
           "Allow " + reply.allow);
}

}  // namespace

void RunDoorAnswer(const std::uint8_t* data, std::size_t size) {
    static const Place place;
    if (size == 0) {
        return;
    }
    constexpr std::array<std::size_t, 8> kPieces{1 << 20, 1, 2, 3, 7, 64, 1000, 8192};
    const std::size_t piece = std::max(kPieces[data[0] % kPieces.size()], size / 300);
    std::string bytes(data + 1, data + size);
    boost::asio::io_context loop(1);
    const appliance::DoorLimits limits;
    appliance::DoorMetrics metrics;
    int answers = 0;
    {
        appliance::Upstream upstream(loop, place.path(), limits, metrics);
        appliance::BackendRequest request;
        request.verb = "POST";
        request.target = "/webapi/A/1/b";
        request.session = "token";
        request.body = "{}";
        request.limit = limits.upstreamCall;
        upstream.Ask(request, [&answers](const BackendReply& reply) {
            ++answers;
            CheckReply(reply);
        });
        appliance::FileDescriptor server = place.Take();
        Expect(static_cast<bool>(server), "nobody calls");
        std::size_t rounds = 0;
        while (answers == 0) {
            Expect(++rounds < kMostRounds, "there is no end");
            if (!bytes.empty()) {
                const ssize_t sent = send(server.get(), bytes.data(), std::min(piece, bytes.size()), MSG_NOSIGNAL);
                bytes.erase(0, sent > 0 ? static_cast<std::size_t>(sent) : 0);
            } else {
                server.Reset();
            }
            loop.restart();
            loop.poll();
        }
        loop.restart();
        loop.poll();
        Expect(answers == 1, "answered twice");
        Expect(upstream.Running() == 0, "it still runs");
        Expect(!place.Take(), "a call was made twice");
    }
}

}  // namespace fuzz
