#include "appliance/httpd/site.h"

#include <json/reader.h>
#include <string.h>

#include <algorithm>
#include <memory>
#include <utility>

#include "appliance/base/text.h"
#include "appliance/httpd/header_rules.h"
#include "appliance/web/json_text.h"
#include "appliance/web/limits.h"

namespace appliance {
namespace {

constexpr std::chrono::seconds kHealthLasts{1};
constexpr std::size_t kLongestName = 100;  // of an API, a version or a method
constexpr std::string_view kMetricsType = "text/plain; version=0.0.4; charset=utf-8";
constexpr std::string_view kCookieRules = "; Path=/; Secure; HttpOnly; SameSite=Strict";

bool IsPlainName(std::string_view name) {
    return !name.empty() && name.size() <= kLongestName && std::all_of(name.begin(), name.end(), [](char letter) {
        return (letter >= '0' && letter <= '9') || (letter >= 'A' && letter <= 'Z') ||
               (letter >= 'a' && letter <= 'z') || letter == '.' || letter == '_' || letter == '-';
    });
}

// The method that a path is called with, or null for a path that nothing is passed on for.
const char* VerbOfCall(std::string_view target) {
    if (target == "/session" || target == "/webapi" || target == "/webapi/openapi.json") {
        return "GET";
    }
    if (target == "/session/login" || target == "/session/link" || target == "/session/logout") {
        return "POST";
    }
    constexpr std::string_view kCalls = "/webapi/";
    if (!StartsWith(target, kCalls)) {
        return nullptr;
    }
    const std::vector<std::string> parts = Split(target.substr(kCalls.size()), "/");
    return parts.size() == 3 && std::all_of(parts.begin(), parts.end(), IsPlainName) ? "POST" : nullptr;
}

// Takes the session's token out of the answer to a log-in. Empty when there is none.
std::string TakeSession(std::string& body) {
    Json::Value answer;
    const std::unique_ptr<Json::CharReader> reader(Json::CharReaderBuilder().newCharReader());
    const bool parsed =
        body.size() <= kBodyLimit && reader->parse(body.data(), body.data() + body.size(), &answer, nullptr);
    explicit_bzero(body.data(), body.size());
    if (!parsed || !answer.isObject() || !answer["data"].isObject() || !answer["data"]["session"].isString()) {
        return {};
    }
    std::string token = answer["data"]["session"].asString();
    answer["data"].removeMember("session");
    body = WriteJson(answer);
    return IsToken(token) ? token : std::string();
}

DoorReply FailureOf(BackendReply::Outcome outcome) {
    return DoorError(outcome == BackendReply::Outcome::Busy ? ServerCode::QueueFull : ServerCode::ServerUnreachable);
}

DoorReply ReplyTo(BackendReply answer, bool logIn) {
    if (answer.outcome != BackendReply::Outcome::Answered || !answer.isJson) {
        return FailureOf(answer.outcome);
    }
    DoorReply reply;
    reply.status = answer.status;
    reply.type = kJsonType;
    reply.body = std::move(answer.body);
    reply.storage = std::move(answer.storage);
    reply.fields.emplace_back("Cache-Control", "no-store");
    if (!answer.retryAfter.empty()) {
        reply.fields.emplace_back("Retry-After", answer.retryAfter);
    }
    if (!answer.allow.empty()) {
        reply.fields.emplace_back("Allow", answer.allow);
    }
    if (logIn && reply.status == 200) {
        const std::string token = TakeSession(reply.body);
        if (token.empty()) {
            return FailureOf(BackendReply::Outcome::Unreachable);
        }
        reply.fields.emplace_back("Set-Cookie", std::string(kSessionCookie) + "=" + token + std::string(kCookieRules));
    }
    return reply;
}

}  // namespace

Site::Site(const Page& page, Backend& backend, const DoorLimits& limits, std::function<std::string()> figures)
    : page_(page), backend_(backend), limits_(limits), figures_(std::move(figures)) {}

void Site::Handle(ClientRequest request, Handler handler) {
    const std::string& target = request.target;
    if (const char* verb = VerbOfCall(target)) {
        if (request.verb != verb) {
            handler(WrongVerb(verb));
            return;
        }
        const Cookie cookie = target == "/session/login" || target == "/session/link" ? Cookie::Set
                              : target == "/session/logout"                           ? Cookie::Clear
                                                                                      : Cookie::AsItIs;
        PassOn(verb, request, cookie, std::move(handler));
        return;
    }
    const std::string_view path = std::string_view(target).substr(0, target.find('?'));
    const bool isHealth = path == "/healthz";
    const bool isMetrics = path == "/metrics";
    std::unique_ptr<DoorReply> file = isHealth || isMetrics ? nullptr : page_.Find(path, request.header);
    if (!isHealth && !isMetrics && file == nullptr) {
        handler(DoorError(ServerCode::NoSuchPage));
    } else if (request.verb != "GET" && (request.verb != "HEAD" || isMetrics)) {
        handler(WrongVerb(isMetrics ? "GET" : "GET, HEAD"));
    } else if (isHealth) {
        HandleHealth(std::move(handler));
    } else if (isMetrics) {
        HandleMetrics(request, std::move(handler));
    } else {
        handler(std::move(*file));
    }
}

BackendRequest Site::ToBackend(std::string_view verb, const ClientRequest& request) const {
    BackendRequest passed;
    passed.verb = verb;
    passed.target = request.target;
    passed.session = SessionToken(request.header);
    passed.csrf = TokenField(request.header, "X-CSRF-Token");
    passed.client = request.client.text;
    passed.background = request.header["X-Background"] == "1";
    passed.limit = limits_.upstreamCall;
    return passed;
}

void Site::PassOn(std::string_view verb, ClientRequest& request, Cookie cookie, Handler handler) {
    if (verb == "POST") {
        if (!IsFromOwnPage(request.header, request.origin)) {
            handler(DoorError(ServerCode::CrossSite));
            return;
        }
        if (!HasJsonBody(request.header)) {
            handler(DoorError(ServerCode::WrongType));
            return;
        }
    }
    BackendRequest passed = ToBackend(verb, request);
    if (cookie == Cookie::Set) {
        // A log-in needs no session; vornd ends the one before, if there is one.
        passed.csrf.clear();
    } else if (passed.session.empty()) {
        // Nobody without a session costs vornd a thing.
        handler(DoorError(ServerCode::NoSession));
        return;
    }
    passed.body = std::move(request.body);
    backend_.Ask(std::move(passed), [cookie, handler = std::move(handler)](BackendReply answer) {
        DoorReply reply = ReplyTo(std::move(answer), cookie == Cookie::Set);
        if (cookie == Cookie::Clear && reply.status == 200) {
            reply.fields.emplace_back("Set-Cookie",
                                      std::string(kSessionCookie) + "=; Max-Age=0" + std::string(kCookieRules));
        }
        handler(std::move(reply));
    });
}

void Site::HandleHealth(Handler handler) {
    const auto answer = [](bool healthy) {
        if (!healthy) {
            return DoorError(ServerCode::ServerUnreachable);
        }
        DoorReply reply;
        reply.type = kJsonType;
        reply.body = R"({"status":"ok"})";
        reply.fields.emplace_back("Cache-Control", "no-store");
        return reply;
    };
    if (healthKnown_ && std::chrono::steady_clock::now() - healthSeen_ < kHealthLasts) {
        handler(answer(healthy_));
        return;
    }
    healthWaiters_.emplace_back(
        [answer, handler = std::move(handler), this](const DoorReply&) { handler(answer(healthy_)); });
    if (healthWaiters_.size() > 1) {
        return;
    }
    BackendRequest question;
    question.verb = "GET";
    question.target = "/session";
    question.background = true;
    question.limit = limits_.upstreamProbe;
    // Without a session the answer is a refusal, and that is answer enough.
    backend_.Ask(std::move(question), [this](const BackendReply& reply) {
        OnHealth(reply.outcome == BackendReply::Outcome::Answered && reply.status < 500);
    });
}

void Site::OnHealth(bool healthy) {
    healthKnown_ = true;
    healthy_ = healthy;
    healthSeen_ = std::chrono::steady_clock::now();
    for (const Handler& waiter : std::exchange(healthWaiters_, {})) {
        waiter({});
    }
}

void Site::HandleMetrics(const ClientRequest& request, Handler handler) {
    if (request.client.isLoopback) {
        AnswerMetrics(std::move(handler));
        return;
    }
    BackendRequest question = ToBackend("GET", request);
    if (question.session.empty()) {
        handler(DoorError(ServerCode::NoSession));
        return;
    }
    question.target = "/session";
    question.csrf.clear();
    question.background = true;
    question.limit = limits_.upstreamProbe;
    backend_.Ask(std::move(question), [this, handler = std::move(handler)](const BackendReply& answer) {
        if (answer.outcome != BackendReply::Outcome::Answered) {
            handler(FailureOf(answer.outcome));
        } else if (answer.status != 200) {
            handler(DoorError(ServerCode::NoSession));
        } else {
            AnswerMetrics(handler);
        }
    });
}

void Site::AnswerMetrics(Handler handler) {
    BackendRequest question;
    question.verb = "GET";
    question.target = "/metrics";
    question.background = true;
    question.limit = limits_.upstreamProbe;
    backend_.Ask(std::move(question), [this, handler = std::move(handler)](const BackendReply& answer) {
        const bool isUp = answer.outcome == BackendReply::Outcome::Answered && answer.status == 200;
        DoorReply reply;
        reply.type = kMetricsType;
        reply.fields.emplace_back("Cache-Control", "no-store");
        reply.body = figures_();
        reply.body += "# HELP vorn_up Whether the appliance's server answers.\n# TYPE vorn_up gauge\nvorn_up ";
        reply.body += isUp ? "1\n" : "0\n";
        if (isUp) {
            reply.body += answer.body;
            if (reply.body.back() != '\n') {
                reply.body += '\n';
            }
        }
        handler(std::move(reply));
    });
}

}  // namespace appliance
