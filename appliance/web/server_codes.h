// Error codes of the server itself, 200 to 299, each with the HTTP status that it comes with. Modules never answer
// these.

#ifndef VORN_APPLIANCE_WEB_SERVER_CODES_H
#define VORN_APPLIANCE_WEB_SERVER_CODES_H

#include <string>

namespace appliance {

enum class ServerCode : int {
    BadRequest = 200,          // 400: no HTTP request as this server takes it; the connection is closed
    BadJson = 201,             // 400: the body is no JSON text
    JsonTooDeep = 202,         // 400: more levels of arrays and objects than kJsonDepth
    DuplicateKey = 203,        // 400: an object of the body holds a key twice
    NoObject = 204,            // 400: the body is JSON, but no object
    NotAllowed = 205,          // 401: neither the administrator nor in a session
    BadParameter = 206,        // 400: a parameter of the log-in is missing or of the wrong type
    NoSuchApi = 210,           // 404
    NoSuchMethod = 211,        // 404: the API has no such method
    NoSuchVersion = 212,       // 404: the method has no version as low as the one asked for
    NoSuchPage = 213,          // 404: a path outside of what the server serves
    WrongVerb = 214,           // 405: calls are POST requests, descriptions GET requests
    TooSlow = 215,             // 408: the request was not there within kSendLimit; the connection is closed
    HeaderTooLarge = 216,      // 413: the connection is closed
    BodyTooLarge = 217,        // 413: the connection is closed
    WrongType = 218,           // 415: a body of another type than application/json, or encoded
    NoSession = 220,           // 401: no session, or one that has ended
    WrongCsrfToken = 221,      // 403: the request does not carry its session's token
    WrongCredentials = 222,    // 401: wrong user or password, or no administrator
    TooManyAttempts = 223,     // 429: with Retry-After
    BadLink = 224,             // 401: a one-time link that is used up, too old or wrong
    LogInImpossible = 225,     // 503: the check of passwords failed or was too slow
    ModuleException = 230,     // 500: an exception left the module; the log has its text
    NoAnswer = 231,            // 500: the module returned without an answer
    QueueFull = 240,           // 503: kWaitingCalls calls are waiting; try again
    Ending = 241,              // 503: the server is about to end
    TooManyConnections = 242,  // 503: kConnections are open, and none of them is idle
    ServerUnreachable = 250,   // 503: of the server for browsers: the appliance's server does not answer
    CrossSite = 251,           // 403: likewise: a page of another address sent the request
};

// The HTTP status that a code comes with.
int HttpStatus(ServerCode code);

// The code in words, in English, without a full stop.
std::string Describe(ServerCode code);

}  // namespace appliance

#endif
