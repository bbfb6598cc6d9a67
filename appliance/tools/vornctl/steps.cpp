#include "appliance/tools/vornctl/steps.h"

#include "appliance/tools/vornctl/interrupt.h"

namespace appliance::ctl {

namespace {

constexpr std::chrono::milliseconds kPause{250};  // between two looks at the steps

bool IsRunning(const Json::Value& step) {
    return TextOf(step, "outcome") == "running";
}

}  // namespace

void PrintStep(Output& out, const Json::Value& step) {
    const std::string outcome = TextOf(step, "outcome");
    const Colour colour = outcome == "ok" ? Colour::Good : outcome == "failed" ? Colour::Bad : Colour::Warning;
    const std::string shown = Escape(outcome);
    std::string text = Escape(TextOf(step, "name"));
    if (const std::string server = TextOf(step, "server"); !server.empty()) {
        text += "  [" + Escape(server) + "]";
    }
    if (const std::string time = DurationText(MemberOf(step, "milliseconds")); !time.empty()) {
        text += "  " + time;
    }
    const std::size_t width = std::max<std::size_t>(8, Columns(shown) + 1);
    const std::string padding(width - Columns(shown), ' ');
    const std::size_t indent = 2 + width;
    // Coloured after the wrapping, which would count the colour's bytes.
    std::string beginning = "  " + out.Coloured(colour, shown) + padding;
    for (const std::string& line : Wrap(text, out.width() - indent)) {
        out.Line(beginning + line);
        beginning.assign(indent, ' ');
    }
    if (const std::string detail = TextOf(step, "detail"); !detail.empty()) {
        out.Paragraph("", indent, Escape(detail));
    }
}

LiveSteps::LiveSteps(Context& context, bool alsoForJson) : context_(context) {
    if (context_.json && !alsoForJson) {
        return;
    }
    Json::Value old;
    available_ = context_.client.TryCall(methods::JoinSteps(), Json::Value(Json::objectValue), old);
    oldId_ = TextOf(old, "id");
}

void LiveSteps::Show() {
    Json::Value record;
    if (!available_ || !context_.client.TryCall(methods::JoinSteps(), Json::Value(Json::objectValue), record) ||
        TextOf(record, "id").empty() || TextOf(record, "id") == oldId_) {
        return;
    }
    record_ = record;
    if (context_.json) {
        return;
    }
    const Json::Value& steps = ListOf(record_, "steps");
    while (shown_ < steps.size() && !IsRunning(steps[shown_])) {
        PrintStep(context_.out, steps[shown_]);
        ++shown_;
    }
    if (shown_ < steps.size()) {
        const std::string server = TextOf(steps[shown_], "server");
        context_.out.Transient("  ...     " + Escape(TextOf(steps[shown_], "name")) +
                               (server.empty() ? "" : "  [" + Escape(server) + "]"));
    }
}

Answer LiveSteps::Run(const Method& method, const Json::Value& parameters, const Secret* password) {
    const std::unique_ptr<HttpCall> call = context_.client.Start(method, parameters, password);
    bool over = false;
    while (!over) {
        over = call->RunFor(kPause);
        if (Interrupted()) {
            throw Failure(
                kInterrupted,
                "Interrupted. What was begun goes on in the appliance: \"vornctl steps\" shows how far it is.");
        }
        if (over || !context_.json) {
            Show();
        }
    }
    context_.out.Transient("");
    try {
        return Client::Finish(*call);
    } catch (const Failure& failure) {
        if (record_.isNull()) {
            throw;
        }
        // It was begun, and goes on whatever became of the connection.
        throw Failure(failure.code(), std::string(failure.what()) + " \"vornctl steps\" shows how it goes on.");
    }
}

std::vector<std::pair<std::string, std::string>> LiveSteps::Details() const {
    std::vector<std::pair<std::string, std::string>> details;
    for (const Json::Value& step : ListOf(record_, "steps")) {
        if (TextOf(step, "outcome") != "failed") {
            continue;
        }
        const std::string server = TextOf(step, "server");
        details.emplace_back("Step", TextOf(step, "name") + (server.empty() ? "" : ", asked: " + server));
        if (const std::string detail = TextOf(step, "detail"); !detail.empty()) {
            details.emplace_back("Said", detail);
        }
    }
    if (const std::string message = TextOf(record_, "message"); !message.empty()) {
        details.emplace_back("Status", message);
    }
    for (const Json::Value& leftover : ListOf(record_, "leftovers")) {
        if (leftover.isString()) {
            details.emplace_back("Left", leftover.asString());
        }
    }
    return details;
}

}  // namespace appliance::ctl
