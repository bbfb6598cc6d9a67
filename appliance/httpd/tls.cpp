#include "appliance/httpd/tls.h"

#include <openssl/err.h>

#include <array>
#include <string_view>

namespace appliance {
namespace {

constexpr const char* kCiphers =
    "ECDHE-ECDSA-AES128-GCM-SHA256:ECDHE-RSA-AES128-GCM-SHA256:ECDHE-ECDSA-CHACHA20-POLY1305:"
    "ECDHE-RSA-CHACHA20-POLY1305:ECDHE-ECDSA-AES256-GCM-SHA384:ECDHE-RSA-AES256-GCM-SHA384";
constexpr const char* kCiphers13 = "TLS_AES_128_GCM_SHA256:TLS_CHACHA20_POLY1305_SHA256:TLS_AES_256_GCM_SHA384";
constexpr const char* kGroups = "X25519:P-256:P-384";
constexpr std::array<unsigned char, 9> kProtocol{8, 'h', 't', 't', 'p', '/', '1', '.', '1'};

// A client that offers protocols and not this one is told so; one that offers none is served.
int ChooseProtocol(SSL* /*ssl*/, const unsigned char** chosen, unsigned char* length, const unsigned char* offered,
                   unsigned int offeredLength, void* /*unused*/) {
    unsigned char* found = nullptr;
    if (SSL_select_next_proto(&found, length, kProtocol.data(), kProtocol.size(), offered, offeredLength) !=
        OPENSSL_NPN_NEGOTIATED) {
        return SSL_TLSEXT_ERR_ALERT_FATAL;
    }
    *chosen = found;
    return SSL_TLSEXT_ERR_OK;
}

// Nobody is asked for the password of a key.
int NoPassword(char* /*buffer*/, int /*size*/, int /*writing*/, void* /*unused*/) {
    return 0;
}

}  // namespace

std::string TlsReason() {
    const unsigned long error = ERR_peek_last_error();
    const char* reason = ERR_reason_error_string(error);
    std::string text = reason != nullptr ? reason : ERR_SYSTEM_ERROR(error) ? "the file can't be read" : "unknown";
    ERR_clear_error();
    return text;
}

TlsContext MakeTlsContext(const std::string& certificate, const std::string& key, std::string& reason) {
    ERR_clear_error();
    TlsContext context(SSL_CTX_new(TLS_server_method()));
    if (context == nullptr) {
        reason = "TLS can't be set up: " + TlsReason();
        return nullptr;
    }
    SSL_CTX* raw = context.get();
    SSL_CTX_set_options(raw, SSL_OP_NO_COMPRESSION | SSL_OP_NO_RENEGOTIATION | SSL_OP_CIPHER_SERVER_PREFERENCE |
                                 SSL_OP_PRIORITIZE_CHACHA | SSL_OP_IGNORE_UNEXPECTED_EOF | SSL_OP_CLEANSE_PLAINTEXT);
    SSL_CTX_set_mode(raw,
                     SSL_MODE_RELEASE_BUFFERS | SSL_MODE_ENABLE_PARTIAL_WRITE | SSL_MODE_ACCEPT_MOVING_WRITE_BUFFER);
    SSL_CTX_set_read_ahead(raw, 1);
    // Sessions are resumed by tickets that clients keep.
    SSL_CTX_set_session_cache_mode(raw, SSL_SESS_CACHE_OFF);
    SSL_CTX_set_num_tickets(raw, 1);
    constexpr std::string_view kContext = "vorn";
    SSL_CTX_set_session_id_context(raw, static_cast<const unsigned char*>(static_cast<const void*>(kContext.data())),
                                   kContext.size());
    SSL_CTX_set_alpn_select_cb(raw, ChooseProtocol, nullptr);
    SSL_CTX_set_default_passwd_cb(raw, NoPassword);
    if (SSL_CTX_set_min_proto_version(raw, TLS1_2_VERSION) != 1 || SSL_CTX_set_cipher_list(raw, kCiphers) != 1 ||
        SSL_CTX_set_ciphersuites(raw, kCiphers13) != 1 || SSL_CTX_set1_groups_list(raw, kGroups) != 1) {
        reason = "TLS can't be set up: " + TlsReason();
    } else if (SSL_CTX_use_certificate_chain_file(raw, certificate.c_str()) != 1) {
        reason = "the certificate " + certificate + " can't be used: " + TlsReason();
    } else if (SSL_CTX_use_PrivateKey_file(raw, key.c_str(), SSL_FILETYPE_PEM) != 1) {
        const bool isAnother = ERR_GET_LIB(ERR_peek_last_error()) == ERR_LIB_X509;
        const std::string why = TlsReason();
        reason = "the key " + key +
                 (isAnother ? " does not belong to the certificate " + certificate : " can't be used: " + why);
    } else if (SSL_CTX_check_private_key(raw) != 1) {
        // One of another kind is kept beside the certificate until this asks.
        ERR_clear_error();
        reason = "the key " + key + " does not belong to the certificate " + certificate;
    } else {
        return context;
    }
    return nullptr;
}

}  // namespace appliance
