#include "appliance/httpd/client_connection.h"

#include <string.h>

#include <algorithm>
#include <array>
#include <boost/asio/buffer.hpp>
#include <boost/asio/post.hpp>
#include <boost/beast/http/error.hpp>
#include <boost/beast/http/field.hpp>
#include <utility>

#include "appliance/base/text.h"
#include "appliance/httpd/header_rules.h"
#include "appliance/web/framing.h"

namespace appliance {
namespace {

namespace http = boost::beast::http;
using Kind = ClientStream::Result::Kind;

constexpr std::size_t kPiece = std::size_t{16} << 10;         // bytes that are read at a time
constexpr std::size_t kSmallContent = std::size_t{12} << 10;  // goes with the header in one write
constexpr std::size_t kMostUnread = std::size_t{16} << 10;    // bytes of a body that the parser may leave for later
constexpr int kStepsAtATime = 64;                             // then others have their turn
constexpr std::string_view kContinue = "HTTP/1.1 100 Continue\r\n\r\n";

}  // namespace

ClientConnection::ClientConnection(std::unique_ptr<ClientStream> stream, ClientAddress client, const Services& services)
    : stream_(std::move(stream)),
      client_(std::move(client)),
      services_(services),
      since_(Clock::now()),
      deadline_(since_ + services.limits.handshake) {}

ClientConnection::~ClientConnection() {
    explicit_bzero(input_.data(), input_.size());
}

void ClientConnection::Start() {
    Drive();
}

// Takes steps until one has to wait.
void ClientConnection::Drive() {
    if (driving_) {
        return;
    }
    const auto self = shared_from_this();
    driving_ = true;
    int steps = 0;
    while (state_ != State::Closed && Step()) {
        if (++steps == kStepsAtATime) {
            boost::asio::post(services_.loop, [self] { self->Drive(); });
            break;
        }
    }
    driving_ = false;
}

// False when nothing can be done now.
bool ClientConnection::Step() {
    switch (state_) {
        case State::Handshaking:
            return StepHandshake();
        case State::Idle:
            return StepIdle();
        case State::Header:
            return StepHeader();
        case State::Continuing:
            return StepContinue();
        case State::Body:
            return StepBody();
        case State::Answering:
            return StepAnswer();
        case State::Lingering:
            return StepLinger();
        case State::Calling:
        case State::Closed:
            break;
    }
    return false;
}

void ClientConnection::WaitFor(Kind what) {
    const bool forRead = what == Kind::NeedRead;
    bool& waits = forRead ? waitsForRead_ : waitsForWrite_;
    if (waits) {
        return;
    }
    waits = true;
    stream_->descriptor().async_wait(
        forRead ? ClientStream::Descriptor::wait_read : ClientStream::Descriptor::wait_write,
        [self = shared_from_this(), forRead](Error error) {
            (forRead ? self->waitsForRead_ : self->waitsForWrite_) = false;
            self->readable_ = self->readable_ || forRead;
            if (!error) {
                self->Drive();
            }
        });
}

void ClientConnection::Enter(State state, std::chrono::milliseconds limit) {
    state_ = state;
    since_ = Clock::now();
    deadline_ = since_ + limit;
}

bool ClientConnection::StepHandshake() {
    const ClientStream::Result result = stream_->Handshake();
    if (result.kind == Kind::Done) {
        BecomeIdle();
        return true;
    }
    if (result.kind == Kind::Ended) {
        services_.metrics.CountHandshakeFailure();
        Close();
    } else {
        WaitFor(result.kind);
    }
    return false;
}

void ClientConnection::BecomeIdle() {
    Enter(State::Idle, services_.limits.idle);
    readable_ = false;
    parser_.reset();
    if (input_.empty()) {
        std::string().swap(input_);
    }
}

bool ClientConnection::StepIdle() {
    if (draining_) {
        Linger();
        return true;
    }
    if (input_.empty()) {
        if (!readable_ && !stream_->HasPending()) {
            // Most often there is nothing yet: no need to look.
            WaitFor(Kind::NeedRead);
            return false;
        }
        if (!Read()) {
            return false;
        }
    }
    Enter(State::Header, services_.limits.send);
    scanned_ = 0;
    return true;
}

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
    if (result.kind == Kind::Ended) {
        Close();
    } else {
        WaitFor(result.kind);
    }
    return false;
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
    if (result.kind == Kind::Ended) {
        Close();
    } else {
        WaitFor(result.kind);
    }
    return false;
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

// Answers what can't be a request, or not in time. Nothing behind it is looked at.
void ClientConnection::Refuse(ServerCode code) {
    complete_ = Clock::now();
    Answer(DoorError(code), false);
}

void ClientConnection::Answer(DoorReply reply, bool keepOpen) {
    if (state_ == State::Closed) {
        return;
    }
    took_ = std::chrono::duration_cast<std::chrono::microseconds>(Clock::now() - complete_);
    services_.metrics.CountRequest(verb_, reply.status, took_);
    keepOpen_ = keepOpen && !draining_;
    const bool headOnly = verb_ == "HEAD";
    reply_ = std::move(reply);
    output_ = WriteHeader(reply_, {keepOpen_, oldVersion_, headOnly, services_.strictTransport && stream_->isSecure()});
    headerSize_ = output_.size();
    content_ = {};
    if (!headOnly && reply_.status != 304) {
        content_ = reply_.Content();
        if (content_.size() <= kSmallContent) {
            output_ += content_;
            content_ = {};
        }
    }
    written_ = 0;
    Enter(State::Answering, services_.limits.stall);
    answerEnd_ = since_ + services_.limits.answer;
}

bool ClientConnection::StepAnswer() {
    const std::string_view left = written_ < output_.size() ? std::string_view(output_).substr(written_)
                                                            : content_.substr(written_ - output_.size());
    const ClientStream::Result result = stream_->Write(left);
    if (result.kind == Kind::Done) {
        services_.metrics.CountSent(result.size);
        written_ += result.size;
        deadline_ = std::min(Clock::now() + services_.limits.stall, answerEnd_);
        if (written_ == output_.size() + content_.size()) {
            OnAnswered();
        }
        return true;
    }
    if (result.kind == Kind::Ended) {
        Close();
    } else {
        WaitFor(result.kind);
    }
    return false;
}

void ClientConnection::OnAnswered() {
    WriteLog();
    reply_ = {};
    content_ = {};
    std::string().swap(output_);
    verb_.clear();
    target_.clear();
    oldVersion_ = false;
    if (keepOpen_) {
        BecomeIdle();
    } else {
        Linger();
    }
}

void ClientConnection::WriteLog() {
    services_.log({client_.text, verb_, target_, reply_.status, written_ - std::min(written_, headerSize_),
                   std::chrono::duration_cast<std::chrono::milliseconds>(took_)});
}

// A client that is still sending would lose the answer if the connection were closed under it.
void ClientConnection::Linger() {
    parser_.reset();
    Consume(input_.size());
    stream_->EndSending();
    Enter(State::Lingering, services_.limits.linger);
}

bool ClientConnection::StepLinger() {
    const ClientStream::Result result = stream_->Discard();
    if (result.kind == Kind::Done) {
        return true;
    }
    if (result.kind == Kind::Ended) {
        Close();
    } else {
        WaitFor(result.kind);
    }
    return false;
}

void ClientConnection::Tick(Clock::time_point now) {
    if (now < deadline_) {
        return;
    }
    switch (state_) {
        case State::Handshaking:
            services_.metrics.CountHandshakeFailure();
            Close();
            break;
        case State::Idle:
            stream_->EndSending();
            Close();
            break;
        case State::Header:
        case State::Continuing:
        case State::Body:
            Refuse(ServerCode::TooSlow);
            Drive();
            break;
        case State::Answering:
        case State::Lingering:
            Close();
            break;
        case State::Calling:
        case State::Closed:
            break;
    }
}

int ClientConnection::Dispensable(Clock::time_point now) const {
    switch (state_) {
        case State::Idle:
        case State::Lingering:
            return 2;
        case State::Handshaking:
        case State::Header:
        case State::Continuing:
        case State::Body:
            return now - since_ >= services_.limits.protectedFor ? 1 : 0;
        default:
            return 0;
    }
}

void ClientConnection::Close() {
    if (state_ == State::Closed) {
        return;
    }
    if (state_ == State::Answering) {
        WriteLog();
    }
    state_ = State::Closed;
    Error ignored;
    stream_->descriptor().close(ignored);
    services_.closed(*this);
}

void ClientConnection::Drain() {
    draining_ = true;
    switch (state_) {
        case State::Handshaking:
            Close();
            break;
        case State::Idle:
            stream_->EndSending();
            Close();
            break;
        case State::Header:
        case State::Continuing:
        case State::Body:
            Refuse(ServerCode::Ending);
            Drive();
            break;
        default:
            break;
    }
}

}  // namespace appliance
