// The bytes of a connection, in clear text or through TLS. Nothing here waits: an operation that can't go on says what for.

#ifndef VORN_APPLIANCE_HTTPD_CLIENT_STREAM_H
#define VORN_APPLIANCE_HTTPD_CLIENT_STREAM_H

#include <openssl/ssl.h>

#include <boost/asio/io_context.hpp>
#include <boost/asio/posix/stream_descriptor.hpp>
#include <cstddef>
#include <memory>
#include <string_view>

#include "appliance/base/file.h"

namespace appliance {

class ClientStream {
public:
    using Descriptor = boost::asio::posix::stream_descriptor;

    struct Result {
        enum class Kind {
            Done,       // `size` bytes were moved
            NeedRead,   // again when the descriptor can be read
            NeedWrite,  // again when it can be written to
            Ended,      // by the other side, or broken
        };
        Kind kind = Kind::Ended;
        std::size_t size = 0;
    };

    // Takes over a connected, non-blocking socket. Throws boost::system::system_error.
    ClientStream(boost::asio::io_context& loop, FileDescriptor socket);
    virtual ~ClientStream() = default;
    ClientStream(const ClientStream&) = delete;
    ClientStream& operator=(const ClientStream&) = delete;

    virtual bool isSecure() const {
        return false;
    }
    // What comes before the first byte of a request.
    virtual Result Handshake() {
        return {Result::Kind::Done, 0};
    }
    virtual Result Read(char* bytes, std::size_t size);
    // May be called again with the same bytes only, until some were written.
    virtual Result Write(std::string_view bytes);
    // Bytes wait that the descriptor does not tell of.
    virtual bool HasPending() const {
        return false;
    }
    // Says that nothing more will be written.
    virtual void EndSending();

    // Reads what comes, and drops it.
    Result Discard();
    Descriptor& descriptor() {
        return descriptor_;
    }

protected:
    static Result Failure();  // of a call on the socket, by errno

private:
    Descriptor descriptor_;
};

class TlsStream : public ClientStream {
public:
    // The context may go before the stream does. Throws std::bad_alloc.
    TlsStream(boost::asio::io_context& loop, FileDescriptor socket, SSL_CTX* context);

    bool isSecure() const override {
        return true;
    }
    Result Handshake() override;
    Result Read(char* bytes, std::size_t size) override;
    Result Write(std::string_view bytes) override;
    bool HasPending() const override;
    void EndSending() override;

private:
    struct Free {
        void operator()(SSL* ssl) const {
            SSL_free(ssl);
        }
    };
    Result Outcome(int result, std::size_t size);
    void AnswerClearText();

    std::unique_ptr<SSL, Free> ssl_;
    bool isBroken_ = false;
    bool isReady_ = false;
};

}  // namespace appliance

#endif
