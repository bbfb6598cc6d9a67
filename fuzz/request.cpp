#include "fuzz/request.h"

#include <array>

namespace fuzz {

namespace {

constexpr std::array kNames = {
    "enable_domain",
    "domain_name",
    "username",
    "password",
    "dns",
    "manage_mode",
    "kdc",
    "advance_domain_conf",
    "netbios_name",
    "fqdn_name",
    "register_nics",
    "enable_advance_option",
    "enable_sync_time",
    "enable_server_signing",
    "task_id",
    "enable_rpc_enum_usergroup",
    "domain_nested_group",
    "disable_domain_admins",
    "date_type",
    "date",
    "hour",
    "min",
    "week_name",
    "repeat",
    "repeat_hour",
    "last_work_hour",
};

// Texts that take the module somewhere; the last but one ends in a NUL and more.
const std::array<std::string, 20> kTexts = {
    "",
    "lab.test",
    "LAB",
    "@all",
    "10.0.0.1",
    "fe80::1",
    "10.0.0.1,10.0.0.2",
    "10.0.0.1, 10.0.0.2",
    ",",
    "all",
    "eth0",
    "-lab.test",
    "lab.test;reboot",
    "$(reboot).test",
    "a.b c",
    "joiner",
    "DomainUpdate1",
    "2026/11/29",
    std::string("lab.test\0;reboot", 16),
    "l\xC3\xA4"
    "b.test",
};

// Numbers at the edges of what the module takes.
constexpr std::array<Json::Int64, 12> kNumbers = {0, 1, 2, 3, -1, 25, 99, 100, 2147483647, -2147483648, 2147483648, -5};

std::string DecodeText(Input& input) {
    const std::uint8_t choice = input.FrontByte();
    if (choice < kTexts.size()) {
        return kTexts[choice];
    }
    if (choice >= 0xFE) {
        return std::string(choice == 0xFE ? 200 : 1100, 'x') + ".test";
    }
    std::string text(choice % 24U, '\0');
    for (char& byte : text) {
        byte = static_cast<char>(input.FrontByte());
    }
    return text;
}

std::string DecodeName(Input& input) {
    const std::uint8_t choice = input.FrontByte();
    return choice < 0xF8 ? kNames[choice % kNames.size()] : DecodeText(input);
}

}  // namespace

Json::Value DecodeValue(Input& input, int depth) {
    switch (input.FrontByte() % 10U) {
        case 0:
            return Json::Value();
        case 1:
            return Json::Value(false);
        case 2:
            return Json::Value(true);
        case 3:
            return Json::Value(kNumbers[input.FrontByte() % kNumbers.size()]);
        case 4:
            return Json::Value(0.5 * input.FrontByte());
        case 5:
        case 6:
            return Json::Value(DecodeText(input));
        case 7: {
            Json::Value array(Json::arrayValue);
            for (int left = depth > 0 ? input.FrontByte() % 6 : 0; left > 0; --left) {
                array.append(DecodeValue(input, depth - 1));
            }
            return array;
        }
        default: {
            Json::Value object(Json::objectValue);
            for (int left = depth > 0 ? input.FrontByte() % 8 : 0; left > 0; --left) {
                const std::string name = DecodeName(input);
                object[name] = DecodeValue(input, depth - 1);
            }
            return object;
        }
    }
}

Json::Value DecodeRequest(Input& input) {
    Json::Value request(Json::objectValue);
    for (int left = input.FrontByte() % 16; left > 0; --left) {
        const std::string name = DecodeName(input);
        request[name] = DecodeValue(input, 3);
    }
    return request;
}

}  // namespace fuzz
