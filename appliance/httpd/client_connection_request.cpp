// How a request comes in at a connection: its header, its body, and on to the site.

#include <string.h>

#include <algorithm>
#include <array>
#include <boost/asio/buffer.hpp>
#include <boost/beast/http/error.hpp>
#include <boost/beast/http/field.hpp>
#include <utility>

#include "appliance/base/text.h"
#include "appliance/httpd/client_connection.h"
#include "appliance/httpd/header_rules.h"
#include "appliance/web/framing.h"

namespace appliance {
namespace {

namespace http = boost::beast::http;
using Kind = ClientStream::Result::Kind;

constexpr std::size_t kPiece = std::size_t{16} << 10;       // bytes that are read at a time
constexpr std::size_t kMostUnread = std::size_t{16} << 10;  // bytes of a body that the parser may leave for later
constexpr std::string_view kContinue = "HTTP/1.1 100 Continue\r\n\r\n";

}  // namespace

// Reads what there is. False when there is nothing, or no more.
bool ClientConnection::Read() {
    static std::array<char, kPiece> piece;  // one thread reads, and one connection after the other
    const ClientStream::Result result = stream_->Read(piece.data(), piece.size());
    if (result.kind == Kind::Done) {
        services_.metrics.CountReceived(result.size);
        input_.append(piece.data(), result.size);
        explicit_bzero(piece.data(), result.size);
        return true;
    }
    return WaitOrClose(result.kind);
}

bool ClientConnection::StepHeader() {
    const std::optional<std::size_t> length = HeaderLength(input_, scanned_);
    if (length.value_or(input_.size()) > kHeaderLimit) {
        Refuse(ServerCode::HeaderTooLarge);
        return true;
    }
    if (!HasPlainLines(std::string_view(input_).substr(0, length.value_or(input_.size())))) {
        Refuse(ServerCode::BadRequest);
        return true;
    }
    if (!length) {
        return Read();
    }
    TakeHeader(*length);
    return true;
}

void ClientConnection::TakeHeader(std::size_t length) {
    parser_.emplace();
    parser_->header_limit(static_cast<std::uint32_t>(kHeaderLimit));
    parser_->body_limit(kBodyLimit);
    Error error;
    const std::size_t taken = parser_->put(boost::asio::buffer(input_.data(), length), error);
    const http::request_header<>& header = parser_->get().base();
    if (error == http::error::body_limit && HasSoundFraming(header)) {
        Refuse(ServerCode::BodyTooLarge);
        return;
    }
    if (error || taken != length || !parser_->is_header_done() || !HasSoundFraming(header)) {
        Refuse(ServerCode::BadRequest);
        return;
    }
    Consume(length);
    verb_.assign(header.method_string().data(), header.method_string().size());
    target_.assign(header.target().data(), header.target().size());
    const boost::beast::string_view host = header[http::field::host];
    request_.origin = stream_->isSecure() ? "https://" : "http://";
    request_.origin.append(host.data(), host.size());
    keepOpen_ = parser_->get().keep_alive();
    oldVersion_ = header.version() < 11;
    if (parser_->chunked()) {
        // Fields behind the body change nothing.
        request_.header = header;
    }
    const boost::beast::string_view expect = header[http::field::expect];
    if (!oldVersion_ && !parser_->is_done() && input_.empty() && !expect.empty() &&
        EqualIgnoringCase({expect.data(), expect.size()}, "100-continue")) {
        output_ = kContinue;
        written_ = 0;
        state_ = State::Continuing;
        return;
    }
    state_ = State::Body;
    parser_->eager(true);
}

bool ClientConnection::StepContinue() {
    const ClientStream::Result result = stream_->Write(std::string_view(output_).substr(written_));
    if (result.kind == Kind::Done) {
        services_.metrics.CountSent(result.size);
        written_ += result.size;
        if (written_ == output_.size()) {
            state_ = State::Body;
            parser_->eager(true);
        }
        return true;
    }
    return WaitOrClose(result.kind);
}

bool ClientConnection::StepBody() {
    Error error;
    std::size_t place = 0;
    while (!parser_->is_done() && place < input_.size() && !error) {
        place += parser_->put(boost::asio::buffer(input_.data() + place, input_.size() - place), error);
    }
    Consume(place);
    if (error && error != http::error::need_more) {
        RefuseBody(error);
        return true;
    }
    if (parser_->is_done()) {
        Dispatch();
        return true;
    }
    if (input_.size() > kMostUnread) {
        Refuse(ServerCode::BodyTooLarge);
        return true;
    }
    return Read();
}

void ClientConnection::RefuseBody(Error error) {
    const bool tooLarge = error == http::error::body_limit || error == http::error::header_limit;
    Refuse(tooLarge ? ServerCode::BodyTooLarge : ServerCode::BadRequest);
}

void ClientConnection::Consume(std::size_t count) {
    const std::size_t left = input_.size() - count;
    std::copy(input_.begin() + static_cast<std::ptrdiff_t>(count), input_.end(), input_.begin());
    // A body may hold a password, which need not lie about.
    explicit_bzero(input_.data() + left, count);
    input_.resize(left);
}

void ClientConnection::Dispatch() {
    complete_ = Clock::now();
    state_ = State::Calling;
    request_.verb = verb_;
    request_.target = target_;
    request_.client = client_;
    request_.body = std::move(parser_->get().body());
    if (!parser_->chunked()) {
        request_.header = std::move(static_cast<http::fields&>(parser_->get().base()));
    }
    parser_.reset();
    ClientRequest request;
    std::swap(request, request_);
    services_.site.Handle(std::move(request), [weak = weak_from_this()](DoorReply reply) {
        // An answer that nobody waits for any more is dropped.
        if (const auto self = weak.lock(); self && self->state_ == State::Calling) {
            self->Answer(std::move(reply), self->keepOpen_);
            self->Drive();
        }
    });
}

}  // namespace appliance
