// vornctl __complete: what the shell's completion asks. One candidate in a line.

#include <map>
#include <memory>
#include <optional>
#include <set>

#include "appliance/base/text.h"
#include "appliance/tools/vornctl/catalogue.h"
#include "appliance/tools/vornctl/command.h"

namespace appliance::ctl {

namespace {

using Words = std::vector<std::string>;

// The values of options that have a fixed choice.
const std::map<std::string, Words>& Choices() {
    static const std::map<std::string, Words> choices = {
        {"--server-signing", {"on", "off"}},
        {"--sync-time", {"on", "off"}},
        {"--rpc-enum", {"on", "off"}},
        {"--domain-admins", {"on", "off"}},
        {"--repeat", {"once", "daily", "weekly", "monthly", "yearly"}},
        {"--weekly", {"all", "sun", "mon", "tue", "wed", "thu", "fri", "sat"}},
    };
    return choices;
}

// The domains whose lists the appliance has, if it answers soon.
Words DomainNames(const Client& client) {
    Json::Value data;
    std::set<std::string> names;
    if (client.TryCall(methods::Domains(), Json::Value(Json::objectValue), data)) {
        for (const Json::Value& list : ListOf(data, "domains")) {
            const std::string name = TextOf(list, "domain");
            if (!name.empty() && Escape(name) == name) {
                names.insert(name);
            }
        }
    }
    return {names.begin(), names.end()};
}

// API names, then versions, then methods, by how many of the arguments are there already.
Words CallArguments(const Words& given) {
    std::set<std::string> names;
    for (const Json::Value& method : MethodCatalogue()) {
        const std::string version = std::to_string(NumberOf(method, "version"));
        if (given.empty()) {
            names.insert(TextOf(method, "api"));
        } else if (TextOf(method, "api") == given[0] && given.size() == 1) {
            names.insert(version);
        } else if (TextOf(method, "api") == given[0] && given.size() == 2 && version == given[1]) {
            names.insert(TextOf(method, "method"));
        }
    }
    return {names.begin(), names.end()};
}

Words Candidates(Arguments program, Context& context, const Words& words) {
    std::optional<Arguments> command;
    std::string socket;
    Words given;  // the command's arguments that are no options
    for (std::size_t i = 0; i + 1 < words.size(); ++i) {
        if (words[i] == "--socket" && i + 2 < words.size()) {
            socket = words[i + 1];
        }
        if (StartsWith(words[i], "-")) {
            i += command.value_or(program).TakesValue(words[i]) ? 1U : 0U;
        } else if (!command) {
            command = program.Command(words[i]);
        } else {
            given.push_back(words[i]);
        }
    }
    const std::string before = words.size() > 1 ? words[words.size() - 2] : "";
    if (const auto choice = Choices().find(before); choice != Choices().end()) {
        return choice->second;
    }
    if (before == "--domain") {
        return socket.empty() ? DomainNames(context.client) : DomainNames(Client(socket, std::chrono::seconds(0)));
    }
    if (command.value_or(program).TakesValue(before)) {
        return {};
    }
    if (StartsWith(words.back(), "-")) {
        return command.value_or(program).LongOptions();
    }
    Words names;
    if (!command) {
        for (const Command& one : Commands()) {
            if (!one.hidden) {
                names.emplace_back(one.name);
            }
        }
    } else if (command->Name() == "call") {
        names = CallArguments(given);
    } else if (command->Name() == "explain" && given.empty()) {
        for (const auto& [code, text] : ErrorTexts()) {
            names.push_back(std::to_string(code));
        }
    }
    return names;
}

}  // namespace

Runner SetUpComplete(Arguments arguments) {
    const auto words = std::make_shared<Words>();
    arguments.Rest("WORD", *words, "the words of the line, the last one being typed").TypeName("");
    return [words, program = arguments.Program()](Context& context) {
        if (words->empty()) {
            words->emplace_back();
        }
        for (const std::string& candidate : Candidates(program, context, *words)) {
            if (StartsWith(candidate, words->back())) {
                context.out.Line(candidate);
            }
        }
        return static_cast<int>(kDone);
    };
}

}  // namespace appliance::ctl
