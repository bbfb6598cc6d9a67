#include "appliance/tools/vornauth/check.h"

#include <security/pam_appl.h>

#include <cstdlib>
#include <cstring>

#include "appliance/base/paths.h"
#include "appliance/tools/vornauth/administrators.h"

namespace appliance::auth {
namespace {

constexpr const char* kService = "vorn";

void FreeReplies(pam_response* replies, int count) {
    for (int index = 0; index < count; ++index) {
        if (replies[index].resp != nullptr) {
            explicit_bzero(replies[index].resp, std::strlen(replies[index].resp));
            std::free(replies[index].resp);
        }
    }
    std::free(replies);
}

// PAM's questions: the password is the answer to what is asked without an echo, and nothing else is known.
int Converse(int count, const pam_message** messages, pam_response** answered, void* data) {
    const auto* password = static_cast<const Secret*>(data);
    if (count <= 0 || count > PAM_MAX_NUM_MSG) {
        return PAM_CONV_ERR;
    }
    auto* replies = static_cast<pam_response*>(std::calloc(static_cast<std::size_t>(count), sizeof(pam_response)));
    if (replies == nullptr) {
        return PAM_BUF_ERR;
    }
    for (int index = 0; index < count; ++index) {
        const int style = messages[index]->msg_style;
        if (style == PAM_PROMPT_ECHO_OFF) {
            replies[index].resp = strdup(password->c_str());
        }
        const bool isTold = style == PAM_ERROR_MSG || style == PAM_TEXT_INFO;
        if (!isTold && replies[index].resp == nullptr) {
            FreeReplies(replies, index);
            return style == PAM_PROMPT_ECHO_OFF ? PAM_BUF_ERR : PAM_CONV_ERR;
        }
    }
    *answered = replies;
    return PAM_SUCCESS;
}

void DoNotWait(int /*result*/, unsigned /*microseconds*/, void* /*data*/) {}

// One conversation with PAM.
class Conversation {
public:
    Conversation(const std::string& user, const Secret& password)
        // PAM hands the pointer back as it is, and only Converse looks at it.
        : conversation_{Converse, const_cast<Secret*>(&password)} {
        const std::string folder = Path("/etc/pam.d");
        result_ = folder == "/etc/pam.d"
                      ? pam_start(kService, user.c_str(), &conversation_, &handle_)
                      : pam_start_confdir(kService, user.c_str(), &conversation_, folder.c_str(), &handle_);
        if (result_ == PAM_SUCCESS) {
            // PAM keeps the function as a plain pointer.
            result_ = pam_set_item(handle_, PAM_FAIL_DELAY, reinterpret_cast<const void*>(&DoNotWait));
        }
    }
    ~Conversation() {
        if (handle_ != nullptr) {
            pam_end(handle_, result_);
        }
    }
    Conversation(const Conversation&) = delete;
    Conversation& operator=(const Conversation&) = delete;

    bool HasStarted() const {
        return result_ == PAM_SUCCESS;
    }
    int Authenticate() {
        return result_ = pam_authenticate(handle_, PAM_SILENT | PAM_DISALLOW_NULL_AUTHTOK);
    }
    int CheckAccount() {
        return result_ = pam_acct_mgmt(handle_, PAM_SILENT | PAM_DISALLOW_NULL_AUTHTOK);
    }
    // Modules may have put another name in the place of the one that was typed.
    std::string User() const {
        const void* name = nullptr;
        return pam_get_item(handle_, PAM_USER, &name) == PAM_SUCCESS && name != nullptr ? static_cast<const char*>(name)
                                                                                        : "";
    }

private:
    pam_conv conversation_;
    pam_handle_t* handle_ = nullptr;
    int result_ = PAM_SYSTEM_ERR;
};

ExitCode AfterAuthentication(int result, const std::string& user) {
    switch (result) {
        case PAM_SUCCESS:
            return kAccepted;
        case PAM_AUTH_ERR:
        case PAM_CRED_INSUFFICIENT:
        case PAM_MAXTRIES:
        case PAM_PERM_DENIED:
            return IsUser(user) ? kWrongPassword : kUnknownUser;
        case PAM_USER_UNKNOWN:
            return kUnknownUser;
        case PAM_ACCT_EXPIRED:
        case PAM_CRED_EXPIRED:
        case PAM_NEW_AUTHTOK_REQD:
            return kAccountRefused;
        default:
            return kImpossible;
    }
}

ExitCode AfterAccountCheck(int result) {
    switch (result) {
        case PAM_SUCCESS:
            return kAccepted;
        case PAM_ACCT_EXPIRED:
        case PAM_AUTH_ERR:
        case PAM_AUTHTOK_EXPIRED:
        case PAM_NEW_AUTHTOK_REQD:
        case PAM_PERM_DENIED:
        case PAM_USER_UNKNOWN:
            return kAccountRefused;
        default:
            return kImpossible;
    }
}

}  // namespace

ExitCode Check(const std::string& user, const Secret& password) {
    Conversation conversation(user, password);
    if (!conversation.HasStarted()) {
        return kImpossible;
    }
    ExitCode code = AfterAuthentication(conversation.Authenticate(), user);
    if (code == kAccepted) {
        code = AfterAccountCheck(conversation.CheckAccount());
    }
    if (code == kAccepted && !IsAdministrator(conversation.User())) {
        code = kNoAdministrator;
    }
    return code;
}

}  // namespace appliance::auth
