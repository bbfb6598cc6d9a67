// The certificate that the server makes for itself when none is given.

#ifndef VORN_APPLIANCE_HTTPD_CERTIFICATE_H
#define VORN_APPLIANCE_HTTPD_CERTIFICATE_H

#include <string>
#include <vector>

namespace appliance {

struct CertificateFiles {
    std::string certificate;
    std::string key;
};

// Whom a certificate is for.
struct CertificateNames {
    std::vector<std::string> names;      // DNS names; the first one is the subject's
    std::vector<std::string> addresses;  // IPv4 and IPv6
};

// This machine's: its name, what the table of hosts calls it beside that, "localhost", and the addresses of its
// interfaces but those that hold within one link.
CertificateNames NamesOfMachine();

// How the own files are.
enum class CertificateState { Good, Missing, Damaged, EndsSoon };
CertificateState ExamineCertificate(const CertificateFiles& files);

// Makes a key (ECDSA, P-256) and a certificate signed with it, good for two years. The key's file is 0600 and there
// before the certificate. False, and the reason in one line, when that fails; a pair that no longer fits then counts as
// damaged.
bool MakeCertificate(const CertificateFiles& files, const CertificateNames& names, std::string& reason);

}  // namespace appliance

#endif
