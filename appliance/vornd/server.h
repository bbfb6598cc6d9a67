// The server: it listens, keeps the connections within their number, and ends in order.

#ifndef VORN_APPLIANCE_VORND_SERVER_H
#define VORN_APPLIANCE_VORND_SERVER_H

#include <boost/asio/io_context.hpp>
#include <boost/asio/local/stream_protocol.hpp>
#include <boost/asio/signal_set.hpp>
#include <boost/asio/steady_timer.hpp>
#include <memory>
#include <string>
#include <unordered_map>

#include "appliance/base/file.h"
#include "appliance/vornd/connection.h"
#include "appliance/vornd/router.h"
#include "appliance/vornd/worker_pool.h"

namespace appliance {

class Server {
public:
    // `listener` is a listening, non-blocking socket; `path` its file, which goes when the server begins to end.
    // `router` outlives the server.
    Server(FileDescriptor listener, std::string path, const Router& router);
    Server(const Server&) = delete;
    Server& operator=(const Server&) = delete;

    // Serves until SIGTERM, SIGINT or SIGHUP, and then until the calls that run are answered. False when some were left
    // behind because kDrainLimit passed: their threads can't be ended, so the process must be.
    bool Run();

private:
    void WaitForConnections();
    void TakeConnections();
    void Take(FileDescriptor descriptor);
    bool MakeRoom(Access newcomer);
    void WaitForSignal();
    void Drain();
    void FinishWhenDone();
    void Beat();

    boost::asio::io_context loop_;
    Connection::Services services_;
    // The last owner of a connection may be a job, so the pool ends before the loop, and the connections before it.
    WorkerPool pool_;
    boost::asio::local::stream_protocol::acceptor listener_;
    const std::string path_;
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
