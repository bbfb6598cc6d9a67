// Which certificate the door shows, from its start on and after each change.

#ifndef VORN_APPLIANCE_HTTPD_DOOR_CERTIFICATE_H
#define VORN_APPLIANCE_HTTPD_DOOR_CERTIFICATE_H

#include <openssl/ssl.h>

#include <string>

#include "appliance/httpd/certificate.h"
#include "appliance/httpd/tls.h"

namespace appliance {

class DoorCertificate {
public:
    // Files that were given and are only read, or with `isOwn` the server's own, which are made when they are missing,
    // damaged or about to end.
    DoorCertificate(CertificateFiles files, bool isOwn);

    // Reads the files anew. False, and the reason in one line, when they are not right: the one before stays in use.
    bool Load(std::string& reason);
    // Makes the own one anew when its end is near, and loads it. What fails is logged; there is another time.
    void Renew();

    // For new connections; those that are open keep theirs. Null before Load.
    SSL_CTX* context() const {
        return context_.get();
    }
    bool isOwn() const {
        return isOwn_;
    }

private:
    const CertificateFiles files_;
    const bool isOwn_;
    TlsContext context_;
};

}  // namespace appliance

#endif
