#include "appliance/httpd/client_connection.h"

#include <string.h>

#include <algorithm>
#include <boost/asio/post.hpp>
#include <utility>

namespace appliance {
namespace {

using Kind = ClientStream::Result::Kind;

constexpr std::size_t kSmallContent = std::size_t{12} << 10;  // goes with the header in one write
constexpr int kStepsAtATime = 64;                             // then others have their turn

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

// For a step that can't go on now, or never.
bool ClientConnection::WaitOrClose(Kind what) {
    if (what == Kind::Ended) {
        Close();
    } else {
        WaitFor(what);
    }
    return false;
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
    return WaitOrClose(result.kind);
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
    return WaitOrClose(result.kind);
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
