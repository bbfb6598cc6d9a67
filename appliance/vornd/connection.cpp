#include "appliance/vornd/connection.h"

#include <string.h>

#include <algorithm>
#include <boost/asio/buffer.hpp>
#include <boost/asio/executor_work_guard.hpp>
#include <boost/asio/post.hpp>
#include <boost/asio/write.hpp>
#include <boost/beast/http/error.hpp>
#include <boost/beast/http/read.hpp>
#include <boost/beast/http/write.hpp>
#include <utility>
#include <variant>

#include "appliance/base/log.h"
#include "appliance/base/text.h"
#include "appliance/web/framing.h"
#include "appliance/web/limits.h"

namespace appliance {
namespace {

namespace http = boost::beast::http;
namespace asio = boost::asio;

// Bytes that are read ahead of the parser: a header, and a good piece of a body.
constexpr std::size_t kBufferLimit = 2 * kHeaderLimit;

constexpr std::string_view kContinue = "HTTP/1.1 100 Continue\r\n\r\n";

// What `make` answers; an exception is an answer, too.
template <typename Maker>
auto Safely(const Maker& make) -> decltype(make()) {
    try {
        return make();
    } catch (const std::exception& error) {
        Log(LOG_ERR, std::string("an answer could not be made: ") + error.what());
        return ErrorReply(ServerCode::ModuleException);
    }
}

}  // namespace

Connection::Connection(Socket socket, Access access, const Services& services)
    : socket_(std::move(socket)), access_(access), services_(services), timer_(services.loop), buffer_(kBufferLimit) {}

void Connection::Start() {
    WaitForRequest();
}

void Connection::WaitForRequest() {
    state_ = State::Idle;
    idleSince_ = std::chrono::steady_clock::now();
    timer_.cancel();
    if (draining_) {
        Close();
        return;
    }
    if (buffer_.size() > 0) {
        ReadHeader();
        return;
    }
    socket_.async_wait(Socket::wait_read, [self = shared_from_this()](Error error) {
        if (self->state_ == State::Idle) {
            error ? self->Close() : self->ReadHeader();
        }
    });
}

void Connection::ReadHeader() {
    state_ = State::Reading;
    complete_ = std::chrono::steady_clock::now();
    LimitTime(kSendLimit);
    parser_.emplace();
    parser_->header_limit(static_cast<std::uint32_t>(kHeaderLimit));
    parser_->body_limit(kBodyLimit);
    http::async_read_header(socket_, buffer_, *parser_, [self = shared_from_this()](Error error, std::size_t size) {
        self->OnHeader(error, size);
    });
}

void Connection::OnHeader(Error error, std::size_t size) {
    if (state_ != State::Reading) {
        return;
    }
    if (error) {
        OnReadError(error);
        return;
    }
    if (size > kHeaderLimit) {
        // The parser does not count the first line.
        Answer(ErrorReply(ServerCode::HeaderTooLarge), false);
        return;
    }
    const http::request_header<>& header = parser_->get().base();
    if (!HasSoundFraming(header) || !ReadMarks(header, request_.marks)) {
        Answer(ErrorReply(ServerCode::BadRequest), false);
        return;
    }
    if (!Gate::MayEnter(access_, header.method_string(), header.target())) {
        Answer(ErrorReply(ServerCode::NotAllowed), false);
        return;
    }
    if (draining_) {
        Answer(ErrorReply(ServerCode::Ending), false);
        return;
    }
    // All that counts is taken from the header now: fields behind the body change nothing.
    request_.verb = std::string(header.method_string());
    request_.target = std::string(header.target());
    request_.hasContentType = header.count(http::field::content_type) > 0;
    request_.contentType = std::string(header[http::field::content_type]);
    request_.hasContentEncoding = header.count(http::field::content_encoding) > 0;
    keepOpen_ = parser_->get().keep_alive();
    if (header.version() > 10 && EqualIgnoringCase(std::string_view(header[http::field::expect]), "100-continue")) {
        asio::async_write(socket_, asio::buffer(kContinue.data(), kContinue.size()),
                          [self = shared_from_this()](Error failed, std::size_t) {
                              if (self->state_ == State::Reading) {
                                  failed ? self->Close() : self->ReadBody();
                              }
                          });
        return;
    }
    ReadBody();
}

void Connection::ReadBody() {
    http::async_read(socket_, buffer_, *parser_,
                     [self = shared_from_this()](Error error, std::size_t) { self->OnRequest(error); });
}

void Connection::OnRequest(Error error) {
    if (state_ != State::Reading) {
        return;
    }
    if (error) {
        OnReadError(error);
        return;
    }
    if (draining_) {
        Answer(ErrorReply(ServerCode::Ending), false);
        return;
    }
    timer_.cancel();
    complete_ = std::chrono::steady_clock::now();
    request_.body = std::move(parser_->get().body());
    Next next = Safely([this] { return services_.gate.Take(access_, request_); });
    WipeRequest();
    if (Work* work = std::get_if<Work>(&next)) {
        Dispatch(std::move(*work));
    } else {
        Answer(std::move(std::get<Reply>(next)), keepOpen_);
    }
}

// A body may hold a password, which need not lie about once the parameters have been read from it.
void Connection::WipeRequest() {
    explicit_bzero(request_.body.data(), request_.body.size());
    request_.body.clear();
    if (buffer_.size() == 0) {
        const auto free = buffer_.prepare(buffer_.capacity());
        explicit_bzero(free.data(), free.size());
    }
    parser_.reset();
}

void Connection::OnReadError(Error error) {
    if (error == asio::error::operation_aborted && draining_) {
        Answer(ErrorReply(ServerCode::Ending), false);
    } else if (error == http::error::header_limit || error == http::error::buffer_overflow) {
        Answer(ErrorReply(parser_->is_header_done() ? ServerCode::BodyTooLarge : ServerCode::HeaderTooLarge), false);
    } else if (error == http::error::body_limit) {
        Answer(ErrorReply(ServerCode::BodyTooLarge), false);
    } else if (error != http::error::end_of_stream &&
               error.category() == make_error_code(http::error::bad_method).category()) {
        Answer(ErrorReply(ServerCode::BadRequest), false);
    } else {
        Close();
    }
}

void Connection::Dispatch(Work work) {
    state_ = State::Calling;
    const auto self = shared_from_this();
    const auto shared = std::make_shared<const Work>(std::move(work));
    // The loop has something to wait for until the answer is there.
    const auto answer = [self, shared, guard = asio::make_work_guard(services_.loop)](Reply reply, bool keepOpen) {
        asio::post(self->services_.loop, [self, shared, keepOpen, reply = std::move(reply)]() mutable {
            self->Finish(*shared, std::move(reply), keepOpen && self->keepOpen_);
        });
    };
    WorkerPool::Job job;
    job.run = [shared, answer] { answer(Safely(shared->run), true); };
    job.refuse = [answer] { answer(ErrorReply(ServerCode::Ending), false); };
    if (!services_.lanes[shared->lane].Submit(job)) {
        Finish(*shared, ErrorReply(draining_ ? ServerCode::Ending : ServerCode::QueueFull), !draining_ && keepOpen_);
    }
}

void Connection::Finish(const Work& work, Reply reply, bool keepOpen) {
    // Also when the client has gone: what was begun for it has to be brought to its end.
    Answer(Safely([&] { return work.finish(std::move(reply)); }), keepOpen);
}

void Connection::Answer(Reply reply, bool keepOpen) {
    using std::chrono::steady_clock;
    const auto due = std::max(steady_clock::now(), reply.notBefore);
    services_.metrics.Count(reply, std::chrono::duration_cast<std::chrono::microseconds>(due - complete_));
    if (state_ == State::Closed) {
        return;
    }
    keepOpen_ = keepOpen;
    if (due != reply.notBefore) {
        Send(std::move(reply));
        return;
    }
    state_ = State::Calling;
    timer_.expires_at(due);
    timer_.async_wait([self = shared_from_this(), reply = std::move(reply)](Error error) mutable {
        if (!error && self->state_ == State::Calling) {
            self->Send(std::move(reply));
        }
    });
}

void Connection::Send(Reply reply) {
    state_ = State::Answering;
    keepOpen_ = keepOpen_ && !draining_;
    answerIsSecret_ = reply.isSecret;
    response_.emplace(static_cast<http::status>(reply.status), 11u);
    response_->set(http::field::content_type, reply.type);
    response_->set(http::field::cache_control, "no-store");
    if (reply.allow != nullptr) {
        response_->set(http::field::allow, reply.allow);
    }
    if (reply.retryAfter > 0) {
        response_->set(http::field::retry_after, std::to_string(reply.retryAfter));
    }
    response_->body() = std::move(reply.body);
    response_->keep_alive(keepOpen_);
    response_->prepare_payload();
    LimitTime(kAnswerLimit);
    http::async_write(socket_, *response_,
                      [self = shared_from_this()](Error error, std::size_t) { self->OnAnswered(error); });
}

void Connection::OnAnswered(Error error) {
    if (state_ != State::Answering) {
        return;
    }
    if (answerIsSecret_) {
        explicit_bzero(response_->body().data(), response_->body().size());
    }
    response_.reset();
    parser_.reset();
    if (error) {
        Close();
    } else if (keepOpen_) {
        WaitForRequest();
    } else {
        Linger();
    }
}

// A client that is still sending would lose the answer if the connection were closed under it.
void Connection::Linger() {
    if (state_ != State::Lingering) {
        state_ = State::Lingering;
        idleSince_ = std::chrono::steady_clock::now();
        buffer_.consume(buffer_.size());
        LimitTime(kLingerLimit);
        Error ignored;
        socket_.shutdown(Socket::shutdown_send, ignored);
    }
    socket_.async_read_some(buffer_.prepare(kBufferLimit / 2), [self = shared_from_this()](Error error, std::size_t) {
        if (self->state_ == State::Lingering) {
            error ? self->Close() : self->Linger();
        }
    });
}

void Connection::LimitTime(std::chrono::milliseconds limit) {
    timer_.expires_after(limit);
    timer_.async_wait([weak = weak_from_this()](Error error) {
        const auto self = weak.lock();
        // A timer that was set anew after it had fired is not over.
        if (self && !error && self->timer_.expiry() <= std::chrono::steady_clock::now()) {
            self->OnTimeOut();
        }
    });
}

void Connection::OnTimeOut() {
    if (state_ == State::Reading) {
        Error ignored;
        socket_.cancel(ignored);
        Answer(ErrorReply(ServerCode::TooSlow), false);
    } else if (state_ == State::Answering || state_ == State::Lingering) {
        Close();
    }
}

void Connection::Close() {
    if (state_ == State::Closed) {
        return;
    }
    state_ = State::Closed;
    timer_.cancel();
    Error ignored;
    socket_.close(ignored);
    services_.closed(*this);
}

void Connection::Drain() {
    draining_ = true;
    if (IsIdle()) {
        Close();
    } else if (state_ == State::Reading) {
        Error ignored;
        socket_.cancel(ignored);
    }
}

}  // namespace appliance
