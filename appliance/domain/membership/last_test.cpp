#include "appliance/domain/membership/last_test.h"

#include <json/reader.h>
#include <json/value.h>
#include <json/writer.h>

#include <memory>
#include <string>

#include "appliance/base/file.h"
#include "appliance/base/log.h"
#include "appliance/base/paths.h"
#include "appliance/base/text.h"

namespace appliance {

namespace {

constexpr mode_t kMode = 0600;
constexpr mode_t kFolderMode = 0700;
constexpr std::size_t kLargestRecord = 4096;

bool Same(const Membership& one, const Membership& other) {
    return one.kind == other.kind && one.machine == other.machine && EqualIgnoringCase(one.domain, other.domain);
}

void Complain(const std::error_code& error) {
    if (error) {
        Log(LOG_WARNING, Path(kLastTest) + ": " + error.message());
    }
}

}  // namespace

void RecordTest(const Membership& tested, const MembershipTest& test) {
    // A test takes seconds; the membership may have gone meanwhile.
    Membership now;
    if (ReadMembership(now) || !now.Joined() || !Same(now, tested)) {
        return;
    }
    Json::Value record(Json::objectValue);
    record["time"] = Json::Int64{test.time};
    record["success"] = test.success;
    record["milliseconds"] = Json::Int64{test.milliseconds};
    record["domain"] = tested.domain;
    Json::StreamWriterBuilder form;
    form["indentation"] = "";
    if (const std::error_code error = MakeFolder(Path(kState), kFolderMode)) {
        return Complain(error);
    }
    Complain(ReplaceFile(Path(kLastTest), Json::writeString(form, record) + "\n", kMode));
}

std::optional<MembershipTest> ReadLastTest(const Membership& membership) {
    std::string text;
    if (!membership.Joined() || ReadFile(Path(kLastTest), text, kLargestRecord)) {
        return std::nullopt;
    }
    Json::Value record;
    const std::unique_ptr<Json::CharReader> reader(Json::CharReaderBuilder().newCharReader());
    try {
        if (!reader->parse(text.data(), text.data() + text.size(), &record, nullptr) || !record.isObject() ||
            !record["time"].isInt64() || !record["success"].isBool() || !record["milliseconds"].isInt64() ||
            !record["domain"].isString() || !EqualIgnoringCase(record["domain"].asString(), membership.domain)) {
            return std::nullopt;
        }
    } catch (const Json::Exception&) {
        return std::nullopt;  // nested too deep
    }
    return MembershipTest{record["time"].asInt64(), record["success"].asBool(), record["milliseconds"].asInt64()};
}

void ForgetLastTest() {
    Complain(RemoveFile(Path(kLastTest)));
}

}  // namespace appliance
