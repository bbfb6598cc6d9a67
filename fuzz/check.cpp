#include "fuzz/check.h"

#include <json/writer.h>
#include <syslog.h>

#include <algorithm>

namespace fuzz {

namespace {

using fake::Appliance;
using fake::Call;

[[noreturn]] void Broken(const Appliance& appliance, const std::string& rule) {
    std::string text = rule + "\n";
    for (const Call& call : appliance.Calls()) {
        text += "  " + call.Text() + (call.fault ? " failed by " + call.fault->Text() : "") + "\n";
    }
    for (const fake::LogLine& line : appliance.Logs()) {
        text += "  log " + line.unit + ":" + std::to_string(line.line) + " " + line.message + "\n";
    }
    throw RuleBroken(text);
}

bool Holds(const std::string& text, const std::string& part) {
    return text.find(part) != std::string::npos;
}

std::string Text(const Json::Value& value) {
    return Json::writeString(Json::StreamWriterBuilder(), value);
}

void CheckAnswers(const Operation& operation, bool completed, const Appliance& appliance) {
    const auto& answers = appliance.Answers();
    // An exception may come before or behind an answer; without one the operation answers as it always does.
    const std::size_t least = completed ? operation.leastAnswers : 0;
    if (answers.size() < least || answers.size() > operation.mostAnswers) {
        Broken(appliance, std::to_string(answers.size()) + " answers");
    }
    if (operation.name == "DomainUpdateStatus") {
        return;  // passes the codes of tasks on
    }
    for (const fake::Answer& answer : answers) {
        const bool known = answer.success || answer.code == 117 || answer.code == appliance.state.pollingError ||
                           (answer.code >= 2600 && answer.code <= 2626 && answer.code != 2616);
        if (!known) {
            Broken(appliance, "unknown code " + std::to_string(answer.code));
        }
    }
}

void CheckHandles(const Appliance& appliance) {
    if (appliance.LiveHandles() != 0) {
        Broken(appliance, "left over: " + appliance.LiveHandleNames());
    }
    if (!appliance.Misuses().empty()) {
        Broken(appliance, "misuse: " + appliance.Misuses().front());
    }
}

void CheckLogs(const Appliance& appliance) {
    for (const fake::LogLine& line : appliance.Logs()) {
        if (line.priority != LOG_ERR || (line.unit != "domain.cpp" && line.unit != "domain_schedule.cpp")) {
            Broken(appliance, "a log line of nobody");
        }
    }
}

void CheckPassword(const Appliance& appliance) {
    for (const Call& call : appliance.Calls()) {
        const bool mayHoldIt = call.function == "strdup" || call.function == "free" ||
                               call.function == "VORN::APIRequest::GetParam" || call.function == "VORNWinJoin1";
        if (!mayHoldIt && Holds(call.Text(), kPassword)) {
            Broken(appliance, "the password in " + call.Text());
        }
    }
    for (const fake::LogLine& line : appliance.Logs()) {
        if (Holds(line.message, kPassword)) {
            Broken(appliance, "the password in the log");
        }
    }
    for (const fake::Answer& answer : appliance.Answers()) {
        if (Holds(Text(answer.data), kPassword)) {
            Broken(appliance, "the password in an answer");
        }
    }
}

// What is left of a command beside its own words must be one harmless name.
void CheckCommands(const Appliance& appliance) {
    const std::string lookup = "/usr/bin/nslookup ";
    for (const std::string& command : appliance.state.commands) {
        if (command == "/bin/rm /usr/vorn/etc/private/domain_user* > /dev/null 2>&1" ||
            command == "/bin/rm /usr/vorn/etc/private/domain_group* > /dev/null 2>&1") {
            continue;
        }
        if (command.compare(0, lookup.size(), lookup) != 0 || command.size() > 1023) {
            Broken(appliance, "strange command " + command);
        }
        const std::string rest = command.substr(lookup.size());
        const std::string name = rest.substr(0, rest.find(' '));
        const std::string output = " > /usr/vorn/etc/private/dns_query 2>&1";
        if (name.empty() || name.front() == '-' ||
            name.find_first_of("\"';&|<>()$\\*?[]{}~#!`\t\n\r\x7f") != std::string::npos ||
            output.compare(0, rest.size() - name.size(), rest.substr(name.size())) != 0) {
            Broken(appliance, "harmful command " + command);
        }
    }
}

// A result that the caller takes for done. What was not failed on purpose answers 0 here.
bool Done(const Call& call) {
    return !call.fault || (call.fault->kind == fake::Fault::Kind::kResult && call.fault->result >= 0);
}

// The arguments of every call of a function that counts, in order.
std::vector<const Call*> CallsOf(const Appliance& appliance, const std::string& function) {
    std::vector<const Call*> calls;
    for (const Call& call : appliance.Calls()) {
        if (call.function == function) {
            calls.push_back(&call);
        }
    }
    return calls;
}

bool Joined(const Appliance& appliance) {
    const auto joins = CallsOf(appliance, "VORNWinJoin1");
    if (joins.empty()) {
        return false;
    }
    if (joins.front()->fault) {
        return joins.front()->fault == fake::Fault::Result(0);
    }
    const fake::JoinRecord& record = appliance.state.joins.front();
    return appliance.state.joinResult == 0 && record.domainName && record.userName && record.password;
}

// The setting that the operation read before it changed it.
std::string SavedTrust(const Before& before, const Appliance& appliance) {
    const Call& asked = *CallsOf(appliance, "VORNWinIsEnableTrustDomain").front();
    return std::to_string(asked.fault ? asked.fault->result : before.trustSetting);
}

void CheckTrustPutBack(const Before& before, bool completed, const Appliance& appliance) {
    const auto set = CallsOf(appliance, "VORNWinSetTrustDomain");
    if (set.empty()) {
        return;
    }
    const std::vector<std::string> saved{SavedTrust(before, appliance)};
    if (Joined(appliance)) {
        if (set.size() != 1 || set.back()->arguments == saved) {
            Broken(appliance, "a join that succeeded lost its trusted-domain setting");
        }
        return;
    }
    // What passes by before the setting is known leaves only the putting back.
    if (set.back()->arguments != saved || set.size() > 2 || (completed && set.size() != 2)) {
        Broken(appliance, "the trusted-domain setting was not put back");
    }
}

void CheckDnsPutBack(const Appliance& appliance) {
    // Putting back may want for memory, so the call may be missing then.
    const bool starved = std::any_of(appliance.Calls().begin(), appliance.Calls().end(), [](const Call& call) {
        return call.fault && (call.function == "VLIBCSzListAlloc" || call.function == "VLIBCSzListPush");
    });
    const auto set = CallsOf(appliance, "VORNNetDNSListSet");
    const bool kept = set.empty() || Joined(appliance) || !Done(*set.front());
    const std::size_t expected = set.empty() ? 0 : (kept ? 1 : 2);
    if (set.size() != expected && !starved) {
        Broken(appliance, "the DNS servers were not put back as they should");
    }
}

void CheckJoinStatus(const Appliance& appliance) {
    const auto joins = CallsOf(appliance, "VORNWinJoin1");
    if (joins.empty() || appliance.state.joins.front().bytes.joinMode != 1) {
        return;
    }
    const std::vector<Call>& calls = appliance.Calls();
    const auto join =
        std::find_if(calls.begin(), calls.end(), [](const Call& call) { return call.function == "VORNWinJoin1"; });
    const bool lookedFor = std::any_of(join, calls.end(), [](const Call& call) { return call.function == "access"; });
    if (!lookedFor) {
        Broken(appliance, "the join's status file was left behind");
    }
}

void CheckMarker(const Operation& operation, const Appliance& appliance) {
    const auto removals = CallsOf(appliance, "VLIBCSysRemove");
    const auto ofMarker = std::count_if(removals.begin(), removals.end(), [](const Call* call) {
        return call->arguments == std::vector<std::string>{"\"/tmp/domain_updating\""};
    });
    if (ofMarker != (operation.isTask ? 1 : 0)) {
        Broken(appliance, "the marker file was removed " + std::to_string(ofMarker) + " times");
    }
}

}  // namespace

Before Remember(const Appliance& appliance) {
    return {appliance.state.trustSetting};
}

void CheckRun(const Operation& operation, const Before& before, bool completed, const Appliance& appliance) {
    CheckAnswers(operation, completed, appliance);
    CheckHandles(appliance);
    CheckLogs(appliance);
    CheckPassword(appliance);
    CheckCommands(appliance);
    CheckMarker(operation, appliance);
    if (operation.name == "DomainSet") {
        CheckTrustPutBack(before, completed, appliance);
        CheckDnsPutBack(appliance);
        CheckJoinStatus(appliance);
    }
}

}  // namespace fuzz
