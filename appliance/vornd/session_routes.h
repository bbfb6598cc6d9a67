// Log in, log out, and whose session this is. Lives on the server's thread; passwords are checked on others.

#ifndef VORN_APPLIANCE_VORND_SESSION_ROUTES_H
#define VORN_APPLIANCE_VORND_SESSION_ROUTES_H

#include <functional>
#include <memory>
#include <string>
#include <string_view>

#include "appliance/base/secret.h"
#include "appliance/vornd/access.h"
#include "appliance/vornd/authenticator.h"
#include "appliance/vornd/login_throttle.h"
#include "appliance/vornd/one_time_links.h"
#include "appliance/vornd/router.h"
#include "appliance/vornd/session_store.h"
#include "appliance/vornd/work.h"

namespace appliance {

class SessionRoutes {
public:
    using Authenticator = std::function<Verdict(const std::string& user, const Secret& password)>;

    // `sessions` outlives this. `authenticate` is called on other threads.
    SessionRoutes(SessionStore& sessions, const SessionClock& clock, Authenticator authenticate);

    // A request below "/session", of a peer that is the door or the administrator:
    //   GET  /session           whose session it is
    //   POST /session/login     {"user", "password"}
    //   POST /session/link      {"token"}
    //   POST /session/logout
    //   POST /session/new-link  of the administrator alone: a link that logs in once
    // A token that the client brings is looked up and nothing else: what a log-in begins has tokens of its own.
    Next Take(Access access, const WebRequest& request);

private:
    struct LogIn;

    Next Show(const WebRequest& request);
    Next TakeLogIn(const WebRequest& request);
    Next TakeLink(const WebRequest& request);
    Next LogOut(const WebRequest& request);
    Next MakeLink(Access access);
    Reply FinishLogIn(LogIn& logIn, Reply reply);
    Reply Refuse(const LogIn& logIn, const std::string& reason) const;
    Reply Begin(const std::string& user, const DoorMarks& marks, const char* how);

    SessionStore& sessions_;
    OneTimeLinks links_;
    LoginThrottle throttle_;
    const Authenticator authenticate_;
};

}  // namespace appliance

#endif
