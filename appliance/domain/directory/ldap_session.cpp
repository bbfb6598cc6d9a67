#include "appliance/domain/directory/ldap_session.h"

#include <sys/socket.h>
#include <sys/time.h>

#include <algorithm>
#include <cstdlib>

#include "appliance/base/text.h"
#include "appliance/domain/directory/utf8.h"
#include "appliance/domain/directory/worker.h"

namespace appliance {

namespace {

constexpr int kPageSize = 1000;  // what Active Directory gives at most
constexpr std::chrono::milliseconds kConnectTime{5000};
constexpr std::chrono::milliseconds kBindTime{10000};

// Strength, in bits, that the traffic's protection must have at least: it is sealed, not only signed.
constexpr ber_len_t kSealed = 56;

timeval Time(std::chrono::milliseconds time) {
    timeval value{};
    value.tv_sec = time.count() / 1000;
    value.tv_usec = time.count() % 1000 * 1000;
    return value;
}

void Set(LDAP* session, int option, const void* value) {
    if (ldap_set_option(session, option, value) != LDAP_OPT_SUCCESS) {
        throw DirectoryError(ErrorCode::Internal, "the LDAP library refuses option " + std::to_string(option));
    }
}

// The ticket says all that the server wants to know, so there is nothing to answer.
int AnswerNothing(LDAP* /*session*/, unsigned /*flags*/, void* /*defaults*/, void* /*interaction*/) {
    return LDAP_SUCCESS;
}

struct FreeMessage {
    void operator()(LDAPMessage* message) const {
        ldap_msgfree(message);
    }
};
using Message = std::unique_ptr<LDAPMessage, FreeMessage>;

struct FreeControl {
    void operator()(LDAPControl* control) const {
        ldap_control_free(control);
    }
};

struct FreeControls {
    void operator()(LDAPControl** controls) const {
        ldap_controls_free(controls);
    }
};

struct FreeText {
    void operator()(char* text) const {
        ldap_memfree(text);
    }
};

}  // namespace

std::string LdapEntry::First(const char* attribute) const {
    berval** values = ldap_get_values_len(session_, message_, attribute);
    if (values == nullptr) {
        return "";
    }
    const std::unique_ptr<berval*, void (*)(berval**)> owner(values, ldap_value_free_len);
    return values[0] == nullptr ? "" : std::string(values[0]->bv_val, values[0]->bv_len);
}

LdapSession::LdapSession(const Server& server, std::chrono::milliseconds patience)
    : name_(server.name), patience_(patience) {
    // Nothing that a configuration file or the environment says may change what happens here.
    setenv("LDAPNOINIT", "1", 1);
    const std::string url = "ldap://" +
                            (server.name.find(':') == std::string::npos ? server.name : "[" + server.name + "]") + ":" +
                            std::to_string(server.port);
    LDAP* session = nullptr;
    if (const int result = ldap_initialize(&session, url.c_str()); result != LDAP_SUCCESS) {
        Fail(result, "prepare");
    }
    session_.reset(session);
    const int version = LDAP_VERSION3;
    Set(session, LDAP_OPT_PROTOCOL_VERSION, &version);
    Set(session, LDAP_OPT_REFERRALS, LDAP_OPT_OFF);
    Set(session, LDAP_OPT_X_SASL_NOCANON, LDAP_OPT_ON);
    Set(session, LDAP_OPT_X_SASL_SSF_MIN, &kSealed);
    const timeval connectTime = Time(kConnectTime);
    Set(session, LDAP_OPT_NETWORK_TIMEOUT, &connectTime);
    if (const int result = ldap_connect(session); result != LDAP_SUCCESS) {
        Fail(result, "connect");
    }
    WaitAtMost(std::min(patience, kBindTime));
    if (!server.anonymous) {
        const int result = ldap_sasl_interactive_bind_s(session, nullptr, "GSSAPI", nullptr, nullptr, LDAP_SASL_QUIET,
                                                        AnswerNothing, nullptr);
        if (result != LDAP_SUCCESS) {
            Fail(result, "bind");
        }
    }
    WaitAtMost(patience);
}

void LdapSession::WaitAtMost(std::chrono::milliseconds time) {
    const timeval limit = Time(time);
    Set(session_.get(), LDAP_OPT_TIMEOUT, &limit);
    // Within a sealed packet the library reads on without regard to its own time-outs.
    int descriptor = -1;
    if (ldap_get_option(session_.get(), LDAP_OPT_DESC, &descriptor) != LDAP_OPT_SUCCESS || descriptor < 0 ||
        setsockopt(descriptor, SOL_SOCKET, SO_RCVTIMEO, &limit, sizeof(limit)) != 0 ||
        setsockopt(descriptor, SOL_SOCKET, SO_SNDTIMEO, &limit, sizeof(limit)) != 0) {
        throw DirectoryError(ErrorCode::Internal, name_ + ": no time-out for the connection");
    }
}

void LdapSession::Fail(int result, const std::string& doing, const char* detail) const {
    char* diagnostic = nullptr;
    if (detail == nullptr && session_) {
        ldap_get_option(session_.get(), LDAP_OPT_DIAGNOSTIC_MESSAGE, &diagnostic);
    }
    const std::unique_ptr<char, FreeText> owner(diagnostic);
    const char* more = detail != nullptr ? detail : diagnostic;
    std::string text = name_ + ": " + doing + ": " + ldap_err2string(result);
    if (more != nullptr && *more != '\0') {
        text += ": " + CleanText(more);
    }
    const bool away = result == LDAP_SERVER_DOWN || result == LDAP_CONNECT_ERROR || result == LDAP_UNAVAILABLE;
    const bool late = result == LDAP_TIMEOUT;
    throw DirectoryError(away ? ErrorCode::Unreachable : late ? ErrorCode::TimedOut : ErrorCode::Refused, text);
}

void LdapSession::Search(const LdapSearch& search, const std::function<void(const LdapEntry&)>& take) {
    berval cookie{0, nullptr};
    bool more = true;
    try {
        while (more) {
            more = SearchPage(search, cookie, take);
        }
    } catch (...) {
        ber_memfree(cookie.bv_val);
        throw;
    }
    ber_memfree(cookie.bv_val);
}

bool LdapSession::SearchPage(const LdapSearch& search, berval& cookie,
                             const std::function<void(const LdapEntry&)>& take) {
    LDAPControl* paging = nullptr;
    if (const int result = ldap_create_page_control(session_.get(), kPageSize, &cookie, 1, &paging);
        result != LDAP_SUCCESS) {
        Fail(result, "search");
    }
    const std::unique_ptr<LDAPControl, FreeControl> pagingOwner(paging);
    // A search of one entry needs no pages, and the root entry is given without any.
    LDAPControl* controls[] = {search.wholeTree ? paging : nullptr, nullptr};
    std::vector<std::string> names = search.attributes;
    std::vector<char*> attributes;
    for (std::string& name : names) {
        attributes.push_back(name.data());
    }
    attributes.push_back(nullptr);
    int id = 0;
    if (const int result = ldap_search_ext(
            session_.get(), search.base.c_str(), search.wholeTree ? LDAP_SCOPE_SUBTREE : LDAP_SCOPE_BASE,
            search.filter.c_str(), attributes.data(), 0, controls, nullptr, nullptr, 0, &id);
        result != LDAP_SUCCESS) {
        Fail(result, "search");
    }
    for (;;) {
        timeval wait = Time(patience_);
        LDAPMessage* raw = nullptr;
        const int type = ldap_result(session_.get(), id, LDAP_MSG_ONE, &wait, &raw);
        const Message message(raw);
        if (type == 0) {
            Fail(LDAP_TIMEOUT, "search");
        }
        if (type < 0) {
            int result = LDAP_SERVER_DOWN;
            ldap_get_option(session_.get(), LDAP_OPT_RESULT_CODE, &result);
            Fail(result, "search");
        }
        if (type == LDAP_RES_SEARCH_ENTRY) {
            take(LdapEntry(session_.get(), message.get()));
        } else if (type == LDAP_RES_SEARCH_RESULT) {
            int result = LDAP_OTHER;
            char* text = nullptr;
            LDAPControl** answered = nullptr;
            const int parsed =
                ldap_parse_result(session_.get(), message.get(), &result, nullptr, &text, nullptr, &answered, 0);
            const std::unique_ptr<char, FreeText> textOwner(text);
            const std::unique_ptr<LDAPControl*, FreeControls> answeredOwner(answered);
            if (parsed != LDAP_SUCCESS || result != LDAP_SUCCESS) {
                Fail(parsed != LDAP_SUCCESS ? parsed : result, "search", text);
            }
            if (!search.wholeTree) {
                return false;
            }
            ber_memfree(cookie.bv_val);
            cookie = {0, nullptr};
            LDAPControl* control = ldap_control_find(LDAP_CONTROL_PAGEDRESULTS, answered, nullptr);
            ber_int_t estimate = 0;
            if (control == nullptr ||
                ldap_parse_pageresponse_control(session_.get(), control, &estimate, &cookie) != LDAP_SUCCESS) {
                throw DirectoryError(ErrorCode::BadData,
                                     name_ + ": search: the answer does not say whether it is whole");
            }
            return cookie.bv_len > 0;
        }
    }
}

std::string BaseOfDomain(std::string_view dnsName) {
    std::string base;
    for (const std::string& label : Split(dnsName, ".")) {
        if (!label.empty()) {
            base += (base.empty() ? "DC=" : ",DC=") + label;
        }
    }
    return base;
}

std::optional<std::uint32_t> RidOfSid(std::string_view sid) {
    constexpr std::size_t kHead = 8;           // revision, count of numbers, authority
    constexpr unsigned char kNumbers = 5;      // 21, three of the domain, one of the account
    constexpr std::uint32_t kDomainSids = 21;  // what follows S-1-5 in all of them
    const auto byte = [&sid](std::size_t place) { return static_cast<unsigned char>(sid[place]); };
    const auto number = [&byte](std::size_t index) {
        const std::size_t place = kHead + 4 * index;
        return static_cast<std::uint32_t>(byte(place)) | static_cast<std::uint32_t>(byte(place + 1)) << 8 |
               static_cast<std::uint32_t>(byte(place + 2)) << 16 | static_cast<std::uint32_t>(byte(place + 3)) << 24;
    };
    if (sid.size() != kHead + std::size_t{4} * kNumbers || byte(0) != 1 || byte(1) != kNumbers ||
        sid.substr(2, 6) != std::string_view("\0\0\0\0\0\5", 6) || number(0) != kDomainSids) {
        return std::nullopt;
    }
    return number(kNumbers - 1);
}

}  // namespace appliance
