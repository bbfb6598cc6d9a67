#include "appliance/vornd/gate.h"

#include <memory>
#include <optional>
#include <utility>

#include "appliance/base/text.h"
#include "appliance/vornd/session_routes.h"

namespace appliance {
namespace {

constexpr std::string_view kFiguresPath = "/metrics";
constexpr std::string_view kSessionPath = "/session";
constexpr std::string_view kApiPath = "/webapi";

// The path itself, or below it.
bool IsUnder(std::string_view target, std::string_view path) {
    return StartsWith(target, path) && (target.size() == path.size() || target[path.size()] == '/');
}

}  // namespace

Gate::Gate(Parts parts) : parts_(std::move(parts)) {}

bool Gate::MayEnter(Access access, std::string_view verb, std::string_view target) {
    switch (access) {
        case Access::None:
            return target == kFiguresPath && verb == "GET";
        case Access::Door:
            return target == kFiguresPath || IsUnder(target, kSessionPath) || IsUnder(target, kApiPath);
        case Access::Administrator:
            return true;
    }
    return false;
}

Next Gate::Take(Access access, const WebRequest& request) {
    if (!MayEnter(access, request.verb, request.target)) {
        return ErrorReply(ServerCode::NotAllowed);
    }
    if (request.target == kFiguresPath) {
        return TakeFigures(request);
    }
    if (IsUnder(request.target, kSessionPath)) {
        return parts_.sessionRoutes.Take(access, request);
    }
    if (access == Access::Door) {
        return TakeInSession(request);
    }
    std::variant<Reply, Call> next = parts_.router.Route(request);
    if (Reply* reply = std::get_if<Reply>(&next)) {
        return std::move(*reply);
    }
    return RunCall(std::move(std::get<Call>(next)));
}

Next Gate::TakeFigures(const WebRequest& request) {
    if (request.verb != "GET") {
        return ErrorReply(ServerCode::WrongVerb, "GET");
    }
    Work work;
    work.lane = Lane::Figures;
    work.run = [this, counts = parts_.metrics.Render(parts_.gauges())] {
        Reply reply;
        reply.type = kFiguresType;
        reply.body = counts + figures_.Text();
        return reply;
    };
    work.finish = [](Reply reply) {
        reply.api = "metrics";
        reply.method = "get";
        return reply;
    };
    return work;
}

Next Gate::RunCall(Call call) const {
    const VORN::APIEntry* method = call.method;
    Work work;
    work.run = [&router = parts_.router, call = std::make_shared<const Call>(std::move(call))] {
        return router.Execute(*call);
    };
    work.finish = [method](Reply reply) {
        reply.api = method->api;
        reply.method = method->method;
        return reply;
    };
    return work;
}

Next Gate::TakeInSession(const WebRequest& request) {
    SessionStore& sessions = parts_.sessions;
    const std::optional<SessionStore::View> session = sessions.Find(request.marks.session);
    if (!session) {
        return ErrorReply(ServerCode::NoSession);
    }
    if (request.verb != "GET" && !IsSame(request.marks.csrf, session->csrf)) {
        return ErrorReply(ServerCode::WrongCsrfToken);
    }
    const bool counts = !request.marks.background;
    sessions.Enter(session->id, counts);
    std::variant<Reply, Call> next = parts_.router.Route(request);
    if (Reply* reply = std::get_if<Reply>(&next)) {
        sessions.Leave(session->id, counts);
        return std::move(*reply);
    }
    Next going = RunCall(std::move(std::get<Call>(next)));
    Work& work = std::get<Work>(going);
    work.finish = [&sessions, id = session->id, counts, finish = std::move(work.finish)](Reply reply) {
        // The call has done what it does; whom it would be told to is gone.
        return finish(sessions.Leave(id, counts) ? std::move(reply) : ErrorReply(ServerCode::NoSession));
    };
    return going;
}

}  // namespace appliance
