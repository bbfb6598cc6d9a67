#include "appliance/domain/directory/progress.h"

#include <json/value.h>
#include <json/writer.h>

#include <ctime>

#include "appliance/base/file.h"
#include "appliance/base/log.h"
#include "appliance/base/paths.h"

namespace appliance {

namespace {

constexpr std::chrono::milliseconds kInterval{200};
constexpr mode_t kFolderMode = 0755;
constexpr mode_t kMode = 0600;

}  // namespace

FetchProgress::FetchProgress(EntryKind kind, int domains) : kind_(kind), domains_(domains), started_(time(nullptr)) {
    MakeFolder(Path(kRun), kFolderMode);
    Write(true);
}

void FetchProgress::Begin(const std::string& domain) {
    domain_ = domain;
    count_ = 0;
    Write(false);
}

void FetchProgress::Count(std::int64_t count) {
    count_ = count;
    Write(false);
}

void FetchProgress::Fail(const std::string& reason) {
    failures_.push_back({domain_, kind_, reason});
}

void FetchProgress::End() {
    ++done_;
    Write(done_ == domains_);
}

void FetchProgress::Write(bool always) {
    const auto now = std::chrono::steady_clock::now();
    if (!always && now - written_ < kInterval) {
        return;
    }
    written_ = now;
    Json::Value value;
    value["kind"] = KindName(kind_);
    value["domain"] = domain_;
    value["count"] = count_;
    value["domains_done"] = done_;
    value["domains"] = domains_;
    value["started"] = started_;
    value["updated"] = std::int64_t{time(nullptr)};
    value["errors"] = Json::Value(Json::arrayValue);
    for (const FetchFailure& failure : failures_) {
        Json::Value error;
        error["domain"] = failure.domain;
        error["kind"] = KindName(failure.kind);
        error["reason"] = failure.reason;
        value["errors"].append(error);
    }
    Json::StreamWriterBuilder form;
    form["indentation"] = "";
    const std::error_code error = ReplaceFile(Path(kRefreshProgress), Json::writeString(form, value) + "\n", kMode);
    if (error && !complained_) {
        complained_ = true;
        Log(LOG_WARNING, "cannot write " + Path(kRefreshProgress) + ": " + error.message());
    }
}

}  // namespace appliance
