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
    NoSuchApi = 210,           // 404
    NoSuchMethod = 211,        // 404: the API has no such method
    NoSuchVersion = 212,       // 404: the method has no version as low as the one asked for
    NoSuchPage = 213,          // 404: a path outside of what the server serves
    WrongVerb = 214,           // 405: calls are POST requests, descriptions GET requests
    TooSlow = 215,             // 408: the request was not there within kSendLimit; the connection is closed
    HeaderTooLarge = 216,      // 413: the connection is closed
    BodyTooLarge = 217,        // 413: the connection is closed
    WrongType = 218,           // 415: a body of another type than application/json, or encoded
    ModuleException = 230,     // 500: an exception left the module; the log has its text
    NoAnswer = 231,            // 500: the module returned without an answer
    QueueFull = 240,           // 503: kWaitingCalls calls are waiting; try again
    Ending = 241,              // 503: the server is about to end
    TooManyConnections = 242,  // 503: kConnections are open, and none of them is idle
};

// The HTTP status that a code comes with.
int HttpStatus(ServerCode code);

// The code in words, in English, without a full stop.
std::string Describe(ServerCode code);

}  // namespace appliance

#endif
