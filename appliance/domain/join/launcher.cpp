#include "appliance/domain/join/launcher.h"

#include <json/json.h>

#include <memory>

#include "appliance/base/command.h"
#include "appliance/base/log.h"
#include "appliance/base/paths.h"
#include "appliance/base/text.h"
#include "appliance/domain/join/journal.h"
#include "appliance/domain/join/recovery.h"
#include "appliance/domain/join/time_budget.h"

namespace appliance {

namespace {

constexpr std::chrono::milliseconds kMargin{1500};
constexpr std::chrono::milliseconds kRecoveryTime{15000};

// The tool has died. True when what it was doing is in force nevertheless.
bool PutRight(const TimeBudget& budget) {
    Command command;
    command.arguments = {Path(kVornjoin), "--recover"};
    command.deadline = budget.Left(kRecoveryTime);
    command.endsWithCaller = false;
    const CommandResult recovered = Run(command);
    if (recovered.end == CommandResult::End::Exited && recovered.code == kRecoveredForward) {
        return true;
    }
    if (!recovered.Succeeded()) {
        RecoverInBackground(Wanted::OldOrNone);
    }
    return false;
}

}  // namespace

JobResult RunJoinTool(const JoinRequest& request) {
    const TimeBudget budget(kForwardTime + kBackTime + kMargin);
    Command command;
    command.arguments = {Path(kVornjoin)};
    command.input = FormatJoinRequest(request);
    command.deadline = kForwardTime + kBackTime;
    command.ownSession = true;
    command.endsWithCaller = false;
    const CommandResult ended = Run(command);
    JobResult result;
    if (ended.end == CommandResult::End::Exited && ParseJobResult(ended.output, result)) {
        if (!result.success && ReadJournal()) {
            // No controller could tell which secret works: found out as soon as one answers.
            RecoverInBackground(Wanted::OldOrNone);
        }
        return result;
    }
    Log(LOG_ERR, Path(kVornjoin) + " " + ended.Describe() + (ended.errors.empty() ? "" : ": " + Trim(ended.errors)));
    if (ended.end != CommandResult::End::NotStarted && PutRight(budget)) {
        return {true, {}};
    }
    result = {false, {"tool", status::kSystem}};
    if (const std::error_code error = WriteJoinStatus(result.status)) {
        Log(LOG_ERR, Path(kJoinStatus) + ": " + error.message());
    }
    return result;
}

std::string FormatJobResult(const JobResult& result) {
    Json::Value object(Json::objectValue);
    object["success"] = result.success;
    object["key"] = result.status.key;
    object["message"] = result.status.message;
    Json::StreamWriterBuilder builder;
    builder["indentation"] = "";
    return Json::writeString(builder, object) + "\n";
}

bool ParseJobResult(const std::string& text, JobResult& result) {
    Json::Value object;
    const std::unique_ptr<Json::CharReader> reader(Json::CharReaderBuilder().newCharReader());
    try {
        if (!reader->parse(text.data(), text.data() + text.size(), &object, nullptr) || !object.isObject() ||
            !object["success"].isBool() || !object["key"].isString() || !object["message"].isString()) {
            return false;
        }
    } catch (const Json::Exception&) {
        return false;
    }
    result.success = object["success"].asBool();
    result.status = CleanStatus({object["key"].asString(), object["message"].asString()});
    return true;
}

}  // namespace appliance
