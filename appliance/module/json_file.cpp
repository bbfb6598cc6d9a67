#include "appliance/module/json_file.h"

#include <json/reader.h>

#include <memory>
#include <string>
#include <system_error>

#include "appliance/base/file.h"
#include "appliance/base/paths.h"
#include "appliance/module/parameters.h"

namespace appliance {
namespace {

bool ParseObject(const std::string& text, Json::Value& value) {
    const std::unique_ptr<Json::CharReader> reader(Json::CharReaderBuilder().newCharReader());
    try {
        return reader->parse(text.data(), text.data() + text.size(), &value, nullptr) && value.isObject();
    } catch (const Json::Exception&) {
        return false;  // nested too deep
    }
}

}  // namespace

Json::Value ReadJsonFile(const char* file) {
    const std::string path = Path(file);
    std::string text;
    const std::error_code error = ReadFile(path, text);
    if (error == std::errc::no_such_file_or_directory) {
        return {};
    }
    Json::Value value;
    if (error || !ParseObject(text, value)) {
        throw CallFailure(AnswerCode::SystemError,
                          path + " can't be read: " + (error ? error.message() : std::string("no JSON object")));
    }
    return value;
}

}  // namespace appliance
