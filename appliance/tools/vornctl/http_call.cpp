#include "appliance/tools/vornctl/http_call.h"

#include <boost/asio/io_context.hpp>
#include <boost/asio/local/stream_protocol.hpp>
#include <boost/beast/core/flat_buffer.hpp>
#include <boost/beast/http.hpp>

#include "appliance/tools/vornctl/exit_code.h"
#include "appliance/tools/vornctl/output.h"

namespace appliance::ctl {

namespace {

namespace asio = boost::asio;
namespace http = boost::beast::http;
using Local = asio::local::stream_protocol;
using Clock = std::chrono::steady_clock;
using Error = boost::system::error_code;

constexpr std::size_t kBodyLimit = std::size_t{16} << 20;
constexpr std::uint32_t kHeaderLimit = 16384;

}  // namespace

class HttpCall::Impl {
public:
    Impl(const std::string& socket, const std::string& target, Secret body, std::chrono::milliseconds deadline)
        : path(socket),
          secret(std::move(body)),
          limit(deadline),
          end(Clock::now() + deadline),
          request(http::verb::post, target, 11, secret.view()) {
        request.set(http::field::host, "localhost");
        request.set(http::field::user_agent, "vornctl");
        request.set(http::field::content_type, "application/json");
        request.set(http::field::accept, "application/json");
        request.keep_alive(false);
        request.prepare_payload();
        parser.body_limit(kBodyLimit);
        parser.header_limit(kHeaderLimit);
        stream.async_connect(Local::endpoint(path), [this](Error error) {
            if (error) {
                ConnectFailed(error);
                return;
            }
            Send();
        });
    }

    void Send() {
        http::async_write(stream, request, [this](Error error, std::size_t) {
            // A server that refuses a request before it has read all of it closes; its answer is still there to read.
            writeFailed = static_cast<bool>(error);
            Receive();
        });
    }

    void Receive() {
        http::async_read(stream, buffer, parser, [this](Error error, std::size_t) {
            if (error == http::error::end_of_stream || error == asio::error::connection_reset ||
                error == asio::error::broken_pipe || error == http::error::partial_message) {
                failure = writeFailed ? "vornd closed the connection before it had read the request."
                                      : "vornd closed the connection without an answer.";
            } else if (error) {
                failure =
                    "What answers at " + Escape(path) + " does not speak HTTP as vornd does (" + error.message() + ").";
            }
            done = true;
        });
    }

    void ConnectFailed(const Error& error) {
        done = true;
        if (error == boost::system::errc::no_such_file_or_directory) {
            failure = "vornd is not running: there is no socket " + Escape(path) +
                      ". Start it (systemctl start vornd) and try again.";
        } else if (error == boost::system::errc::connection_refused) {
            failure = "vornd is not running: nobody listens at " + Escape(path) +
                      ". Start it (systemctl start vornd) and try again.";
        } else if (error == boost::system::errc::permission_denied) {
            failure = "You may not talk to vornd at " + Escape(path) + ". Run vornctl as root.";
        } else {
            failure = "vornd can't be reached at " + Escape(path) + ": " + error.message() + ".";
        }
    }

    const std::string path;
    const Secret secret;
    const std::chrono::milliseconds limit;
    const Clock::time_point end;
    asio::io_context context{1};
    Local::socket stream{context};
    http::request<http::span_body<const char>> request;
    http::response_parser<http::string_body> parser;
    boost::beast::flat_buffer buffer;
    bool writeFailed = false;
    bool done = false;
    std::string failure;
};

HttpCall::HttpCall(const std::string& socket, const std::string& target, Secret body,
                   std::chrono::milliseconds deadline) {
    try {
        impl_ = std::make_unique<Impl>(socket, target, std::move(body), deadline);
    } catch (const boost::system::system_error& error) {
        throw Failure(kUsage,
                      "This can't be the path of a socket: " + Escape(socket) + " (" + error.code().message() + ").");
    }
}

HttpCall::~HttpCall() = default;

bool HttpCall::RunFor(std::chrono::milliseconds slice) {
    const Clock::time_point until = Clock::now() + slice;
    while (!impl_->done && Clock::now() < until) {
        impl_->context.run_one_until(std::min(until, impl_->end));
        if (!impl_->done && Clock::now() >= impl_->end) {
            Error ignored;
            impl_->stream.close(ignored);
            impl_->context.run();  // the aborted step ends, and nothing refers to this object any more
            impl_->done = true;
            const auto seconds = std::chrono::duration_cast<std::chrono::seconds>(impl_->limit).count();
            impl_->failure = "vornd did not answer within " + std::to_string(seconds) + " s.";
        }
    }
    return impl_->done;
}

HttpAnswer HttpCall::Take() {
    if (!impl_->failure.empty()) {
        throw Failure(kNoAnswer, impl_->failure);
    }
    const auto& response = impl_->parser.get();
    return {static_cast<int>(response.result_int()), response.body()};
}

}  // namespace appliance::ctl
