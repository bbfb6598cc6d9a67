#include "appliance/httpd/door_certificate.h"

#include <utility>

#include "appliance/base/log.h"

namespace appliance {

DoorCertificate::DoorCertificate(CertificateFiles files, bool isOwn) : files_(std::move(files)), isOwn_(isOwn) {}

bool DoorCertificate::Load(std::string& reason) {
    const CertificateState state = isOwn_ ? ExamineCertificate(files_) : CertificateState::Good;
    if (state != CertificateState::Good) {
        const char* why = state == CertificateState::Missing   ? "none is there yet"
                          : state == CertificateState::Damaged ? "the one that is there can't be used"
                                                               : "the one that is there ends soon";
        if (MakeCertificate(files_, NamesOfMachine(), reason)) {
            Log(LOG_NOTICE, "made a certificate, " + files_.certificate + ": " + why);
        } else if (state == CertificateState::EndsSoon) {
            Log(LOG_ERR, reason);
        } else {
            return false;
        }
    }
    TlsContext context = MakeTlsContext(files_.certificate, files_.key, reason);
    if (context == nullptr) {
        return false;
    }
    context_ = std::move(context);
    return true;
}

void DoorCertificate::Renew() {
    std::string reason;
    if (isOwn_ && ExamineCertificate(files_) == CertificateState::EndsSoon && !Load(reason)) {
        Log(LOG_ERR, reason);
    }
}

}  // namespace appliance
