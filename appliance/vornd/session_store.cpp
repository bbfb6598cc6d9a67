#include "appliance/vornd/session_store.h"

#include <sys/stat.h>
#include <unistd.h>

#include <algorithm>
#include <cerrno>
#include <cstring>
#include <ctime>
#include <utility>

#include "appliance/base/file.h"
#include "appliance/base/log.h"
#include "appliance/base/text.h"

namespace appliance {
namespace {

constexpr const char* kBootId = "/proc/sys/kernel/random/boot_id";
constexpr std::size_t kFileLimit = std::size_t{256} << 10;
// A use is written down no more often than this: a successor may take a session for unused that much longer.
constexpr std::int64_t kSavePause = 60;  // seconds

std::int64_t SecondsOf(clockid_t clock) {
    timespec now{};
    clock_gettime(clock, &now);
    return now.tv_sec;
}

std::string ThisBoot() {
    std::string text;
    return ReadFile(kBootId, text) ? std::string() : Trim(text);
}

// Only root's own file can hold sessions: whoever writes it could log in.
bool IsRootsOwn(const std::string& path) {
    struct stat found {};
    return lstat(path.c_str(), &found) == 0 && S_ISREG(found.st_mode) && found.st_uid == geteuid() &&
           (found.st_mode & 077U) == 0;
}

}  // namespace

SessionClock SessionClock::OfTheMachine() {
    return {[] { return SecondsOf(CLOCK_BOOTTIME); }, [] { return SecondsOf(CLOCK_REALTIME); }};
}

SessionStore::SessionStore(std::string path, SessionClock clock)
    : path_(std::move(path)), clock_(std::move(clock)), boot_(ThisBoot()) {
    Load();
}

void SessionStore::Load() {
    std::string text;
    const std::error_code error = ReadFile(path_, text, kFileLimit);
    if (error == std::errc::no_such_file_or_directory) {
        return;
    }
    std::optional<std::vector<StoredSession>> stored;
    if (!error && IsRootsOwn(path_)) {
        stored = ReadSessions(text, boot_);
    }
    if (!stored) {
        Log(LOG_ERR, path_ + " is damaged: whoever was logged in has to log in again");
        unlink(path_.c_str());
        return;
    }
    const std::int64_t now = clock_.running();
    for (StoredSession& session : *stored) {
        if (session.used <= now) {
            sessions_.push_back({std::move(session), ++lastId_});
        }
    }
    saved_ = now;
    Prune();
}

// Takes those away that have ended by themselves.
void SessionStore::Prune() {
    const std::int64_t now = clock_.running();
    const auto hasEnded = [now](const Session& session) {
        return now - session.stored.begun >= kSessionAbsolute ||
               (session.calls == 0 && now - session.stored.used >= kSessionIdle);
    };
    sessions_.erase(std::remove_if(sessions_.begin(), sessions_.end(), hasEnded), sessions_.end());
}

NewSession SessionStore::Begin(const std::string& user) {
    Prune();
    const std::int64_t now = clock_.running();
    if (sessions_.size() >= kMostSessions) {
        const auto goesBefore = [](const Session& first, const Session& second) {
            return std::make_pair(first.calls > 0, first.stored.used) <
                   std::make_pair(second.calls > 0, second.stored.used);
        };
        const auto oldest = std::min_element(sessions_.begin(), sessions_.end(), goesBefore);
        Log(LOG_NOTICE, "a session of " + oldest->stored.user + " ends: there are too many");
        sessions_.erase(oldest);
    }
    NewSession begun{NewToken(), NewToken(), user, clock_.wall() + kSessionAbsolute};
    sessions_.push_back({{HashOf(begun.token), begun.csrf, user, now, now}, ++lastId_});
    Save();
    return begun;
}

std::optional<SessionStore::View> SessionStore::Find(std::string_view token) {
    if (!IsToken(token)) {
        return std::nullopt;
    }
    Prune();
    const TokenHash hash = HashOf(token);
    for (const Session& session : sessions_) {
        if (IsSame(session.stored.hash, hash)) {
            const std::int64_t left = session.stored.begun + kSessionAbsolute - clock_.running();
            return View{session.id, session.stored.csrf, session.stored.user, clock_.wall() + left};
        }
    }
    return std::nullopt;
}

SessionStore::Session* SessionStore::ById(std::uint64_t id) {
    const auto found =
        std::find_if(sessions_.begin(), sessions_.end(), [id](const Session& session) { return session.id == id; });
    return found == sessions_.end() ? nullptr : &*found;
}

void SessionStore::Use(Session& session) {
    session.stored.used = clock_.running();
    if (session.stored.used - saved_ >= kSavePause) {
        Save();
    }
}

void SessionStore::Enter(std::uint64_t id, bool counts) {
    if (Session* session = ById(id)) {
        ++session->calls;
        if (counts) {
            Use(*session);
        }
    }
}

bool SessionStore::Leave(std::uint64_t id, bool counts) {
    Prune();
    Session* session = ById(id);
    if (session == nullptr) {
        return false;
    }
    --session->calls;
    if (counts) {
        Use(*session);
    }
    return true;
}

void SessionStore::End(std::uint64_t id) {
    const auto isIt = [id](const Session& session) { return session.id == id; };
    sessions_.erase(std::remove_if(sessions_.begin(), sessions_.end(), isIt), sessions_.end());
    Save();
}

std::size_t SessionStore::Count() {
    Prune();
    return sessions_.size();
}

void SessionStore::Save() {
    std::vector<StoredSession> stored;
    stored.reserve(sessions_.size());
    for (const Session& session : sessions_) {
        stored.push_back(session.stored);
    }
    saved_ = clock_.running();
    const std::error_code error = ReplaceFile(path_, WriteSessions(stored, boot_));
    if (error) {
        // Better none than those that have ended since.
        unlink(path_.c_str());
        if (!failed_) {
            Log(LOG_ERR, path_ + " can't be written: " + error.message() +
                             "; whoever is logged in has to log in again when the server is started anew");
        }
    }
    failed_ = static_cast<bool>(error);
}

}  // namespace appliance
