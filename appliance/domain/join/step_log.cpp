#include "appliance/domain/join/step_log.h"

#include <json/json.h>
#include <unistd.h>

#include <ctime>
#include <memory>

#include "appliance/base/file.h"
#include "appliance/base/log.h"
#include "appliance/base/paths.h"
#include "appliance/domain/membership/membership.h"

namespace appliance {

namespace {

constexpr char kRunning[] = "running";
constexpr char kInterrupted[] = "interrupted";
constexpr mode_t kMode = 0600;
constexpr std::size_t kLargestRecord = 1 << 20;

std::error_code WriteRecord(const Json::Value& record) {
    Json::StreamWriterBuilder builder;
    builder["indentation"] = "";
    return ReplaceFile(Path(kJoinSteps), Json::writeString(builder, record) + "\n", kMode);
}

// The record that stands there; null when there is none, or no such thing.
Json::Value ReadRecord() {
    std::string text;
    Json::Value record;
    const std::unique_ptr<Json::CharReader> reader(Json::CharReaderBuilder().newCharReader());
    if (ReadFile(Path(kJoinSteps), text, kLargestRecord) ||
        !reader->parse(text.data(), text.data() + text.size(), &record, nullptr) || !record.isObject() ||
        !record["steps"].isArray() || !record["leftovers"].isArray() || !record["action"].isString()) {
        return {};
    }
    return record;
}

}  // namespace

StepLog::StepLog(const std::string& action, const std::string& domain)
    : id_(std::to_string(std::time(nullptr)) + "-" + std::to_string(getpid())),
      action_(action),
      domain_(domain),
      started_(std::time(nullptr)),
      stepBegan_(std::chrono::steady_clock::now()) {
    Write();
}

void StepLog::Begin(const std::string& name, const std::string& server) {
    if (!steps_.empty() && steps_.back().outcome == kRunning) {
        End("ok", steps_.back().detail);
    }
    stepBegan_ = std::chrono::steady_clock::now();
    steps_.push_back({name, server, kRunning, "", 0});
    Write();
}

void StepLog::Ok(const std::string& detail) {
    End("ok", detail);
}

void StepLog::Failed(const std::string& detail) {
    if (failedStep_.empty() && !steps_.empty() && steps_.back().outcome == kRunning) {
        failedStep_ = steps_.back().name;
    }
    End("failed", detail);
}

void StepLog::Skipped(const std::string& detail) {
    End("skipped", detail);
}

void StepLog::Server(const std::string& server) {
    if (!steps_.empty() && steps_.back().outcome == kRunning) {
        steps_.back().server = server;
    }
}

void StepLog::Leftover(const std::string& text) {
    Log(LOG_WARNING, action_ + " " + domain_ + ": " + text);
    leftovers_.push_back(text);
    Write();
}

void StepLog::Finish(bool success, const std::string& message) {
    if (!steps_.empty() && steps_.back().outcome == kRunning) {
        End(success ? "ok" : "failed", steps_.back().detail);
    }
    done_ = true;
    success_ = success;
    message_ = message;
    finished_ = std::time(nullptr);
    Write();
}

void StepLog::End(const std::string& outcome, const std::string& detail) {
    if (steps_.empty() || steps_.back().outcome != kRunning) {
        return;
    }
    Step& step = steps_.back();
    step.outcome = outcome;
    step.detail = detail;
    const auto took = std::chrono::steady_clock::now() - stepBegan_;
    step.milliseconds = std::chrono::duration_cast<std::chrono::milliseconds>(took).count();
    Log(outcome == "failed" ? LOG_ERR : LOG_INFO, action_ + " " + domain_ + ": " + step.name +
                                                      (step.server.empty() ? "" : " (" + step.server + ")") + ": " +
                                                      outcome + (detail.empty() ? "" : ": " + detail));
    Write();
}

void StepLog::Write() {
    Json::Value steps(Json::arrayValue);
    for (const Step& step : steps_) {
        Json::Value entry(Json::objectValue);
        entry["name"] = step.name;
        entry["server"] = step.server;
        entry["outcome"] = step.outcome;
        entry["detail"] = step.detail;
        entry["milliseconds"] = step.milliseconds;
        steps.append(entry);
    }
    Json::Value leftovers(Json::arrayValue);
    for (const std::string& text : leftovers_) {
        leftovers.append(text);
    }
    Json::Value record(Json::objectValue);
    record["id"] = id_;
    record["action"] = action_;
    record["domain"] = domain_;
    record["started"] = started_;
    record["finished"] = done_ ? Json::Value(finished_) : Json::Value();
    record["success"] = done_ ? Json::Value(success_) : Json::Value();
    record["message"] = message_;
    record["steps"] = steps;
    record["leftovers"] = leftovers;
    if (const std::error_code error = WriteRecord(record); error && !complained_) {
        complained_ = true;
        Log(LOG_WARNING, Path(kJoinSteps) + ": " + error.message());
    }
}

void EndInterruptedSteps(bool completed, const std::vector<std::string>& notes) {
    Json::Value record = ReadRecord();
    if (record.isNull() || !record["finished"].isNull()) {
        return;
    }
    for (Json::Value& step : record["steps"]) {
        if (step.isObject() && step["outcome"] == kRunning) {
            step["outcome"] = "failed";
            step["detail"] = kInterrupted;
        }
    }
    for (const std::string& note : notes) {
        record["leftovers"].append(note);
    }
    // A leave has a last step that no membership depends on.
    Membership membership;
    const bool left = record["action"] == "leave" && !ReadMembership(membership) && !membership.DomainMode();
    const bool success = completed || left;
    record["success"] = success;
    record["message"] = success ? "" : "The " + record["action"].asString() + " was interrupted.";
    record["finished"] = Json::Int64{std::time(nullptr)};
    if (const std::error_code error = WriteRecord(record)) {
        Log(LOG_WARNING, Path(kJoinSteps) + ": " + error.message());
    }
}

}  // namespace appliance
