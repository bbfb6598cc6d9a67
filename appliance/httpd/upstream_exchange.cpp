#include "appliance/httpd/upstream_exchange.h"

#include <string.h>
#include <sys/socket.h>

#include <algorithm>
#include <array>
#include <boost/asio/buffer.hpp>
#include <boost/beast/http/error.hpp>
#include <boost/beast/http/field.hpp>
#include <cerrno>
#include <string_view>
#include <utility>

#include "appliance/base/text.h"
#include "appliance/httpd/door_limits.h"

namespace appliance {
namespace {

namespace http = boost::beast::http;
using Error = boost::system::error_code;

constexpr std::size_t kPiece = std::size_t{64} << 10;        // bytes that are read at a time
constexpr std::size_t kMostUnread = std::size_t{128} << 10;  // bytes that the parser may leave for later
constexpr std::size_t kLongestField = 64;

std::string_view View(boost::beast::string_view text) {
    return {text.data(), text.size()};
}

std::string WriteRequest(const BackendRequest& request) {
    std::string text;
    text.reserve(512 + request.body.size());
    text += request.verb + " " + request.target + " HTTP/1.1\r\nHost: localhost\r\n";
    const auto add = [&text](std::string_view name, std::string_view value) {
        if (!value.empty()) {
            text += name;
            text += ": ";
            text += value;
            text += "\r\n";
        }
    };
    add("Vorn-Session", request.session);
    add("Vorn-Csrf", request.csrf);
    add("Vorn-Client", request.client);
    add("Vorn-Background", request.background ? "1" : "");
    if (request.verb == "POST") {
        add("Content-Type", "application/json");
        add("Content-Length", std::to_string(request.body.size()));
    }
    text += "\r\n";
    text += request.body;
    return text;
}

bool IsPlainField(std::string_view value) {
    return value.size() <= kLongestField && std::all_of(value.begin(), value.end(), [](char letter) {
               return (letter >= '0' && letter <= '9') || (letter >= 'A' && letter <= 'Z') || letter == ',' ||
                      letter == ' ';
           });
}

}  // namespace

UpstreamExchange::UpstreamExchange(Owner& owner, const BackendRequest& request, Backend::Handler handler,
                                   std::chrono::milliseconds connectLimit)
    : owner_(owner),
      handler_(std::move(handler)),
      isRepeatable_(request.verb == "GET"),
      connectEnd_(Clock::now() + std::min(connectLimit, request.limit)),
      end_(Clock::now() + request.limit),
      text_(WriteRequest(request)) {}

UpstreamExchange::~UpstreamExchange() {
    // It may hold a password and tokens.
    explicit_bzero(text_.data(), text_.size());
    explicit_bzero(unread_.data(), unread_.size());
}

void UpstreamExchange::Start() {
    Connect(true);
}

void UpstreamExchange::Abandon() {
    state_ = State::Ended;
    socket_.reset();
}

void UpstreamExchange::Connect(bool mayReuse) {
    state_ = State::Connecting;
    mayReuse_ = mayReuse;
    isReused_ = mayReuse;
    sent_ = 0;
    unread_.clear();
    parser_.emplace();
    parser_->header_limit(static_cast<std::uint32_t>(kHeaderLimit));
    parser_->body_limit(kAnswerSize);
    parser_->eager(true);
    socket_ = owner_.Connect(isReused_);
    if (socket_ != nullptr) {
        state_ = State::Sending;
        Send();
    } else if (errno != EAGAIN) {
        End(nullptr, {});
    }
}

void UpstreamExchange::Send() {
    while (sent_ < text_.size()) {
        const ssize_t some = send(socket_->native_handle(), text_.data() + sent_, text_.size() - sent_, MSG_NOSIGNAL);
        if (some >= 0) {
            sent_ += static_cast<std::size_t>(some);
        } else if (errno == EAGAIN) {
            WaitFor(Socket::wait_write);
            return;
        } else if (errno != EINTR) {
            Lost();
            return;
        }
    }
    state_ = State::Receiving;
    WaitFor(Socket::wait_read);
}

void UpstreamExchange::WaitFor(Socket::wait_type what) {
    socket_->async_wait(what, [self = shared_from_this()](Error error) {
        if (error) {
            return;
        }
        if (self->state_ == State::Sending) {
            self->Send();
        } else if (self->state_ == State::Receiving) {
            self->Receive();
        }
    });
}

void UpstreamExchange::Receive() {
    static std::array<char, kPiece> piece;  // one thread reads, and one after the other
    for (;;) {
        const ssize_t got = recv(socket_->native_handle(), piece.data(), piece.size(), 0);
        if (got > 0) {
            const bool parsed = Parse(piece.data(), static_cast<std::size_t>(got));
            explicit_bzero(piece.data(), static_cast<std::size_t>(got));
            if (!parsed) {
                End(nullptr, {});
                return;
            }
            if (parser_->is_done()) {
                Finish();
                return;
            }
        } else if (got < 0 && errno == EAGAIN) {
            WaitFor(Socket::wait_read);
            return;
        } else if (got == 0 || errno != EINTR) {
            Lost();
            return;
        }
    }
}

// False for what is no answer.
bool UpstreamExchange::Parse(const char* bytes, std::size_t size) {
    if (!owner_.KeepBytes(size)) {
        return false;
    }
    kept_ += size;
    unread_.append(bytes, size);
    std::size_t place = 0;
    Error error;
    while (place < unread_.size() && !parser_->is_done()) {
        const std::size_t taken =
            parser_->put(boost::asio::buffer(unread_.data() + place, unread_.size() - place), error);
        place += taken;
        if (error == http::error::need_more) {
            break;
        }
        if (error || taken == 0) {
            return false;
        }
    }
    explicit_bzero(unread_.data(), place);
    unread_.erase(0, place);
    // An answer without a length would end with the connection, and so does one that was cut off.
    if (parser_->is_header_done() &&
        parser_->get().count(http::field::content_length) + parser_->get().count(http::field::transfer_encoding) != 1) {
        return false;
    }
    return unread_.size() <= kMostUnread;
}

bool UpstreamExchange::TakeFields(BackendReply& reply) const {
    const auto& answer = parser_->get();
    reply.status = static_cast<int>(answer.result_int());
    if (reply.status < 200 || reply.status > 599) {
        return false;
    }
    const std::string_view type = View(answer[http::field::content_type]);
    reply.isJson = EqualIgnoringCase(Trim(type.substr(0, type.find(';'))), "application/json");
    const std::string_view wait = View(answer[http::field::retry_after]);
    if (!wait.empty() && wait.size() < 10 && wait.find_first_not_of("0123456789") == std::string_view::npos) {
        reply.retryAfter = wait;
    }
    const std::string_view allow = View(answer[http::field::allow]);
    if (IsPlainField(allow)) {
        reply.allow = allow;
    }
    return true;
}

void UpstreamExchange::Finish() {
    BackendReply reply;
    if (!TakeFields(reply)) {
        End(nullptr, {});
        return;
    }
    reply.outcome = BackendReply::Outcome::Answered;
    reply.body = std::move(parser_->get().body());
    reply.storage = owner_.HandOverBytes(std::exchange(kept_, 0));
    const bool mayBeUsedAgain = unread_.empty() && parser_->keep_alive();
    End(mayBeUsedAgain ? std::move(socket_) : nullptr, std::move(reply));
}

// The connection is gone. A used one may have ended just before, and then the request goes on a new one, unless that
// could do twice what is to be done once.
void UpstreamExchange::Lost() {
    const bool nothingCame = unread_.empty() && !parser_->got_some();
    if (isReused_ && nothingCame && (isRepeatable_ || sent_ == 0)) {
        Connect(false);
    } else {
        End(nullptr, {});
    }
}

void UpstreamExchange::Tick(Clock::time_point now) {
    if (state_ == State::Ended) {
        return;
    }
    if (now >= end_ || (state_ == State::Connecting && now >= connectEnd_)) {
        End(nullptr, {});
    } else if (state_ == State::Connecting) {
        Connect(mayReuse_);
    }
}

void UpstreamExchange::End(std::unique_ptr<Socket> socket, BackendReply reply) {
    if (state_ == State::Ended) {
        return;
    }
    state_ = State::Ended;
    owner_.ReleaseBytes(std::exchange(kept_, 0));
    const auto self = shared_from_this();
    socket_.reset();
    owner_.Ended(*this, std::move(socket), std::move(reply));
}

}  // namespace appliance
