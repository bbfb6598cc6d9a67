#include "appliance/vornd/session_file.h"

#include <json/value.h>

#include <algorithm>

#include "appliance/base/text.h"
#include "appliance/web/json_text.h"

namespace appliance {
namespace {

constexpr int kForm = 1;

bool ReadText(const Json::Value& object, const char* name, std::string& text) {
    const Json::Value& value = object[name];
    text = value.isString() ? value.asString() : std::string();
    return !text.empty();
}

bool ReadTime(const Json::Value& object, const char* name, std::int64_t& time) {
    const Json::Value& value = object[name];
    // Not isInt64 alone, which takes 1.0 as well.
    if (value.type() != Json::intValue && value.type() != Json::uintValue) {
        return false;
    }
    time = value.isInt64() ? value.asInt64() : -1;
    return time >= 0;
}

std::optional<StoredSession> ReadSession(const Json::Value& object) {
    StoredSession session;
    std::string hash;
    if (!object.isObject() || !ReadText(object, "hash", hash) || !ReadText(object, "csrf", session.csrf) ||
        !ReadText(object, "user", session.user) || !ReadTime(object, "begun", session.begun) ||
        !ReadTime(object, "used", session.used)) {
        return std::nullopt;
    }
    const std::optional<TokenHash> bytes = HashFromHex(hash);
    if (!bytes || !IsToken(session.csrf) || !IsAccountName(session.user) || session.used < session.begun) {
        return std::nullopt;
    }
    session.hash = *bytes;
    return session;
}

}  // namespace

std::string WriteSessions(const std::vector<StoredSession>& sessions, const std::string& boot) {
    Json::Value all(Json::objectValue);
    all["form"] = kForm;
    all["boot"] = boot;
    Json::Value& list = all["sessions"] = Json::Value(Json::arrayValue);
    for (const StoredSession& session : sessions) {
        Json::Value object(Json::objectValue);
        object["hash"] = ToHex(session.hash);
        object["csrf"] = session.csrf;
        object["user"] = session.user;
        object["begun"] = session.begun;
        object["used"] = session.used;
        list.append(std::move(object));
    }
    return WriteJson(all) + "\n";
}

std::optional<std::vector<StoredSession>> ReadSessions(std::string_view text, const std::string& boot) {
    Json::Value all;
    if (text.empty() || ReadParameters(text, all) || all["form"] != Json::Value(kForm) || !all["boot"].isString() ||
        !all["sessions"].isArray() || all["sessions"].size() > kMostSessions) {
        return std::nullopt;
    }
    std::vector<StoredSession> sessions;
    for (const Json::Value& object : all["sessions"]) {
        std::optional<StoredSession> session = ReadSession(object);
        const auto isSame = [&session](const StoredSession& other) { return IsSame(other.hash, session->hash); };
        if (!session || std::any_of(sessions.begin(), sessions.end(), isSame)) {
            return std::nullopt;
        }
        sessions.push_back(std::move(*session));
    }
    if (all["boot"] != Json::Value(boot)) {
        sessions.clear();
    }
    return sessions;
}

}  // namespace appliance
