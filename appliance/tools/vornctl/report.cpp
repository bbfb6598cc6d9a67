// How answers and refusals are told.

#include "appliance/tools/vornctl/catalogue.h"
#include "appliance/tools/vornctl/command.h"

namespace appliance::ctl {

namespace {

constexpr std::size_t kIndent = 11;

}  // namespace

void PrintJson(Context& context, const Answer& answer) {
    context.out.Line(JsonLine(answer.whole));
}

int ReportRefusal(Context& context, const Answer& answer,
                  const std::vector<std::pair<std::string, std::string>>& details) {
    Output& err = context.err;
    const ErrorText* text = FindErrorText(answer.code);
    const std::string code = std::to_string(answer.code);
    const std::string meaning =
        text != nullptr ? text->meaning : "The appliance refused, with a code that this program does not know.";
    err.Line("vornctl: " + err.Coloured(Colour::Bad, meaning));
    if (text != nullptr) {
        err.Paragraph("  Why:", kIndent, text->cause);
        err.Paragraph("  Try:", kIndent, text->action);
    }
    err.Paragraph("  Code:", kIndent, code);
    for (const auto& [name, value] : details) {
        err.Paragraph("  " + name + ":", kIndent, Escape(value));
    }
    if (!answer.errors.isNull()) {
        err.Paragraph("  Details:", kIndent,
                      Escape(answer.errors.isString() ? answer.errors.asString() : JsonLine(answer.errors)));
    }
    return kRefused;
}

bool CallAndReport(Context& context, const Method& method, const Json::Value& parameters, Answer& answer,
                   int& exitCode) {
    answer = context.client.Call(method, parameters);
    exitCode = answer.success ? kDone : kRefused;
    if (context.json) {
        PrintJson(context, answer);
    } else if (!answer.success) {
        exitCode = ReportRefusal(context, answer);
    }
    return answer.success;
}

}  // namespace appliance::ctl
