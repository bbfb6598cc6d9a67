// What the server in front of this one says of a browser's request, in fields of the header.

#ifndef VORN_APPLIANCE_VORND_DOOR_MARKS_H
#define VORN_APPLIANCE_VORND_DOOR_MARKS_H

#include <boost/beast/http/fields.hpp>
#include <boost/beast/http/message.hpp>
#include <string>
#include <string_view>

namespace appliance {

struct DoorMarks {
    std::string session;      // Vorn-Session: a token, or empty
    std::string csrf;         // Vorn-Csrf: likewise
    std::string client;       // Vorn-Client: the browser's address, or empty
    bool background = false;  // Vorn-Background: 1: no use of the session
};

// Reads one of these fields (its name in any case) into `marks`. A value that can't be one counts as none. Other fields
// are passed over.
void ReadMark(std::string_view name, std::string_view value, DoorMarks& marks);

// Reads all of a header. False when one of them stands there twice: then it is not clear for whom the request is.
bool ReadMarks(const boost::beast::http::request_header<>& header, DoorMarks& marks);

}  // namespace appliance

#endif
