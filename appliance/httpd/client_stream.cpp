#include "appliance/httpd/client_stream.h"

#include <openssl/err.h>
#include <sys/socket.h>

#include <array>
#include <cerrno>
#include <new>

namespace appliance {

using Kind = ClientStream::Result::Kind;

ClientStream::ClientStream(boost::asio::io_context& loop, FileDescriptor socket) : descriptor_(loop) {
    descriptor_.assign(socket.get());
    socket.Release();
}

ClientStream::Result ClientStream::Failure() {
    return {errno == EAGAIN || errno == EINTR ? Kind::NeedRead : Kind::Ended, 0};
}

ClientStream::Result ClientStream::Read(char* bytes, std::size_t size) {
    const ssize_t got = recv(descriptor_.native_handle(), bytes, size, 0);
    if (got > 0) {
        return {Kind::Done, static_cast<std::size_t>(got)};
    }
    return got == 0 ? Result{Kind::Ended, 0} : Failure();
}

ClientStream::Result ClientStream::Write(std::string_view bytes) {
    const ssize_t sent = send(descriptor_.native_handle(), bytes.data(), bytes.size(), MSG_NOSIGNAL);
    if (sent >= 0) {
        return {Kind::Done, static_cast<std::size_t>(sent)};
    }
    return {errno == EAGAIN || errno == EINTR ? Kind::NeedWrite : Kind::Ended, 0};
}

void ClientStream::EndSending() {
    shutdown(descriptor_.native_handle(), SHUT_WR);
}

ClientStream::Result ClientStream::Discard() {
    std::array<char, 16384> bytes;
    const ssize_t got = recv(descriptor_.native_handle(), bytes.data(), bytes.size(), 0);
    if (got > 0) {
        return {Kind::Done, static_cast<std::size_t>(got)};
    }
    return got == 0 ? Result{Kind::Ended, 0} : Failure();
}

TlsStream::TlsStream(boost::asio::io_context& loop, FileDescriptor socket, SSL_CTX* context)
    : ClientStream(loop, std::move(socket)), ssl_(SSL_new(context)) {
    if (ssl_ == nullptr || SSL_set_fd(ssl_.get(), descriptor().native_handle()) != 1) {
        throw std::bad_alloc();
    }
    SSL_set_accept_state(ssl_.get());
}

ClientStream::Result TlsStream::Outcome(int result, std::size_t size) {
    if (result > 0) {
        return {Kind::Done, size};
    }
    const int error = SSL_get_error(ssl_.get(), result);
    if (error == SSL_ERROR_WANT_READ) {
        return {Kind::NeedRead, 0};
    }
    if (error == SSL_ERROR_WANT_WRITE) {
        return {Kind::NeedWrite, 0};
    }
    isBroken_ = isBroken_ || error == SSL_ERROR_SSL || error == SSL_ERROR_SYSCALL;
    return {Kind::Ended, 0};
}

ClientStream::Result TlsStream::Handshake() {
    ERR_clear_error();
    const Result result = Outcome(SSL_do_handshake(ssl_.get()), 0);
    isReady_ = result.kind == Kind::Done;
    if (result.kind == Kind::Ended && ERR_GET_REASON(ERR_peek_error()) == SSL_R_HTTP_REQUEST) {
        AnswerClearText();
    }
    ERR_clear_error();
    return result;
}

// Somebody typed http:// in front of the right address.
void TlsStream::AnswerClearText() {
    constexpr std::string_view kAnswer =
        "HTTP/1.1 400 Bad Request\r\nContent-Type: text/plain\r\nConnection: close\r\nContent-Length: 43\r\n\r\n"
        "This address is served by https:// alone.\r\n";
    static_cast<void>(ClientStream::Write(kAnswer));
}

ClientStream::Result TlsStream::Read(char* bytes, std::size_t size) {
    ERR_clear_error();
    std::size_t got = 0;
    const int result = SSL_read_ex(ssl_.get(), bytes, size, &got);
    return Outcome(result, got);
}

ClientStream::Result TlsStream::Write(std::string_view bytes) {
    ERR_clear_error();
    std::size_t sent = 0;
    const int result = SSL_write_ex(ssl_.get(), bytes.data(), bytes.size(), &sent);
    return Outcome(result, sent);
}

bool TlsStream::HasPending() const {
    return SSL_has_pending(ssl_.get()) == 1;
}

void TlsStream::EndSending() {
    if (isReady_ && !isBroken_) {
        ERR_clear_error();
        SSL_shutdown(ssl_.get());
    }
    ClientStream::EndSending();
}

}  // namespace appliance
