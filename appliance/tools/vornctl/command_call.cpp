// vornctl call

#include <unistd.h>

#include <cerrno>
#include <memory>

#include "appliance/tools/vornctl/command.h"
#include "appliance/tools/vornctl/interrupt.h"
#include "appliance/tools/vornctl/terminal.h"

namespace appliance::ctl {

namespace {

constexpr std::chrono::seconds kDeadline{600};
constexpr std::size_t kLargestBody = 65536;

struct CallOptions {
    std::string api;
    int version = 0;
    std::string method;
    std::string parameters = "{}";
};

bool IsName(const std::string& text) {
    return !text.empty() &&
           text.find_first_not_of("abcdefghijklmnopqrstuvwxyzABCDEFGHIJKLMNOPQRSTUVWXYZ0123456789._-") ==
               std::string::npos;
}

// True when an object somewhere in the value has a member "password".
bool HoldsPassword(const Json::Value& value) {
    if (value.isObject() && value.isMember("password")) {
        return true;
    }
    for (const Json::Value& inner : value) {
        if ((inner.isObject() || inner.isArray()) && HoldsPassword(inner)) {
            return true;
        }
    }
    return false;
}

Secret BodyFromArgument(const std::string& text) {
    Json::Value value;
    if (!ParseJson(text, value) || !value.isObject()) {
        throw Failure(kUsage, "The parameters are no JSON object.");
    }
    if (HoldsPassword(value)) {
        throw Failure(kUsage,
                      "Other users can read what stands on a command line. Give parameters that hold a password on "
                      "standard input, with \"-\" in their place.");
    }
    return Secret(text);
}

// A buffer for what may hold a password.
struct InputBuffer {
    std::vector<char> bytes = std::vector<char>(kLargestBody + 1);
    std::size_t size = 0;

    ~InputBuffer() {
        explicit_bzero(bytes.data(), bytes.size());
    }
};

// Goes to the server as it is and nowhere else.
Secret BodyFromInput() {
    InputBuffer input;
    while (input.size < input.bytes.size()) {
        WaitForInput(STDIN_FILENO);
        const ssize_t count = read(STDIN_FILENO, input.bytes.data() + input.size, input.bytes.size() - input.size);
        if (count < 0 && errno != EINTR) {
            throw Failure(kUsage, "The input can't be read.");
        }
        if (count == 0) {
            break;
        }
        input.size += count > 0 ? static_cast<std::size_t>(count) : 0;
    }
    if (input.size > kLargestBody) {
        throw Failure(kUsage, "The input is longer than the 64 KiB that a request may have.");
    }
    return Secret(std::string_view(input.bytes.data(), input.size));
}

int RunCall(Context& context, const CallOptions& options) {
    for (const std::string* name : {&options.api, &options.method}) {
        if (!IsName(*name)) {
            throw Failure(kUsage, "\"" + Escape(*name) + "\" can't be the name of an API or a method.");
        }
    }
    Secret body = options.parameters == "-" ? BodyFromInput() : BodyFromArgument(options.parameters);
    const Answer answer =
        context.client.CallWithBody({options.api, options.version, options.method, kDeadline}, std::move(body));
    if (context.json) {
        PrintJson(context, answer);
        return answer.success ? kDone : kRefused;
    }
    if (!answer.success) {
        return ReportRefusal(context, answer);
    }
    context.out.Line(JsonPretty(answer.data));
    return kDone;
}

}  // namespace

Runner SetUpCall(Arguments arguments) {
    const auto options = std::make_shared<CallOptions>();
    arguments.Text("API", options->api, "name of the API, for example VORN.Core.Directory.Domain")
        .TypeName("")
        .Required();
    arguments.Number("VERSION", options->version, "its version").TypeName("").Between(0, 2147483647).Required();
    arguments.Text("METHOD", options->method, "the method").TypeName("").Required();
    arguments
        .Text("JSON", options->parameters,
              "the parameters, a JSON object; \"-\" reads it from standard input; {} without it")
        .TypeName("");
    arguments.Footer(
        "Prints the data of the answer. /usr/vorn/share/methods.json describes all\n"
        "methods.\n\n"
        "Example:\n"
        "  vornctl call VORN.Core.Directory.Domain 2 get_domain_list");
    return [options](Context& context) { return RunCall(context, *options); };
}

}  // namespace appliance::ctl
