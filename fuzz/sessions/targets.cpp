#include "fuzz/sessions/targets.h"

#include <arpa/inet.h>

#include <algorithm>
#include <array>
#include <optional>

#include "appliance/base/text.h"
#include "appliance/vornd/door_marks.h"
#include "appliance/vornd/session_file.h"
#include "appliance/vornd/session_token.h"

namespace fuzz {
namespace {

void Require(bool holds, const char* rule) {
    if (!holds) {
        throw ServerRuleBroken(rule);
    }
}

constexpr const char* kBoot = "00000000-0000-0000-0000-000000000000";

// The input is the whole file.
void SessionFile(std::string_view input) {
    using appliance::StoredSession;
    const std::optional<std::vector<StoredSession>> read = appliance::ReadSessions(input, kBoot);
    if (!read) {
        return;
    }
    Require(read->size() <= appliance::kMostSessions, "no more sessions than there may be");
    for (const StoredSession& session : *read) {
        Require(appliance::IsToken(session.csrf), "every session has a token against forged requests");
        Require(appliance::IsAccountName(session.user), "every user is a possible one");
        Require(session.begun >= 0 && session.used >= session.begun, "nothing is used before it begins");
        const auto isSame = [&session](const StoredSession& other) {
            return appliance::IsSame(other.hash, session.hash);
        };
        Require(std::count_if(read->begin(), read->end(), isSame) == 1, "no session is there twice");
    }
    const std::string text = appliance::WriteSessions(*read, kBoot);
    const std::optional<std::vector<StoredSession>> again = appliance::ReadSessions(text, kBoot);
    Require(again && again->size() == read->size(), "what is written is read");
    Require(appliance::WriteSessions(*again, kBoot) == text, "reading and writing changes nothing");
    const std::optional<std::vector<StoredSession>> other = appliance::ReadSessions(text, "another");
    Require(other && other->empty(), "of another run of the machine there are no sessions");
}

// The input is a header's fields: a name and, behind a colon, its value in each line.
void DoorMarks(std::string_view input) {
    appliance::DoorMarks marks;
    std::size_t begin = 0;
    while (begin < input.size()) {
        const std::size_t end = std::min(input.find('\n', begin), input.size());
        const std::string_view line = input.substr(begin, end - begin);
        const std::size_t colon = std::min(line.find(':'), line.size());
        appliance::ReadMark(line.substr(0, colon), line.substr(std::min(colon + 1, line.size())), marks);
        begin = end + 1;
    }
    for (const std::string& token : {marks.session, marks.csrf}) {
        Require(token.empty() || appliance::IsToken(token), "a token looks like one, or there is none");
    }
    std::array<unsigned char, sizeof(in6_addr)> bytes{};
    Require(marks.client.empty() || inet_pton(AF_INET, marks.client.c_str(), bytes.data()) == 1 ||
                inet_pton(AF_INET6, marks.client.c_str(), bytes.data()) == 1,
            "a client is an address, or unknown");
    Require(!appliance::HasControlBytes(marks.client), "no control byte gets into the log");
    appliance::DoorMarks again;
    appliance::ReadMark("vorn-client", marks.client, again);
    Require(again.client == marks.client, "an address has one form");
}

}  // namespace

const std::vector<ServerTarget>& ServerTargets() {
    static const std::vector<ServerTarget> targets = {
        {"SessionFile", SessionFile}, {"DoorMarks", DoorMarks}, {"ConfFile", RunConfFile}};
    return targets;
}

const ServerTarget& FindServerTarget(const std::string& name) {
    for (const ServerTarget& target : ServerTargets()) {
        if (target.name == name) {
            return target;
        }
    }
    throw std::out_of_range(name);
}

}  // namespace fuzz
