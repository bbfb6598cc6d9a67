#include "appliance/vornd/server.h"

#include <signal.h>
#include <sys/socket.h>
#include <unistd.h>

#include <cerrno>
#include <cstring>
#include <utility>
#include <vector>

#include "appliance/base/log.h"
#include "appliance/base/paths.h"
#include "appliance/vornd/authenticator.h"
#include "appliance/web/limits.h"
#include "appliance/web/notify.h"

namespace appliance {
namespace {

using Protocol = boost::asio::local::stream_protocol;
using Error = boost::system::error_code;

constexpr std::chrono::milliseconds kPauseWithoutDescriptors{100};
constexpr std::chrono::milliseconds kDrainPause{20};

// For a connection that can't be taken on; what does not fit into the socket at once is lost.
void Refuse(const FileDescriptor& descriptor, ServerCode code) {
    const Reply reply = ErrorReply(code);
    const std::string text = "HTTP/1.1 " + std::to_string(reply.status) +
                             " Service Unavailable\r\nContent-Type: application/json\r\nConnection: close\r\n"
                             "Content-Length: " +
                             std::to_string(reply.body.size()) + "\r\n\r\n" + reply.body;
    [[maybe_unused]] const ssize_t sent = send(descriptor.get(), text.data(), text.size(), MSG_DONTWAIT | MSG_NOSIGNAL);
}

}  // namespace

Server::Server(FileDescriptor listener, std::string path, const Router& router, std::optional<uid_t> door,
               std::chrono::seconds patience)
    : sessions_(Path(kSessions), SessionClock::OfTheMachine()),
      sessionRoutes_(sessions_, SessionClock::OfTheMachine(), Authenticate),
      gate_({router, sessions_, sessionRoutes_, metrics_, [this] { return ReadGauges(); }}),
      services_{loop_, gate_, lanes_, metrics_, [this](Connection& connection) { connections_.erase(&connection); }},
      listener_(loop_, Protocol(), listener.Release()),
      path_(std::move(path)),
      door_(door),
      patience_(patience),
      signals_(loop_, SIGTERM, SIGINT, SIGHUP),
      pause_(loop_),
      beat_(loop_),
      drainLimit_(loop_) {}

bool Server::Run() {
    const WithoutWaitForLog events;
    WaitForConnections();
    WaitForSignal();
    Beat();
    Notify("READY=1");
    loop_.run();
    sessions_.Save();
    return !leftBehind_;
}

void Server::WaitForConnections() {
    listener_.async_wait(Protocol::acceptor::wait_read, [this](Error error) {
        if (!error && !draining_) {
            TakeConnections();
        }
    });
}

void Server::TakeConnections() {
    for (;;) {
        // Not the library's accept, which leaves the descriptor open for every program that a module runs.
        FileDescriptor descriptor(accept4(listener_.native_handle(), nullptr, nullptr, SOCK_CLOEXEC | SOCK_NONBLOCK));
        if (descriptor) {
            Take(std::move(descriptor));
        } else if (errno == EAGAIN) {
            WaitForConnections();
            return;
        } else if (errno != EINTR && errno != ECONNABORTED) {
            Log(LOG_ERR, std::string("no connection can be taken: ") + std::strerror(errno));
            pause_.expires_after(kPauseWithoutDescriptors);
            pause_.async_wait([this](Error error) {
                if (!error && !draining_) {
                    WaitForConnections();
                }
            });
            return;
        }
    }
}

void Server::Take(FileDescriptor descriptor) {
    const std::optional<Peer> peer = PeerOf(descriptor.get());
    if (!peer) {
        return;
    }
    const Access access = AccessOf(*peer, door_);
    if (!MakeRoom(access)) {
        Refuse(descriptor, ServerCode::TooManyConnections);
        return;
    }
    Error error;
    Connection::Socket socket(loop_);
    socket.assign(Protocol(), descriptor.get(), error);
    if (error) {
        return;
    }
    descriptor.Release();
    const auto connection = std::make_shared<Connection>(std::move(socket), access, services_);
    connections_.emplace(connection.get(), connection);
    connection->Start();
}

// The oldest idle connection goes, of those with the least rights first. None pushes out one that has more rights than
// itself; one without any goes even while it is served. The door never has them all: whoever holds it can't keep the
// administrator out.
bool Server::MakeRoom(Access newcomer) {
    std::size_t doors = 0;
    for (const auto& [connection, owner] : connections_) {
        if (connection->access() == Access::Door) {
            ++doors;
        }
    }
    const bool tooManyDoors = newcomer == Access::Door && doors >= kDoorConnections;
    if (connections_.size() < kConnections && !tooManyDoors) {
        return true;
    }
    Connection* oldest = nullptr;
    const auto goesBefore = [](const Connection& first, const Connection& second) {
        return std::make_pair(first.access(), first.idleSince()) < std::make_pair(second.access(), second.idleSince());
    };
    for (const auto& [connection, owner] : connections_) {
        const Access access = connection->access();
        const bool mayGo = tooManyDoors ? access == Access::Door : access <= newcomer;
        const bool isFree = connection->IsIdle() || (access == Access::None && newcomer != Access::None);
        if (mayGo && isFree && (oldest == nullptr || goesBefore(*connection, *oldest))) {
            oldest = connection;
        }
    }
    if (oldest == nullptr) {
        return false;
    }
    oldest->Close();
    return true;
}

Metrics::Gauges Server::ReadGauges() {
    const WorkerPool& calls = lanes_[Lane::Calls];
    const WorkerPool& logIns = lanes_[Lane::LogIns];
    return {calls.Running(),  calls.Waiting(),     logIns.Running(),
            logIns.Waiting(), connections_.size(), sessions_.Count()};
}

void Server::WaitForSignal() {
    signals_.async_wait([this](Error error, int signal) {
        if (error) {
            return;
        }
        if (!draining_) {
            Log(LOG_NOTICE,
                "ending on signal " + std::to_string(signal) + "; " + std::to_string(lanes_.Running()) + " calls run");
            Drain();
        } else {
            Log(LOG_NOTICE, "waiting for " + std::to_string(lanes_.Running()) + " calls");
        }
        WaitForSignal();
    });
}

void Server::Drain() {
    draining_ = true;
    Notify("STOPPING=1");
    // Nobody else listens on this path as long as this process holds the lock.
    unlink(path_.c_str());
    Error ignored;
    listener_.close(ignored);
    pause_.cancel();
    lanes_.Drain();
    std::vector<std::shared_ptr<Connection>> connections;
    for (const auto& [connection, owner] : connections_) {
        connections.push_back(owner);
    }
    for (const std::shared_ptr<Connection>& connection : connections) {
        connection->Drain();
    }
    drainLimit_.expires_after(patience_);
    drainLimit_.async_wait([this](Error error) {
        if (!error) {
            Log(LOG_ERR, std::to_string(lanes_.Running()) + " calls did not end and are left behind");
            leftBehind_ = true;
            loop_.stop();
        }
    });
    FinishWhenDone();
}

// Ends the loop once the last connection has gone: an answer is out before its connection goes.
void Server::FinishWhenDone() {
    pause_.expires_after(kDrainPause);
    pause_.async_wait([this](Error error) {
        if (error) {
            return;
        }
        if (connections_.empty() && lanes_.Running() == 0) {
            loop_.stop();
        } else {
            FinishWhenDone();
        }
    });
}

void Server::Beat() {
    const std::chrono::microseconds interval = WatchdogInterval();
    if (interval.count() == 0) {
        return;
    }
    beat_.expires_after(interval);
    beat_.async_wait([this](Error error) {
        if (!error) {
            Notify(kWatchdogBeat);
            Beat();
        }
    });
}

}  // namespace appliance
