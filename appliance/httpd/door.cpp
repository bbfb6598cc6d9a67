#include "appliance/httpd/door.h"

#include <signal.h>
#include <sys/socket.h>

#include <cerrno>
#include <cstring>
#include <utility>

#include "appliance/base/log.h"
#include "appliance/httpd/listen_address.h"
#include "appliance/web/notify.h"

namespace appliance {
namespace {

using Error = boost::system::error_code;

constexpr std::chrono::milliseconds kPauseWithoutDescriptors{100};
constexpr int kConnectionsAtATime = 32;  // then those that are open have their turn

}  // namespace

Door::Door(Setup setup)
    : limits_(setup.limits),
      certificate_(setup.certificate),
      log_(setup.terminal),
      page_(setup.page),
      upstream_(loop_, std::move(setup.vornd), limits_, metrics_),
      site_(page_, upstream_, limits_, [this] { return Figures(); }),
      services_{loop_,
                site_,
                metrics_,
                limits_,
                certificate_ != nullptr && !certificate_->isOwn(),
                [this](const AccessLine& line) { log_.Write(line); },
                [this](const ClientConnection& connection) { connections_.erase(&connection); }},
      signals_(loop_, SIGTERM, SIGINT, SIGHUP),
      tick_(loop_),
      pause_(loop_),
      beat_(loop_),
      certificateCheck_(loop_) {
    for (FileDescriptor& listener : setup.listeners) {
        listeners_.push_back(std::make_unique<Listener>(loop_, listener.Release()));
    }
}

Door::~Door() = default;

bool Door::Run() {
    const WithoutWaitForLog events;
    for (const std::unique_ptr<Listener>& listener : listeners_) {
        WaitForConnections(*listener);
    }
    WaitForSignal();
    Beat();
    CheckCertificate();
    Notify("READY=1");
    loop_.run();
    return !leftBehind_;
}

void Door::WaitForConnections(Listener& listener) {
    listener.async_wait(Listener::wait_read, [this, &listener](Error error) {
        if (!error && !draining_) {
            TakeConnections(listener);
        }
    });
}

void Door::TakeConnections(Listener& listener) {
    for (int count = 0; count < kConnectionsAtATime; ++count) {
        sockaddr_storage address{};
        socklen_t size = sizeof address;
        FileDescriptor socket(accept4(listener.native_handle(), static_cast<sockaddr*>(static_cast<void*>(&address)),
                                      &size, SOCK_CLOEXEC | SOCK_NONBLOCK));
        if (socket) {
            Take(std::move(socket), address);
        } else if (errno == EAGAIN) {
            break;
        } else if (errno == EMFILE || errno == ENFILE || errno == ENOBUFS || errno == ENOMEM) {
            Log(LOG_ERR, std::string("no connection can be taken: ") + std::strerror(errno));
            pause_.expires_after(kPauseWithoutDescriptors);
            pause_.async_wait([this](Error /*error*/) {
                for (const std::unique_ptr<Listener>& each : listeners_) {
                    if (!draining_) {
                        WaitForConnections(*each);
                    }
                }
            });
            return;
        }
        // Anything else is the failure of the one connection.
    }
    WaitForConnections(listener);
}

void Door::Take(FileDescriptor socket, const sockaddr_storage& address) {
    if (connections_.size() >= kConnections && !MakeRoom()) {
        metrics_.CountRefusal();
        Refuse(std::move(socket));
        return;
    }
    try {
        std::unique_ptr<ClientStream> stream;
        if (certificate_ != nullptr) {
            stream = std::make_unique<TlsStream>(loop_, std::move(socket), certificate_->context());
        } else {
            stream = std::make_unique<ClientStream>(loop_, std::move(socket));
        }
        const auto connection =
            std::make_shared<ClientConnection>(std::move(stream), AddressOfClient(address), services_);
        connections_.emplace(connection.get(), connection);
        metrics_.CountConnection();
        connection->Start();
    } catch (const std::exception& error) {
        Log(LOG_ERR, std::string("a connection can't be served: ") + error.what());
    }
    ScheduleTick();
}

// The oldest idle connection goes; without one, the client that has taken longest to send its request.
bool Door::MakeRoom() {
    const Clock::time_point now = Clock::now();
    std::shared_ptr<ClientConnection> chosen;
    int best = 0;
    for (const auto& [key, connection] : connections_) {
        const int rank = connection->Dispensable(now);
        if (rank > best || (rank > 0 && rank == best && connection->since() < chosen->since())) {
            chosen = connection;
            best = rank;
        }
    }
    if (chosen == nullptr) {
        return false;
    }
    chosen->Close();
    return true;
}

// Within TLS nothing could be said without the work of a handshake.
void Door::Refuse(FileDescriptor socket) {
    if (certificate_ != nullptr) {
        return;
    }
    const DoorReply reply = DoorError(ServerCode::TooManyConnections);
    ReplyForm form;
    form.keepOpen = false;
    const std::string text = WriteHeader(reply, form) + reply.body;
    [[maybe_unused]] const ssize_t sent = send(socket.get(), text.data(), text.size(), MSG_DONTWAIT | MSG_NOSIGNAL);
}

void Door::WaitForSignal() {
    signals_.async_wait([this](Error error, int signal) {
        if (!error) {
            OnSignal(signal);
            WaitForSignal();
        }
    });
}

void Door::OnSignal(int signal) {
    if (signal == SIGHUP) {
        std::string reason;
        if (certificate_ == nullptr) {
            Log(LOG_NOTICE, "there is no certificate to read");
        } else if (certificate_->Load(reason)) {
            Log(LOG_NOTICE, "the certificate was read anew");
        } else {
            Log(LOG_ERR, reason + "; the certificate before stays in use");
        }
    } else if (draining_) {
        Log(LOG_WARNING, "ending at once; " + std::to_string(connections_.size()) + " connections are cut off");
        leftBehind_ = true;
        loop_.stop();
    } else {
        Log(LOG_NOTICE, "ending on signal " + std::to_string(signal) + "; " + std::to_string(upstream_.Running()) +
                            " requests run");
        Drain();
    }
}

void Door::Drain() {
    draining_ = true;
    Notify("STOPPING=1");
    Error ignored;
    for (const std::unique_ptr<Listener>& listener : listeners_) {
        listener->close(ignored);
    }
    pause_.cancel();
    certificateCheck_.cancel();
    drainEnd_ = Clock::now() + limits_.drain;
    std::vector<std::shared_ptr<ClientConnection>> connections;
    connections.reserve(connections_.size());
    for (const auto& [key, connection] : connections_) {
        connections.push_back(connection);
    }
    for (const std::shared_ptr<ClientConnection>& connection : connections) {
        connection->Drain();
    }
    EndWhenDone();
    ScheduleTick();
}

void Door::EndWhenDone() {
    if (!draining_) {
        return;
    }
    if (connections_.empty() && upstream_.Running() == 0) {
        loop_.stop();
    } else if (Clock::now() >= drainEnd_) {
        Log(LOG_ERR, std::to_string(connections_.size()) + " connections did not end and are cut off");
        leftBehind_ = true;
        loop_.stop();
    }
}

// Only while there is something whose time runs.
void Door::ScheduleTick() {
    if (ticking_) {
        return;
    }
    ticking_ = true;
    tick_.expires_after(kTick);
    tick_.async_wait([this](Error error) {
        ticking_ = false;
        if (!error) {
            Tick();
        }
    });
}

void Door::Tick() {
    const Clock::time_point now = Clock::now();
    std::vector<std::shared_ptr<ClientConnection>> connections;
    connections.reserve(connections_.size());
    for (const auto& [key, connection] : connections_) {
        connections.push_back(connection);
    }
    for (const std::shared_ptr<ClientConnection>& connection : connections) {
        connection->Tick(now);
    }
    upstream_.Tick();
    EndWhenDone();
    if (!connections_.empty() || !upstream_.IsIdle() || draining_) {
        ScheduleTick();
    }
}

void Door::Beat() {
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

void Door::CheckCertificate() {
    if (certificate_ == nullptr) {
        return;
    }
    certificateCheck_.expires_after(kCertificateCheck);
    certificateCheck_.async_wait([this](Error error) {
        if (!error) {
            certificate_->Renew();
            CheckCertificate();
        }
    });
}

std::string Door::Figures() const {
    return metrics_.Text(connections_.size(), upstream_.Running(), log_.lost());
}

}  // namespace appliance
