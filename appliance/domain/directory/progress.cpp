#include "appliance/domain/directory/progress.h"

#include <json/reader.h>
#include <json/writer.h>
#include <sys/stat.h>
#include <unistd.h>

#include <ctime>
#include <memory>
#include <optional>

#include "appliance/base/file.h"
#include "appliance/base/file_time.h"
#include "appliance/base/log.h"
#include "appliance/base/paths.h"
#include "appliance/base/process.h"

namespace appliance {

namespace {

constexpr std::chrono::milliseconds kInterval{200};
constexpr mode_t kFolderMode = 0755;
constexpr mode_t kMode = 0600;
constexpr std::size_t kLargestRecord = std::size_t{4} << 20;
constexpr std::chrono::seconds kStartTime{3};  // from the request of a refresh to the first record of its process
constexpr char kEnded[] = "ended before it was done";

Json::Value ThisProcess() {
    Json::Value process(Json::objectValue);
    process["pid"] = Json::Int64{getpid()};
    process["start"] = static_cast<Json::Int64>(ProcessStart(getpid()).value_or(0));
    return process;
}

bool IsAlive(const Json::Value& process) {
    if (!process.isObject() || !process["pid"].isInt() || !process["start"].isUInt64()) {
        return false;
    }
    const std::optional<std::uint64_t> start = ProcessStart(process["pid"].asInt());
    return start && *start == process["start"].asUInt64();
}

Json::Value ErrorRecord(const FetchFailure& failure) {
    Json::Value error(Json::objectValue);
    error["domain"] = failure.domain;
    error["kind"] = KindName(failure.kind);
    error["reason"] = failure.reason;
    return error;
}

// The record of this process's refresh so far; null when the record is of another, or there is none.
Json::Value OwnRecord() {
    std::string text;
    Json::Value record;
    const std::unique_ptr<Json::CharReader> reader(Json::CharReaderBuilder().newCharReader());
    try {
        if (ReadFile(Path(kRefreshProgress), text, kLargestRecord) ||
            !reader->parse(text.data(), text.data() + text.size(), &record, nullptr) || !record.isObject() ||
            record["process"] != ThisProcess() || !record["started"].isInt64() || !record["errors"].isArray()) {
            return {};
        }
    } catch (const Json::Exception&) {
        return {};  // nested too deep
    }
    return record;
}

std::error_code WriteRecord(Json::Value record) {
    record["updated"] = Json::Int64{time(nullptr)};
    record["process"] = ThisProcess();
    Json::StreamWriterBuilder form;
    form["indentation"] = "";
    return ReplaceFile(Path(kRefreshProgress), Json::writeString(form, record) + "\n", kMode);
}

void Complain(const std::error_code& error) {
    if (error) {
        Log(LOG_WARNING, "cannot write " + Path(kRefreshProgress) + ": " + error.message());
    }
}

Json::Value FirstRecord(std::time_t started) {
    Json::Value record(Json::objectValue);
    record["kind"] = KindName(EntryKind::User);
    record["domain"] = "";
    record["count"] = 0;
    record["domains_done"] = 0;
    record["domains"] = 0;
    record["started"] = Json::Int64{started};
    record["finished"] = Json::Value();
    record["errors"] = Json::Value(Json::arrayValue);
    return record;
}

// Since when a refresh has been asked for whose process has not come to its first record yet.
std::optional<std::time_t> StartingSince() {
    struct stat marker {};
    struct stat record {};
    if (lstat(Path(kUpdatingMarker).c_str(), &marker) != 0 || !S_ISREG(marker.st_mode) || marker.st_uid != 0) {
        return std::nullopt;
    }
    if (lstat(Path(kRefreshProgress).c_str(), &record) == 0 && WrittenAt(record) >= WrittenAt(marker)) {
        return std::nullopt;
    }
    const auto age = std::chrono::system_clock::now() - WrittenAt(marker);
    return age.count() >= 0 && age < kStartTime ? std::optional(marker.st_mtime) : std::nullopt;
}

}  // namespace

FetchProgress::FetchProgress(EntryKind kind, int domains)
    : kind_(kind), domains_(domains), started_(time(nullptr)), earlier_(Json::arrayValue) {
    const Json::Value before = OwnRecord();
    // Another refresh of this process begins with the users again.
    if (!before.isNull() &&
        (before["domains"] == 0 || (kind == EntryKind::Group && before["kind"] == KindName(EntryKind::User)))) {
        started_ = before["started"].asInt64();
        earlier_ = before["errors"];
    }
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
    Json::Value value(Json::objectValue);
    value["kind"] = KindName(kind_);
    value["domain"] = domain_;
    value["count"] = count_;
    value["domains_done"] = done_;
    value["domains"] = domains_;
    value["started"] = started_;
    value["finished"] = done_ == domains_ ? Json::Value(Json::Int64{time(nullptr)}) : Json::Value();
    value["errors"] = earlier_;
    for (const FetchFailure& failure : failures_) {
        value["errors"].append(ErrorRecord(failure));
    }
    const std::error_code error = WriteRecord(value);
    if (error && !complained_) {
        complained_ = true;
        Complain(error);
    }
}

void RecordRefreshBegin() {
    MakeFolder(Path(kRun), kFolderMode);
    Complain(WriteRecord(FirstRecord(time(nullptr))));
}

void RecordRefreshFailure(const std::string& domain, const std::string& reason) {
    Json::Value record = OwnRecord();
    if (record.isNull()) {
        record = FirstRecord(time(nullptr));
    }
    record["finished"] = Json::Int64{time(nullptr)};
    record["errors"].append(ErrorRecord({domain, EntryKind::User, reason}));
    Complain(WriteRecord(record));
}

Json::Value ShownProgress(Json::Value record) {
    const Json::Value& kept = record;  // reading a member adds none
    const bool ended = kept["finished"].isInt64();
    const bool groupsDone = ended && kept["kind"] == KindName(EntryKind::Group);
    // Between the users and the groups nobody fetches for a moment.
    bool running = ReadPidFile(Path(kUserPid)) >= 0 || ReadPidFile(Path(kGroupPid)) >= 0 ||
                   (!groupsDone && IsAlive(kept["process"]));
    if (const std::optional<std::time_t> since = StartingSince(); since && !running) {
        running = true;
        record = FirstRecord(*since);
        record["updated"] = record["started"];
    } else if (record.isNull()) {
        return record;
    }
    if (!kept["errors"].isArray()) {
        record["errors"] = Json::Value(Json::arrayValue);
    }
    if (running) {
        record["finished"] = Json::Value();
    } else if (!ended) {
        record["finished"] = record["updated"];
        Json::Value error(Json::objectValue);
        error["domain"] = record["domain"];
        error["kind"] = record["kind"];
        error["reason"] = kEnded;
        record["errors"].append(error);
    }
    record["running"] = running;
    record.removeMember("process");
    return record;
}

}  // namespace appliance
