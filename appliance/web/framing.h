// Where a request ends. Two programs that disagree about it take one's request for a part of another's.

#ifndef VORN_APPLIANCE_WEB_FRAMING_H
#define VORN_APPLIANCE_WEB_FRAMING_H

#include <boost/beast/http/fields.hpp>
#include <boost/beast/http/message.hpp>

namespace appliance {

// True when the header leaves no doubt: HTTP/1.0 or 1.1; one Host; at most one Content-Length, or one Transfer-Encoding
// that is exactly "chunked", in HTTP/1.1, and not both.
bool HasSoundFraming(const boost::beast::http::request_header<>& header);

}  // namespace appliance

#endif
