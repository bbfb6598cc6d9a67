// The server: it listens, keeps the connections within their number, and ends in order.

#ifndef VORN_APPLIANCE_HTTPD_DOOR_H
#define VORN_APPLIANCE_HTTPD_DOOR_H

#include <boost/asio/io_context.hpp>
#include <boost/asio/posix/stream_descriptor.hpp>
#include <boost/asio/signal_set.hpp>
#include <boost/asio/steady_timer.hpp>
#include <chrono>
#include <cstddef>
#include <memory>
#include <string>
#include <unordered_map>
#include <vector>

#include "appliance/base/file.h"
#include "appliance/httpd/access_log.h"
#include "appliance/httpd/client_connection.h"
#include "appliance/httpd/door_certificate.h"
#include "appliance/httpd/door_limits.h"
#include "appliance/httpd/door_metrics.h"
#include "appliance/httpd/page.h"
#include "appliance/httpd/site.h"
#include "appliance/httpd/upstream.h"

namespace appliance {

class Door {
public:
    struct Setup {
        std::vector<FileDescriptor> listeners;   // listening, non-blocking
        std::string vornd;                       // its socket
        std::string page;                        // folder
        DoorCertificate* certificate = nullptr;  // null: clear text. Outlives the door.
        DoorLimits limits;
        bool terminal = false;  // the access log goes there
    };
    explicit Door(Setup setup);
    ~Door();
    Door(const Door&) = delete;
    Door& operator=(const Door&) = delete;

    // Serves until SIGTERM or SIGINT, and then until the requests that run are answered. False when some were left
    // behind because another signal came or the limit passed.
    bool Run();

private:
    using Listener = boost::asio::posix::stream_descriptor;
    using Clock = std::chrono::steady_clock;

    void WaitForConnections(Listener& listener);
    void TakeConnections(Listener& listener);
    void Take(FileDescriptor socket, const sockaddr_storage& address);
    bool MakeRoom();
    void Refuse(FileDescriptor socket);
    void WaitForSignal();
    void OnSignal(int signal);
    void Drain();
    void ScheduleTick();
    void Tick();
    void EndWhenDone();
    void Beat();
    void CheckCertificate();
    std::string Figures() const;

    boost::asio::io_context loop_{1};
    const DoorLimits limits_;
    DoorCertificate* const certificate_;
    AccessLog log_;
    DoorMetrics metrics_;
    const Page page_;
    Upstream upstream_;
    Site site_;
    const ClientConnection::Services services_;
    std::vector<std::unique_ptr<Listener>> listeners_;
    boost::asio::signal_set signals_;
    boost::asio::steady_timer tick_;
    boost::asio::steady_timer pause_;
    boost::asio::steady_timer beat_;
    boost::asio::steady_timer certificateCheck_;
    std::unordered_map<const ClientConnection*, std::shared_ptr<ClientConnection>> connections_;
    bool ticking_ = false;
    bool draining_ = false;
    bool leftBehind_ = false;
    Clock::time_point drainEnd_;
};

}  // namespace appliance

#endif
