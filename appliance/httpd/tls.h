// What TLS connections have in common: the certificate and what is allowed.

#ifndef VORN_APPLIANCE_HTTPD_TLS_H
#define VORN_APPLIANCE_HTTPD_TLS_H

#include <openssl/ssl.h>

#include <memory>
#include <string>

namespace appliance {

struct FreeTlsContext {
    void operator()(SSL_CTX* context) const {
        SSL_CTX_free(context);
    }
};
using TlsContext = std::unique_ptr<SSL_CTX, FreeTlsContext>;

// TLS 1.2 and 1.3 with ephemeral keys and authenticated ciphers, HTTP/1.1 alone. The certificate's file may hold a chain.
// Null, and the reason in one line, when the files are not right.
TlsContext MakeTlsContext(const std::string& certificate, const std::string& key, std::string& reason);

// What the library says of its last failure, in one line.
std::string TlsReason();

}  // namespace appliance

#endif
