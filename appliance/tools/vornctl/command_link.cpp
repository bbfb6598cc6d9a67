// vornctl link

#include <algorithm>
#include <memory>

#include "appliance/base/text.h"
#include "appliance/tools/vornctl/command.h"

namespace appliance::ctl {

namespace {

constexpr const char* kPath = "/#/link/";

bool IsHost(std::string_view text) {
    const bool isBracketed = StartsWith(text, "[") && text.size() > 2 && text.back() == ']';
    const std::string_view name = isBracketed ? text.substr(1, text.size() - 2) : text;
    return !name.empty() && std::all_of(name.begin(), name.end(), [isBracketed](char letter) {
        return (letter >= '0' && letter <= '9') || (letter >= 'A' && letter <= 'Z') ||
               (letter >= 'a' && letter <= 'z') || letter == '-' || letter == '.' || letter == '_' ||
               (isBracketed && letter == ':');
    });
}

bool IsPort(std::string_view text) {
    return !text.empty() && text.size() <= 5 && text.find_first_not_of("0123456789") == std::string_view::npos;
}

// The page's address without a path; throws Failure when it is none.
std::string PageAddress(std::string text) {
    while (!text.empty() && text.back() == '/') {
        text.pop_back();
    }
    const std::size_t scheme = StartsWith(text, "https://") ? 8 : StartsWith(text, "http://") ? 7 : 0;
    const std::string_view rest = std::string_view(text).substr(scheme);
    const std::size_t bracket = rest.find(']');
    const std::size_t colon = rest.find(':', bracket == std::string_view::npos ? 0 : bracket);
    const bool hasPort = colon != std::string_view::npos;
    if (scheme == 0 || !IsHost(rest.substr(0, colon)) || (hasPort && !IsPort(rest.substr(colon + 1)))) {
        throw Failure(kUsage,
                      "--address is the page's address, such as https://nas1.example.com:8443, without a path.");
    }
    return text;
}

int RunLink(Context& context, const std::string& address) {
    const std::string page = address.empty() ? std::string() : PageAddress(address);
    Answer answer;
    int exitCode = kDone;
    if (!CallAndReport(context, methods::NewLink(), Json::Value(Json::objectValue), answer, exitCode) || context.json) {
        return exitCode;
    }
    const std::string token = TextOf(answer.data, "token");
    if (token.empty()) {
        throw Failure(kNoAnswer, "The answer holds no link.");
    }
    // Not broken into lines, whatever the terminal's width: they are to be copied.
    context.out.Line("Token  " + Escape(token));
    context.out.Line("Link   " + page + kPath + Escape(token));
    context.err.Line("It logs in once, until " + TimeText(MemberOf(answer.data, "expires")) + ".");
    return kDone;
}

}  // namespace

Runner SetUpLink(Arguments arguments) {
    const auto address = std::make_shared<std::string>();
    arguments.Text("--address", *address, "the page's address, to print the link whole").TypeName("URL");
    arguments.Footer(
        "A link that logs in to the appliance's page as root, once and within 10 minutes.\n"
        "Whoever has it first is in: hand it on as carefully as a password.");
    return [address](Context& context) { return RunLink(context, *address); };
}

}  // namespace appliance::ctl
