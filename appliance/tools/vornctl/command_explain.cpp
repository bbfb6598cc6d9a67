// vornctl explain

#include <memory>

#include "appliance/tools/vornctl/catalogue.h"
#include "appliance/tools/vornctl/command.h"

namespace appliance::ctl {

namespace {

int ListCodes(Context& context) {
    std::vector<std::vector<std::string>> rows;
    for (const auto& [code, text] : ErrorTexts()) {
        rows.push_back({std::to_string(code), text.meaning});
    }
    context.out.Table({">CODE", "MEANING"}, rows);
    return kDone;
}

Json::Value AsJson(int code, const ErrorText& text) {
    Json::Value object;
    object["code"] = code;
    object["meaning"] = text.meaning;
    object["cause"] = text.cause;
    object["action"] = text.action;
    return object;
}

int RunExplain(Context& context, int code) {
    if (context.json) {
        Json::Value list(Json::arrayValue);
        for (const auto& [known, text] : ErrorTexts()) {
            if (code == 0 || code == known) {
                list.append(AsJson(known, text));
            }
        }
        context.out.Line(JsonLine(list));
        return list.empty() ? kRefused : kDone;
    }
    if (code == 0) {
        return ListCodes(context);
    }
    const ErrorText* text = FindErrorText(code);
    if (text == nullptr) {
        context.err.Line("vornctl: There is no error code " + std::to_string(code) +
                         "; \"vornctl explain\" lists all of them.");
        return kRefused;
    }
    context.out.Facts(
        {{"Code", std::to_string(code)}, {"Meaning", text->meaning}, {"Why", text->cause}, {"Try", text->action}});
    return kDone;
}

}  // namespace

Runner SetUpExplain(Arguments arguments) {
    const auto code = std::make_shared<int>(0);
    arguments.Number("CODE", *code, "the code; without it, all codes are listed").TypeName("").Between(1, 65535);
    arguments.Footer("Works without the server.");
    return [code](Context& context) { return RunExplain(context, *code); };
}

}  // namespace appliance::ctl
