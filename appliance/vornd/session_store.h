// Who has logged in. Lives on the server's thread.

#ifndef VORN_APPLIANCE_VORND_SESSION_STORE_H
#define VORN_APPLIANCE_VORND_SESSION_STORE_H

#include <cstddef>
#include <cstdint>
#include <functional>
#include <string>
#include <string_view>
#include <vector>

#include "appliance/vornd/session_file.h"

namespace appliance {

inline constexpr std::int64_t kSessionIdle = std::int64_t{15} * 60;           // seconds after the last use
inline constexpr std::int64_t kSessionAbsolute = std::int64_t{12} * 60 * 60;  // seconds after the log-in

// Both in seconds.
struct SessionClock {
    std::function<std::int64_t()> running;  // since the machine was started, sleep included; nobody sets it
    std::function<std::int64_t()> wall;     // since 1970

    static SessionClock OfTheMachine();
};

// A session that has just begun. Its token is told here and never again.
struct NewSession {
    std::string token;
    std::string csrf;
    std::string user;
    std::int64_t expires = 0;  // seconds since 1970, whatever the use
};

class SessionStore {
public:
    // What a request learns about its session; `id` names it as long as the server runs.
    struct View {
        std::uint64_t id = 0;
        std::string csrf;
        std::string user;
        std::int64_t expires = 0;
    };

    // Takes over the sessions of the file at `path`, which a predecessor left; one that is damaged, or that others than
    // root may read or write, holds none.
    SessionStore(std::string path, SessionClock clock);
    SessionStore(const SessionStore&) = delete;
    SessionStore& operator=(const SessionStore&) = delete;

    // Begins a session with tokens of its own. When there are kMostSessions, the one that is unused for the longest
    // time ends.
    NewSession Begin(const std::string& user);

    // The session of a token; nothing when there is none or it has ended.
    std::optional<View> Find(std::string_view token);

    // A call of a session begins: the session does not end for want of use before the call does. Every Enter is
    // followed by one Leave, which answers whether the session still lives. `counts`: the call is a use of the session.
    void Enter(std::uint64_t id, bool counts);
    bool Leave(std::uint64_t id, bool counts);

    void End(std::uint64_t id);

    // How many there are.
    std::size_t Count();

    // Writes what is not in the file yet; the server's last act.
    void Save();

private:
    struct Session {
        StoredSession stored;
        std::uint64_t id = 0;
        int calls = 0;  // that run
    };

    void Load();
    void Prune();
    Session* ById(std::uint64_t id);
    void Use(Session& session);

    const std::string path_;
    const SessionClock clock_;
    const std::string boot_;
    std::vector<Session> sessions_;
    std::uint64_t lastId_ = 0;
    std::int64_t saved_ = 0;  // when
    bool failed_ = false;     // the last time that it was tried
};

}  // namespace appliance

#endif
