#include "appliance/web/server_codes.h"

#include "appliance/web/limits.h"

namespace appliance {

int HttpStatus(ServerCode code) {
    switch (code) {
        case ServerCode::BadRequest:
        case ServerCode::BadJson:
        case ServerCode::JsonTooDeep:
        case ServerCode::DuplicateKey:
        case ServerCode::NoObject:
        case ServerCode::BadParameter:
            return 400;
        case ServerCode::NotAllowed:
        case ServerCode::NoSession:
        case ServerCode::WrongCredentials:
        case ServerCode::BadLink:
            return 401;
        case ServerCode::WrongCsrfToken:
        case ServerCode::CrossSite:
            return 403;
        case ServerCode::NoSuchApi:
        case ServerCode::NoSuchMethod:
        case ServerCode::NoSuchVersion:
        case ServerCode::NoSuchPage:
            return 404;
        case ServerCode::WrongVerb:
            return 405;
        case ServerCode::TooSlow:
            return 408;
        case ServerCode::HeaderTooLarge:
        case ServerCode::BodyTooLarge:
            return 413;
        case ServerCode::WrongType:
            return 415;
        case ServerCode::TooManyAttempts:
            return 429;
        case ServerCode::ModuleException:
        case ServerCode::NoAnswer:
            return 500;
        case ServerCode::QueueFull:
        case ServerCode::Ending:
        case ServerCode::TooManyConnections:
        case ServerCode::LogInImpossible:
        case ServerCode::ServerUnreachable:
            return 503;
    }
    return 500;
}

std::string Describe(ServerCode code) {
    switch (code) {
        case ServerCode::BadRequest:
            return "no HTTP request that this server takes";
        case ServerCode::BadJson:
            return "the body is no JSON text";
        case ServerCode::JsonTooDeep:
            return "the body has more than " + std::to_string(kJsonDepth) + " levels";
        case ServerCode::DuplicateKey:
            return "an object of the body holds a key twice";
        case ServerCode::NoObject:
            return "the body is no JSON object";
        case ServerCode::NotAllowed:
            return "only the administrator may call this server";
        case ServerCode::BadParameter:
            return "a parameter is missing or of the wrong type";
        case ServerCode::NoSuchApi:
            return "no such API";
        case ServerCode::NoSuchMethod:
            return "the API has no such method";
        case ServerCode::NoSuchVersion:
            return "the method has no such version";
        case ServerCode::NoSuchPage:
            return "nothing is served under this path";
        case ServerCode::WrongVerb:
            return "wrong HTTP method: calls are POST, descriptions are GET";
        case ServerCode::TooSlow:
            return "the request did not arrive in time";
        case ServerCode::HeaderTooLarge:
            return "the header is larger than " + std::to_string(kHeaderLimit) + " bytes";
        case ServerCode::BodyTooLarge:
            return "the body is larger than " + std::to_string(kBodyLimit) + " bytes";
        case ServerCode::WrongType:
            return "the body must be of type application/json";
        case ServerCode::NoSession:
            return "no session, or it has ended";
        case ServerCode::WrongCsrfToken:
            return "the request does not carry the token of its session";
        case ServerCode::WrongCredentials:
            return "wrong user or password, or no administrator";
        case ServerCode::TooManyAttempts:
            return "too many log-ins have failed; try again later";
        case ServerCode::BadLink:
            return "the link is used up, too old or wrong";
        case ServerCode::LogInImpossible:
            return "nobody can log in now; the log has more";
        case ServerCode::ModuleException:
            return "the module failed; the log has more";
        case ServerCode::NoAnswer:
            return "the module gave no answer";
        case ServerCode::QueueFull:
            return "too many calls are waiting";
        case ServerCode::Ending:
            return "the server is ending";
        case ServerCode::TooManyConnections:
            return "too many connections";
        case ServerCode::ServerUnreachable:
            return "the appliance's server does not answer";
        case ServerCode::CrossSite:
            return "a page of another address sent the request";
    }
    return "unknown";
}

}  // namespace appliance
