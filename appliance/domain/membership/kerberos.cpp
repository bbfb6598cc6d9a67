#include "appliance/domain/membership/kerberos.h"

#include <krb5.h>
#include <unistd.h>

#include <cerrno>
#include <cstdlib>
#include <memory>
#include <stdexcept>
#include <system_error>

#include "appliance/base/file.h"
#include "appliance/base/paths.h"
#include "appliance/base/text.h"

namespace appliance {

namespace {

constexpr char kMemoryCache[] = "MEMORY:vorn";
constexpr mode_t kMode = 0644;

// Braces keep an IPv6 address apart from a port.
std::string KdcText(const std::string& kdc) {
    return kdc.find(':') == std::string::npos ? kdc : "[" + kdc + "]";
}

struct FreeContext {
    void operator()(krb5_context context) const {
        krb5_free_context(context);
    }
};
using Context = std::unique_ptr<std::remove_pointer_t<krb5_context>, FreeContext>;

std::string Words(krb5_context context, krb5_error_code code) {
    const char* text = krb5_get_error_message(context, code);
    const std::string words(text);
    krb5_free_error_message(context, text);
    return words;
}

// The entries of a keytab; frees each. Calls `visit` with an entry and its principal's realm, in capitals.
template <typename Visit>
krb5_error_code ForEachEntry(krb5_context context, krb5_keytab keytab, const Visit& visit) {
    krb5_kt_cursor cursor;
    krb5_error_code code = krb5_kt_start_seq_get(context, keytab, &cursor);
    if (code != 0) {
        return code;
    }
    krb5_keytab_entry entry;
    while ((code = krb5_kt_next_entry(context, keytab, &entry, &cursor)) == 0) {
        visit(entry, Upper({entry.principal->realm.data, entry.principal->realm.length}));
        krb5_free_keytab_entry_contents(context, &entry);
    }
    krb5_kt_end_seq_get(context, keytab, &cursor);
    return code == KRB5_KT_END ? 0 : code;
}

struct CloseKeytab {
    krb5_context context;
    void operator()(krb5_keytab keytab) const {
        krb5_kt_close(context, keytab);
    }
};
using Keytab = std::unique_ptr<std::remove_pointer_t<krb5_keytab>, CloseKeytab>;

Keytab OpenKeytab(krb5_context context, const std::string& path) {
    krb5_keytab raw = nullptr;
    krb5_kt_resolve(context, ("FILE:" + path).c_str(), &raw);
    return Keytab(raw, CloseKeytab{context});
}

}  // namespace

std::string WriteKerberosConfiguration(const std::string& folder, const std::string& realm, const std::string& kdc) {
    const std::string name = Upper(realm);
    if (!IsDnsName(realm) ||
        (!kdc.empty() && (HasControlBytes(kdc) || kdc.find_first_of(" {}#;") != std::string::npos))) {
        throw std::system_error(EINVAL, std::generic_category(), "Kerberos configuration");
    }
    std::string text =
        "[libdefaults]\n"
        "    default_realm = " +
        name +
        "\n"
        "    dns_lookup_realm = false\n"
        "    dns_lookup_kdc = true\n"
        "    dns_canonicalize_hostname = false\n"
        "    rdns = false\n"
        "    udp_preference_limit = 1\n"
        "    ticket_lifetime = 10h\n"
        "    renew_lifetime = 0\n"
        "    forwardable = false\n";
    if (!kdc.empty()) {
        text += "[realms]\n    " + name + " = {\n        kdc = " + KdcText(kdc) +
                // Else DNS is asked after each answer whether this was the primary one.
                "\n        primary_kdc = " + KdcText(kdc) + "\n    }\n";
    }
    text += "[domain_realm]\n    ." + Lower(realm) + " = " + name + "\n    " + Lower(realm) + " = " + name + "\n";
    const std::string path = folder + "/krb5.conf";
    if (const std::error_code error = ReplaceFile(path, text, kMode)) {
        throw std::system_error(error, path);
    }
    return path;
}

void UseKerberosConfiguration(const std::string& path) {
    setenv("KRB5_CONFIG", path.c_str(), 1);
}

std::string TakeMachineTicket(const std::string& account, const std::string& realm, bool& keyIsWrong) {
    keyIsWrong = false;
    krb5_context raw = nullptr;
    if (krb5_error_code code = krb5_init_context(&raw); code != 0) {
        return Words(nullptr, code);
    }
    const Context context(raw);
    krb5_principal principal = nullptr;
    krb5_keytab keytab = nullptr;
    krb5_ccache cache = nullptr;
    krb5_creds credentials{};
    bool filled = false;
    const std::string name = account + "@" + Upper(realm);
    const std::string keytabName = "FILE:" + Path(kKeytab);
    krb5_error_code code = krb5_parse_name(context.get(), name.c_str(), &principal);
    if (code == 0) {
        code = krb5_kt_resolve(context.get(), keytabName.c_str(), &keytab);
    }
    if (code == 0) {
        code = krb5_get_init_creds_keytab(context.get(), &credentials, principal, keytab, 0, nullptr, nullptr);
        filled = code == 0;
        keyIsWrong = code == KRB5KDC_ERR_PREAUTH_FAILED || code == KRB5_KT_NOTFOUND || code == KRB5_KT_KVNONOTFOUND ||
                     code == KRB5KRB_AP_ERR_BAD_INTEGRITY || code == ENOENT;
    }
    if (code == 0) {
        code = krb5_cc_resolve(context.get(), kMemoryCache, &cache);
    }
    if (code == 0) {
        code = krb5_cc_initialize(context.get(), cache, principal);
    }
    if (code == 0) {
        code = krb5_cc_store_cred(context.get(), cache, &credentials);
    }
    const std::string reason = code == 0 ? "" : Words(context.get(), code);
    if (filled) {
        krb5_free_cred_contents(context.get(), &credentials);
    }
    if (cache != nullptr) {
        krb5_cc_close(context.get(), cache);  // the tickets stay as long as the process
    }
    if (keytab != nullptr) {
        krb5_kt_close(context.get(), keytab);
    }
    krb5_free_principal(context.get(), principal);
    if (code == 0) {
        setenv("KRB5CCNAME", kMemoryCache, 1);
    }
    return reason;
}

void RemoveRealmFromKeytab(const std::string& path, const std::string& realm) {
    if (access(path.c_str(), F_OK) != 0) {
        return;
    }
    krb5_context raw = nullptr;
    if (krb5_init_context(&raw) != 0) {
        throw std::system_error(ENOMEM, std::generic_category(), path);
    }
    const Context context(raw);
    // A keytab is changed while nobody else reads it by making a new one with the keys that stay.
    const std::string temporary = path + ".vorn-new";
    unlink(temporary.c_str());
    int kept = 0;
    krb5_error_code code = 0;
    {
        const Keytab from = OpenKeytab(raw, path);
        const Keytab to = OpenKeytab(raw, temporary);
        if (!from || !to) {
            throw std::system_error(EIO, std::generic_category(), path);
        }
        krb5_error_code added = 0;
        code = ForEachEntry(raw, from.get(), [&](krb5_keytab_entry& entry, const std::string& owner) {
            if (owner != Upper(realm)) {
                ++kept;
                added = added != 0 ? added : krb5_kt_add_entry(raw, to.get(), &entry);
            }
        });
        code = code != 0 ? code : added;
    }
    if (code != 0) {
        unlink(temporary.c_str());
        throw std::runtime_error(path + ": " + Words(raw, code));
    }
    const std::error_code error = kept == 0 ? RemoveFile(path) : RenameFile(temporary, path);
    if (error) {
        unlink(temporary.c_str());
        throw std::system_error(error, path);
    }
}

}  // namespace appliance
