#include "appliance/vornd/session_routes.h"

#include <string.h>

#include <array>
#include <chrono>
#include <exception>
#include <optional>
#include <utility>

#include "appliance/base/log.h"

namespace appliance {
namespace {

using Clock = std::chrono::steady_clock;

constexpr const char* kLinkUser = "root";  // who makes a link is root

std::string ClientName(const DoorMarks& marks) {
    return marks.client.empty() ? "an unknown address" : marks.client;
}

// Takes a text out of the parameters, and out of their memory.
std::optional<Secret> TakeText(Json::Value& parameters, const char* name) {
    Json::Value& value = parameters[name];
    const char* begin = nullptr;
    const char* end = nullptr;
    if (!value.isString() || !value.getString(&begin, &end)) {
        return std::nullopt;
    }
    const auto size = static_cast<std::size_t>(end - begin);
    Secret text(std::string_view(begin, size));
    explicit_bzero(const_cast<char*>(begin), size);  // it is the value's own copy
    return text;
}

Reply Named(Reply reply, const char* method) {
    reply.api = "session";
    reply.method = method;
    return reply;
}

}  // namespace

struct SessionRoutes::LogIn {
    std::string user;
    Secret password;
    DoorMarks marks;
    std::string userKey;  // as the throttle knows them
    std::string addressKey;
    Clock::time_point begun = Clock::now();
    std::optional<Verdict> verdict;
};

SessionRoutes::SessionRoutes(SessionStore& sessions, const SessionClock& clock, Authenticator authenticate)
    : sessions_(sessions), links_(clock), throttle_(clock.running), authenticate_(std::move(authenticate)) {}

Next SessionRoutes::Take(Access access, const WebRequest& request) {
    struct Route {
        const char* path;
        const char* verb;
        const char* method;
    };
    constexpr std::array<Route, 5> kRoutes{{{"/session", "GET", "show"},
                                            {"/session/login", "POST", "login"},
                                            {"/session/link", "POST", "link"},
                                            {"/session/logout", "POST", "logout"},
                                            {"/session/new-link", "POST", "new-link"}}};
    for (const Route& route : kRoutes) {
        if (request.target != route.path) {
            continue;
        }
        if (request.verb != route.verb) {
            return Named(ErrorReply(ServerCode::WrongVerb, route.verb), route.method);
        }
        const std::string_view method = route.method;
        Next next = method == "show"     ? Show(request)
                    : method == "login"  ? TakeLogIn(request)
                    : method == "link"   ? TakeLink(request)
                    : method == "logout" ? LogOut(request)
                                         : MakeLink(access);
        if (Work* work = std::get_if<Work>(&next)) {
            work->finish = [finish = std::move(work->finish), name = route.method](Reply reply) {
                return Named(finish(std::move(reply)), name);
            };
            return next;
        }
        return Named(std::move(std::get<Reply>(next)), route.method);
    }
    return ErrorReply(access == Access::Administrator ? ServerCode::NoSuchPage : ServerCode::NotAllowed);
}

Next SessionRoutes::Show(const WebRequest& request) {
    const std::optional<SessionStore::View> session = sessions_.Find(request.marks.session);
    if (!session) {
        return ErrorReply(ServerCode::NoSession);
    }
    const bool counts = !request.marks.background;
    sessions_.Enter(session->id, counts);
    sessions_.Leave(session->id, counts);
    Json::Value data(Json::objectValue);
    data["csrf"] = session->csrf;
    data["user"] = session->user;
    data["idle_seconds"] = kSessionIdle;
    data["expires"] = session->expires;
    return SuccessReply(data);
}

Next SessionRoutes::TakeLogIn(const WebRequest& request) {
    Json::Value parameters;
    if (const std::optional<ServerCode> wrong = ReadBody(request, parameters)) {
        return ErrorReply(*wrong);
    }
    const std::optional<Secret> user = TakeText(parameters, "user");
    std::optional<Secret> password = TakeText(parameters, "password");
    if (!user || !password) {
        return ErrorReply(ServerCode::BadParameter);
    }
    const auto logIn = std::make_shared<LogIn>();
    logIn->user = user->view();
    logIn->password = std::move(*password);
    logIn->marks = request.marks;
    // What can't be a user is one user for the counts.
    const bool canBe = CanBeUser(logIn->user);
    logIn->userKey = canBe ? logIn->user : std::string();
    logIn->addressKey = ThrottledAddress(request.marks.client);
    if (const std::int64_t wait = throttle_.Begin(logIn->addressKey, logIn->userKey); wait > 0) {
        Reply reply = ErrorReply(ServerCode::TooManyAttempts);
        reply.retryAfter = wait;
        return reply;
    }
    if (!canBe || !CanBePassword(logIn->password.view())) {
        throttle_.Ended(logIn->addressKey, logIn->userKey, LoginThrottle::Outcome::Failure);
        return Refuse(*logIn, canBe ? "no possible password" : "no possible user");
    }
    Work work;
    work.lane = Lane::LogIns;
    work.run = [this, logIn] {
        logIn->begun = Clock::now();
        try {
            logIn->verdict = authenticate_(logIn->user, logIn->password);
        } catch (const std::exception& error) {
            logIn->verdict = Verdict{Verdict::Kind::Failed, error.what()};
        }
        logIn->password = Secret();
        return Reply();
    };
    work.finish = [this, logIn](Reply reply) { return FinishLogIn(*logIn, std::move(reply)); };
    return work;
}

Reply SessionRoutes::FinishLogIn(LogIn& logIn, Reply reply) {
    using Kind = Verdict::Kind;
    using Outcome = LoginThrottle::Outcome;
    const Outcome outcome = !logIn.verdict || logIn.verdict->kind == Kind::Failed ? Outcome::Unknown
                            : logIn.verdict->kind == Kind::Accepted               ? Outcome::Success
                                                                                  : Outcome::Failure;
    throttle_.Ended(logIn.addressKey, logIn.userKey, outcome);
    if (!logIn.verdict) {
        return reply;  // it was not its turn: there are too many, or the server ends
    }
    switch (logIn.verdict->kind) {
        case Kind::Accepted:
            return Begin(logIn.user, logIn.marks, "a password");
        case Kind::Refused:
            return Refuse(logIn, logIn.verdict->reason);
        case Kind::Failed:
            break;
    }
    Log(LOG_ERR, "passwords can't be checked: " + logIn.verdict->reason);
    return ErrorReply(ServerCode::LogInImpossible);
}

Reply SessionRoutes::Refuse(const LogIn& logIn, const std::string& reason) const {
    // A text that can be no user's name may be a password in the wrong place.
    Log(LOG_NOTICE, (CanBeUser(logIn.user) ? "log-in of " + logIn.user : std::string("a log-in")) + " from " +
                        ClientName(logIn.marks) + " refused: " + reason);
    Reply reply = ErrorReply(ServerCode::WrongCredentials);
    const auto took = Clock::now() - logIn.begun;
    reply.notBefore = logIn.begun + (took / kRefusalStep + 1) * kRefusalStep;
    return reply;
}

Reply SessionRoutes::Begin(const std::string& user, const DoorMarks& marks, const char* how) {
    // The browser is about to forget the session that it had.
    if (const std::optional<SessionStore::View> former = sessions_.Find(marks.session)) {
        sessions_.End(former->id);
    }
    NewSession session = sessions_.Begin(user);
    Log(LOG_NOTICE, session.user + " has logged in from " + ClientName(marks) + " with " + how);
    Json::Value data(Json::objectValue);
    data["session"] = session.token;
    data["csrf"] = session.csrf;
    data["user"] = session.user;
    data["idle_seconds"] = kSessionIdle;
    data["expires"] = session.expires;
    Reply reply = SuccessReply(data);
    reply.isSecret = true;
    static_cast<void>(TakeText(data, "session"));
    explicit_bzero(session.token.data(), session.token.size());
    return reply;
}

Next SessionRoutes::TakeLink(const WebRequest& request) {
    Json::Value parameters;
    if (const std::optional<ServerCode> wrong = ReadBody(request, parameters)) {
        return ErrorReply(*wrong);
    }
    const std::optional<Secret> token = TakeText(parameters, "token");
    if (!token) {
        return ErrorReply(ServerCode::BadParameter);
    }
    if (!links_.Use(token->view())) {
        Log(LOG_NOTICE, "a link that is used up, too old or wrong came from " + ClientName(request.marks));
        return ErrorReply(ServerCode::BadLink);
    }
    return Begin(kLinkUser, request.marks, "a one-time link");
}

Next SessionRoutes::LogOut(const WebRequest& request) {
    const std::optional<SessionStore::View> session = sessions_.Find(request.marks.session);
    if (!session) {
        return ErrorReply(ServerCode::NoSession);
    }
    if (!IsSame(request.marks.csrf, session->csrf)) {
        return ErrorReply(ServerCode::WrongCsrfToken);
    }
    sessions_.End(session->id);
    Log(LOG_NOTICE, session->user + " has logged out");
    return SuccessReply(Json::Value());
}

Next SessionRoutes::MakeLink(Access access) {
    if (access != Access::Administrator) {
        return ErrorReply(ServerCode::NotAllowed);
    }
    const OneTimeLinks::Link link = links_.Make();
    Log(LOG_NOTICE, "a one-time link has been made");
    Json::Value data(Json::objectValue);
    data["token"] = link.token;
    data["expires"] = link.expires;
    Reply reply = SuccessReply(data);
    reply.isSecret = true;
    return reply;
}

}  // namespace appliance
