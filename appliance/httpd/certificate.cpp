#include "appliance/httpd/certificate.h"

#include <arpa/inet.h>
#include <ifaddrs.h>
#include <netinet/in.h>
#include <openssl/bio.h>
#include <openssl/ec.h>
#include <openssl/err.h>
#include <openssl/evp.h>
#include <openssl/pem.h>
#include <openssl/rand.h>
#include <openssl/x509v3.h>
#include <string.h>
#include <sys/socket.h>
#include <unistd.h>

#include <algorithm>
#include <array>
#include <cerrno>
#include <ctime>
#include <memory>
#include <string_view>

#include "appliance/base/file.h"
#include "appliance/base/text.h"
#include "appliance/httpd/tls.h"

namespace appliance {
namespace {

constexpr long kLifetime = 730L * 24 * 3600;  // seconds
constexpr long kRenewBefore = 30L * 24 * 3600;
constexpr long kClockSlack = 24L * 3600;  // clocks of clients may be behind
constexpr std::size_t kLargestFile = std::size_t{64} << 10;
constexpr std::size_t kMostNames = 32;
constexpr std::size_t kLongestSubject = 64;  // what a certificate's common name may hold

template <auto Function>
struct FreeWith {
    template <typename Object>
    void operator()(Object* object) const {
        Function(object);
    }
};
using Key = std::unique_ptr<EVP_PKEY, FreeWith<EVP_PKEY_free>>;
using Certificate = std::unique_ptr<X509, FreeWith<X509_free>>;
using Memory = std::unique_ptr<BIO, FreeWith<BIO_free_all>>;
using Extension = std::unique_ptr<X509_EXTENSION, FreeWith<X509_EXTENSION_free>>;

void AddOnce(std::vector<std::string>& list, const std::string& text) {
    if (list.size() < kMostNames && std::find(list.begin(), list.end(), text) == list.end()) {
        list.push_back(text);
    }
}

// Names that stand in one line with `name` in the table of hosts.
void AddNamesOfHosts(const std::string& name, std::vector<std::string>& names) {
    std::string table;
    if (ReadFile("/etc/hosts", table, kLargestFile)) {
        return;
    }
    for (std::string& line : Lines(table)) {
        std::replace(line.begin(), line.end(), '\t', ' ');
        const std::vector<std::string> words = Split(line.substr(0, line.find('#')), " ");
        if (std::none_of(words.begin(), words.end(),
                         [&name](const std::string& word) { return EqualIgnoringCase(word, name); })) {
            continue;
        }
        for (std::size_t index = 1; index < words.size(); ++index) {
            if (IsDnsName(words[index])) {
                AddOnce(names, Lower(words[index]));
            }
        }
    }
}

std::string TextOf(const sockaddr& address) {
    std::array<char, INET6_ADDRSTRLEN> text{};
    const void* place = &address;
    if (address.sa_family == AF_INET) {
        inet_ntop(AF_INET, &static_cast<const sockaddr_in*>(place)->sin_addr, text.data(), text.size());
    } else if (address.sa_family == AF_INET6) {
        const in6_addr& bytes = static_cast<const sockaddr_in6*>(place)->sin6_addr;
        if (!IN6_IS_ADDR_LINKLOCAL(&bytes)) {
            inet_ntop(AF_INET6, &bytes, text.data(), text.size());
        }
    }
    return text.data();
}

bool AddExtension(X509* certificate, int kind, const std::string& value) {
    X509V3_CTX context;
    X509V3_set_ctx_nodb(&context);
    X509V3_set_ctx(&context, certificate, certificate, nullptr, nullptr, 0);
    const Extension extension(X509V3_EXT_conf_nid(nullptr, &context, kind, value.c_str()));
    return extension != nullptr && X509_add_ext(certificate, extension.get(), -1) == 1;
}

bool Fill(X509* certificate, EVP_PKEY* key, const CertificateNames& names) {
    std::array<unsigned char, 16> serial{};
    if (RAND_bytes(serial.data(), static_cast<int>(serial.size())) != 1) {
        return false;
    }
    serial[0] = static_cast<unsigned char>((serial[0] & 0x7FU) | 0x40U);  // positive, and never short
    const std::unique_ptr<BIGNUM, FreeWith<BN_free>> number(
        BN_bin2bn(serial.data(), static_cast<int>(serial.size()), nullptr));
    std::string alternatives;
    for (const std::string& name : names.names) {
        alternatives += (alternatives.empty() ? "DNS:" : ",DNS:") + name;
    }
    for (const std::string& address : names.addresses) {
        alternatives += (alternatives.empty() ? "IP:" : ",IP:") + address;
    }
    const std::string subject =
        names.names.empty() || names.names.front().size() > kLongestSubject ? "appliance" : names.names.front();
    X509_NAME* name = X509_get_subject_name(certificate);
    return number != nullptr && BN_to_ASN1_INTEGER(number.get(), X509_get_serialNumber(certificate)) != nullptr &&
           X509_set_version(certificate, X509_VERSION_3) == 1 &&
           X509_gmtime_adj(X509_getm_notBefore(certificate), -kClockSlack) != nullptr &&
           X509_gmtime_adj(X509_getm_notAfter(certificate), kLifetime) != nullptr &&
           X509_NAME_add_entry_by_NID(name, NID_commonName, MBSTRING_UTF8,
                                      static_cast<const unsigned char*>(static_cast<const void*>(subject.data())),
                                      static_cast<int>(subject.size()), -1, 0) == 1 &&
           X509_set_issuer_name(certificate, name) == 1 && X509_set_pubkey(certificate, key) == 1 &&
           AddExtension(certificate, NID_basic_constraints, "critical,CA:FALSE") &&
           AddExtension(certificate, NID_key_usage, "critical,digitalSignature") &&
           AddExtension(certificate, NID_ext_key_usage, "serverAuth") &&
           AddExtension(certificate, NID_subject_key_identifier, "hash") &&
           (alternatives.empty() || AddExtension(certificate, NID_subject_alt_name, alternatives)) &&
           X509_sign(certificate, key, EVP_sha256()) > 0;
}

std::string_view ContentOf(BIO* memory) {
    char* bytes = nullptr;
    const long size = BIO_get_mem_data(memory, &bytes);
    return size > 0 ? std::string_view(bytes, static_cast<std::size_t>(size)) : std::string_view();
}

}  // namespace

CertificateNames NamesOfMachine() {
    CertificateNames names;
    std::array<char, 256> host{};
    if (gethostname(host.data(), host.size() - 1) == 0 && IsDnsName(host.data())) {
        const std::string own = Lower(host.data());
        AddOnce(names.names, own);
        AddOnce(names.names, own.substr(0, own.find('.')));
        AddNamesOfHosts(own, names.names);
    }
    AddOnce(names.names, "localhost");
    ifaddrs* interfaces = nullptr;
    if (getifaddrs(&interfaces) == 0) {
        for (const ifaddrs* entry = interfaces; entry != nullptr; entry = entry->ifa_next) {
            const std::string address = entry->ifa_addr != nullptr ? TextOf(*entry->ifa_addr) : std::string();
            if (!address.empty()) {
                AddOnce(names.addresses, address);
            }
        }
        freeifaddrs(interfaces);
    }
    return names;
}

CertificateState ExamineCertificate(const CertificateFiles& files) {
    std::string text;
    const std::error_code error = ReadFile(files.certificate, text, kLargestFile);
    if (error || access(files.key.c_str(), F_OK) != 0) {
        return error && error.value() != ENOENT ? CertificateState::Damaged : CertificateState::Missing;
    }
    const Memory memory(BIO_new_mem_buf(text.data(), static_cast<int>(text.size())));
    const Certificate certificate(PEM_read_bio_X509(memory.get(), nullptr, nullptr, nullptr));
    std::string reason;
    if (certificate == nullptr || MakeTlsContext(files.certificate, files.key, reason) == nullptr) {
        ERR_clear_error();
        return CertificateState::Damaged;
    }
    std::time_t soon = std::time(nullptr) + kRenewBefore;
    return X509_cmp_time(X509_get0_notAfter(certificate.get()), &soon) > 0 ? CertificateState::Good
                                                                           : CertificateState::EndsSoon;
}

bool MakeCertificate(const CertificateFiles& files, const CertificateNames& names, std::string& reason) {
    ERR_clear_error();
    const Key key(EVP_EC_gen("P-256"));
    const Certificate certificate(X509_new());
    const Memory keyText(BIO_new(BIO_s_secmem()));
    const Memory certificateText(BIO_new(BIO_s_mem()));
    if (key == nullptr || certificate == nullptr || keyText == nullptr || certificateText == nullptr ||
        !Fill(certificate.get(), key.get(), names) ||
        PEM_write_bio_PKCS8PrivateKey(keyText.get(), key.get(), nullptr, nullptr, 0, nullptr, nullptr) != 1 ||
        PEM_write_bio_X509(certificateText.get(), certificate.get()) != 1) {
        reason = "a certificate can't be made: " + TlsReason();
        return false;
    }
    std::error_code error = ReplaceFile(files.key, ContentOf(keyText.get()), 0600);
    if (error) {
        reason = "the key " + files.key + " can't be written: " + error.message();
        return false;
    }
    error = ReplaceFile(files.certificate, ContentOf(certificateText.get()), 0644);
    if (error) {
        reason = "the certificate " + files.certificate + " can't be written: " + error.message();
        return false;
    }
    return true;
}

}  // namespace appliance
