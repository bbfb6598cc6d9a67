#include "appliance/tools/vornctl/client.h"

#include <json/writer.h>

#include "appliance/tools/vornctl/exit_code.h"
#include "appliance/tools/vornctl/interrupt.h"
#include "appliance/tools/vornctl/output.h"

namespace appliance::ctl {

namespace {

constexpr std::chrono::milliseconds kSlice{100};  // how soon Ctrl-C is noticed
constexpr std::chrono::seconds kOptional{3};

// A text as it stands in JSON, written to `out` (6 bytes for each of `text` are enough). Returns the end.
char* Quote(std::string_view text, char* out) {
    static constexpr char kDigits[] = "0123456789abcdef";
    for (const char byte : text) {
        const auto value = static_cast<unsigned char>(byte);
        if (byte == '"' || byte == '\\') {
            *out++ = '\\';
            *out++ = byte;
        } else if (value < 0x20) {
            for (const char prefix : {'\\', 'u', '0', '0'}) {
                *out++ = prefix;
            }
            *out++ = kDigits[value >> 4];
            *out++ = kDigits[value & 15];
        } else {
            *out++ = byte;
        }
    }
    return out;
}

// The request's body. The password goes from its secret into the body's alone.
Secret Body(const Json::Value& parameters, const Secret* password) {
    std::string text = JsonLine(parameters.isNull() ? Json::Value(Json::objectValue) : parameters);
    if (password == nullptr) {
        return Secret(text);
    }
    text.pop_back();  // the closing brace
    text += parameters.empty() ? R"("password":")" : R"(,"password":")";
    const std::size_t size = text.size() + 6 * password->view().size() + 2;
    const std::unique_ptr<char[]> buffer(new char[size]);
    char* end = std::copy(text.begin(), text.end(), buffer.get());
    end = Quote(password->view(), end);
    *end++ = '"';
    *end++ = '}';
    Secret body(std::string_view(buffer.get(), static_cast<std::size_t>(end - buffer.get())));
    explicit_bzero(buffer.get(), size);
    return body;
}

}  // namespace

namespace methods {

using std::chrono::seconds;

// The deadlines are beyond the server's own, so that its answer is heard and not only its silence.
Method Get() {
    return {kDomainApi, 1, "get", seconds(30)};
}
Method Set() {
    return {kDomainApi, 1, "set", seconds(600)};
}
Method TestDc() {
    return {kDomainApi, 1, "test_dc", seconds(60)};
}
Method DomainList(int version) {
    return {kDomainApi, version, "get_domain_list", seconds(60)};
}
Method UpdateStart() {
    return {kDomainApi, 1, "update_start", seconds(30)};
}
Method UpdateStatus() {
    return {kDomainApi, 1, "update_status", seconds(30)};
}
Method UpdateStop() {
    return {kDomainApi, 1, "update_stop", seconds(60)};
}
Method OptionsGet() {
    return {kOptionsApi, 1, "get", seconds(30)};
}
Method OptionsSet() {
    return {kOptionsApi, 1, "set", seconds(120)};
}
Method ScheduleGet() {
    return {kScheduleApi, 1, "get", seconds(30)};
}
Method ScheduleSet() {
    return {kScheduleApi, 1, "set", seconds(60)};
}
Method Users() {
    return {kDirectoryApi, 1, "users", seconds(60)};
}
Method Groups() {
    return {kDirectoryApi, 1, "groups", seconds(60)};
}
Method Domains() {
    return {kDirectoryApi, 1, "domains", seconds(30)};
}
Method Overview() {
    return {kDirectoryApi, 1, "overview", seconds(30)};
}
Method RefreshProgress() {
    return {kDirectoryApi, 1, "refresh_progress", seconds(30)};
}
Method JoinSteps() {
    return {kDirectoryApi, 1, "join_steps", seconds(30)};
}
Method Leave() {
    return {kDirectoryApi, 1, "leave", seconds(600)};
}
Method Events() {
    return {kEventLogApi, 1, "list", seconds(30)};
}
Method NewLink() {
    return {"", 1, "/session/new-link", seconds(30)};
}

}  // namespace methods

Client::Client(std::string socket, std::chrono::seconds deadline) : socket_(std::move(socket)), deadline_(deadline) {}

std::unique_ptr<HttpCall> Client::Begin(const Method& method, Secret body) const {
    const std::string target = method.api.empty()
                                   ? method.name
                                   : "/webapi/" + method.api + "/" + std::to_string(method.version) + "/" + method.name;
    const auto deadline = deadline_.count() > 0 ? deadline_ : method.deadline;
    return std::make_unique<HttpCall>(socket_, target, std::move(body), deadline);
}

std::unique_ptr<HttpCall> Client::Start(const Method& method, const Json::Value& parameters,
                                        const Secret* password) const {
    return Begin(method, Body(parameters, password));
}

Answer Client::Finish(HttpCall& call) {
    const HttpAnswer http = call.Take();
    Answer answer;
    const bool isJson = ParseJson(http.body, answer.whole);
    const Json::Value& success = MemberOf(answer.whole, "success");
    if (!isJson || !success.isBool()) {
        throw Failure(kNoAnswer, "The answer (HTTP " + std::to_string(http.status) +
                                     ") is not one of the web API: " + Escape(http.body.substr(0, 60)));
    }
    answer.success = success.asBool();
    if (answer.success) {
        answer.data = MemberOf(answer.whole, "data");
        return answer;
    }
    const Json::Value& error = MemberOf(answer.whole, "error");
    if (!MemberOf(error, "code").isInt()) {
        throw Failure(kNoAnswer, "The answer (HTTP " + std::to_string(http.status) + ") is a failure without a code.");
    }
    answer.code = MemberOf(error, "code").asInt();
    answer.errors = MemberOf(error, "errors");
    return answer;
}

Answer Client::Call(const Method& method, const Json::Value& parameters, const Secret* password) const {
    return CallWithBody(method, Body(parameters, password));
}

Answer Client::CallWithBody(const Method& method, Secret body) const {
    const std::unique_ptr<HttpCall> call = Begin(method, std::move(body));
    while (!call->RunFor(kSlice)) {
        if (Interrupted()) {
            throw Failure(kInterrupted, "Interrupted. What was begun in the appliance goes on there.");
        }
    }
    return Finish(*call);
}

bool Client::TryCall(Method method, const Json::Value& parameters, Json::Value& data) const {
    method.deadline = kOptional;
    try {
        const Answer answer = Call(method, parameters);
        data = answer.data;
        return answer.success;
    } catch (const Failure& failure) {
        if (failure.code() == kInterrupted) {
            throw;
        }
        return false;
    }
}

}  // namespace appliance::ctl
