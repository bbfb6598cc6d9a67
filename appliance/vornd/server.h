// The server: it listens, keeps the connections within their number, and ends in order.

#ifndef VORN_APPLIANCE_VORND_SERVER_H
#define VORN_APPLIANCE_VORND_SERVER_H

#include <boost/asio/io_context.hpp>
#include <boost/asio/local/stream_protocol.hpp>
#include <boost/asio/signal_set.hpp>
#include <boost/asio/steady_timer.hpp>
#include <chrono>
#include <memory>
#include <optional>
#include <string>
#include <unordered_map>

#include "appliance/base/file.h"
#include "appliance/vornd/connection.h"
#include "appliance/vornd/gate.h"
#include "appliance/vornd/lanes.h"
#include "appliance/vornd/metrics.h"
#include "appliance/vornd/router.h"
#include "appliance/vornd/session_routes.h"
#include "appliance/vornd/session_store.h"

namespace appliance {

class Server {
public:
    // `listener` is a listening, non-blocking socket; `path` its file, which goes when the server begins to end.
    // `router` outlives the server. `door` is the user who may log administrators in, when there is one. `patience` is
    // for the calls that run when it is told to end.
    Server(FileDescriptor listener, std::string path, const Router& router, std::optional<uid_t> door,
           std::chrono::seconds patience);
    Server(const Server&) = delete;
    Server& operator=(const Server&) = delete;

    // Serves until SIGTERM, SIGINT or SIGHUP, and then until the calls that run are answered. False when some were left
    // behind because the server's patience was over: their threads can't be ended, so the process must be.
    bool Run();

private:
    void WaitForConnections();
    void TakeConnections();
    void Take(FileDescriptor descriptor);
    bool MakeRoom(Access newcomer);
    Metrics::Gauges ReadGauges();
    void WaitForSignal();
    void Drain();
    void FinishWhenDone();
    void Beat();

    boost::asio::io_context loop_;
    Metrics metrics_;
    SessionStore sessions_;
    SessionRoutes sessionRoutes_;
    Gate gate_;
    Connection::Services services_;
    // The last owner of a connection may be a job, so the threads end before the loop, and the connections before them.
    Lanes lanes_;
    boost::asio::local::stream_protocol::acceptor listener_;
    const std::string path_;
    const std::optional<uid_t> door_;
    const std::chrono::seconds patience_;
    boost::asio::signal_set signals_;
    boost::asio::steady_timer pause_;
    boost::asio::steady_timer beat_;
    boost::asio::steady_timer drainLimit_;
    std::unordered_map<Connection*, std::shared_ptr<Connection>> connections_;
    bool draining_ = false;
    bool leftBehind_ = false;
};

}  // namespace appliance

#endif
