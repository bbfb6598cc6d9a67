#include "appliance/vornd/descriptions.h"

#include <json/reader.h>

#include <memory>
#include <system_error>

#include "appliance/base/file.h"
#include "appliance/base/log.h"

namespace appliance {
namespace {

constexpr const char* kJsonType = "application/json";

const Json::Value& Member(const Json::Value& value, const char* name) {
    return value.isObject() ? value[name] : Json::Value::nullSingleton();
}

// The description of one method; null without one.
const Json::Value& FindDescription(const Json::Value& descriptions, const VORN::APIEntry& entry) {
    if (descriptions.isArray()) {
        for (const Json::Value& description : descriptions) {
            if (Member(description, "api") == Json::Value(entry.api) &&
                Member(description, "method") == Json::Value(entry.method) &&
                Member(description, "version") == Json::Value(entry.version)) {
                return description;
            }
        }
    }
    return Json::Value::nullSingleton();
}

Json::Value ParameterSchema(const Json::Value& parameters) {
    Json::Value schema(Json::objectValue);
    schema["type"] = "object";
    if (!parameters.isArray()) {
        return schema;
    }
    for (const Json::Value& parameter : parameters) {
        const Json::Value& name = Member(parameter, "name");
        if (!name.isString()) {
            continue;
        }
        Json::Value& property = schema["properties"][name.asString()] = Json::Value(Json::objectValue);
        const Json::Value& type = Member(parameter, "type");
        property["type"] = type.isString() ? type : Json::Value("string");
        if (property["type"] == Json::Value("array")) {
            property["items"] = Json::Value(Json::objectValue);
            if (Member(parameter, "items").isString()) {
                property["items"]["type"] = parameter["items"];
            }
        }
        if (Member(parameter, "members").isArray()) {
            const Json::Value members = ParameterSchema(parameter["members"]);
            for (const char* const part : {"properties", "required"}) {
                if (members.isMember(part)) {
                    property[part] = members[part];
                }
            }
        }
        if (Member(parameter, "description").isString()) {
            property["description"] = parameter["description"];
        }
        if (Member(parameter, "required") == Json::Value(true)) {
            schema["required"].append(name);
        }
    }
    return schema;
}

Json::Value Content(const Json::Value& schema, const Json::Value& example) {
    Json::Value content(Json::objectValue);
    content[kJsonType]["schema"] = schema;
    if (!example.isNull()) {
        content[kJsonType]["example"] = example;
    }
    return content;
}

Json::Value Reference(const char* schema) {
    Json::Value reference(Json::objectValue);
    reference["$ref"] = std::string("#/components/schemas/") + schema;
    return reference;
}

Json::Value Operation(const VORN::APIEntry& entry, const Json::Value& description) {
    Json::Value operation(Json::objectValue);
    operation["operationId"] = std::string(entry.api) + "." + std::to_string(entry.version) + "." + entry.method;
    operation["tags"].append(entry.api);
    const Json::Value& summary = Member(description, "summary");
    operation["summary"] = summary.isString() ? summary : Json::Value(entry.method);
    operation["requestBody"]["required"] =
        Member(description, "parameters").isArray() && ParameterSchema(description["parameters"]).isMember("required");
    operation["requestBody"]["content"] =
        Content(ParameterSchema(Member(description, "parameters")), Member(description, "example_request"));
    operation["responses"]["200"]["description"] = "The method's answer, of success or of failure";
    operation["responses"]["200"]["content"] = Content(Reference("Answer"), Member(description, "example_answer"));
    operation["responses"]["default"]["description"] = "The server's own refusal";
    operation["responses"]["default"]["content"] = Content(Reference("Failure"), Json::Value());
    return operation;
}

Json::Value Schemas() {
    Json::Value success(Json::objectValue);
    success["type"] = "object";
    success["required"].append("success");
    success["required"].append("data");
    success["properties"]["success"]["type"] = "boolean";
    success["properties"]["success"]["enum"].append(true);
    success["properties"]["data"]["description"] = "What the method answers; null when it has nothing to say";
    success["properties"]["data"]["nullable"] = true;
    Json::Value failure(Json::objectValue);
    failure["type"] = "object";
    failure["required"].append("success");
    failure["required"].append("error");
    failure["properties"]["success"]["type"] = "boolean";
    failure["properties"]["success"]["enum"].append(false);
    Json::Value& error = failure["properties"]["error"];
    error["type"] = "object";
    error["required"].append("code");
    error["required"].append("errors");
    error["properties"]["code"]["type"] = "integer";
    error["properties"]["errors"]["description"] = "More about the failure; null when there is nothing to add";
    error["properties"]["errors"]["nullable"] = true;
    Json::Value answer(Json::objectValue);
    answer["oneOf"].append(Reference("Success"));
    answer["oneOf"].append(Reference("Failure"));
    Json::Value schemas(Json::objectValue);
    schemas["Success"] = success;
    schemas["Failure"] = failure;
    schemas["Answer"] = answer;
    return schemas;
}

}  // namespace

Json::Value ReadDescriptions(const std::string& path) {
    std::string text;
    const std::error_code failed = ReadFile(path, text);
    if (failed == std::errc::no_such_file_or_directory) {
        return {};
    }
    Json::Value descriptions;
    const std::unique_ptr<Json::CharReader> reader(Json::CharReaderBuilder().newCharReader());
    if (failed || !reader->parse(text.data(), text.data() + text.size(), &descriptions, nullptr) ||
        !descriptions.isArray()) {
        Log(LOG_WARNING, "the descriptions of the methods are left out: " + path + ": " +
                             (failed ? failed.message() : std::string("no JSON array")));
        return {};
    }
    return descriptions;
}

Json::Value ListMethods(const MethodTable& methods) {
    Json::Value list(Json::objectValue);
    list["apis"] = Json::Value(Json::arrayValue);
    for (const auto& [api, rows] : methods.apis()) {
        Json::Value shown(Json::objectValue);
        shown["api"] = api;
        for (const auto& [method, versions] : rows) {
            Json::Value row(Json::objectValue);
            row["method"] = method;
            for (const auto& [version, entry] : versions) {
                row["versions"].append(version);
            }
            shown["methods"].append(row);
        }
        list["apis"].append(shown);
    }
    return list;
}

Json::Value OpenApiDocument(const MethodTable& methods, const Json::Value& descriptions) {
    Json::Value document(Json::objectValue);
    document["openapi"] = "3.0.3";
    document["info"]["title"] = "Web API of the appliance";
    document["info"]["version"] = VORN_VERSION;
    document["components"]["schemas"] = Schemas();
    Json::Value& paths = document["paths"] = Json::Value(Json::objectValue);
    for (const auto& [api, rows] : methods.apis()) {
        for (const auto& [method, versions] : rows) {
            for (const auto& [version, entry] : versions) {
                const std::string path = "/webapi/" + api + "/" + std::to_string(version) + "/" + method;
                paths[path]["post"] = Operation(*entry, FindDescription(descriptions, *entry));
            }
        }
    }
    return document;
}

}  // namespace appliance
