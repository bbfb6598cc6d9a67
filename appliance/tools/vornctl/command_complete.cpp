// vornctl __complete: what the shell's completion asks. One candidate in a line.

#include <CLI/CLI.hpp>
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

bool TakesValue(const CLI::Option* option) {
    return option != nullptr && option->get_items_expected_max() > 0;
}

const CLI::App* FindCommand(const CLI::App& root, const std::string& name) {
    for (const CLI::App* command : root.get_subcommands(nullptr)) {
        if (command->get_name() == name) {
            return command;
        }
    }
    return nullptr;
}

Words OptionsOf(const CLI::App& parser) {
    Words names;
    for (const CLI::Option* option : parser.get_options()) {
        for (const std::string& name : option->get_lnames()) {
            names.push_back("--" + name);
        }
    }
    return names;
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

Words Candidates(const CLI::App& root, Context& context, const Words& words) {
    const CLI::App* command = nullptr;
    std::string socket;
    Words arguments;  // of the command
    for (std::size_t i = 0; i + 1 < words.size(); ++i) {
        if (words[i] == "--socket" && i + 2 < words.size()) {
            socket = words[i + 1];
        }
        if (StartsWith(words[i], "-")) {
            const CLI::Option* option = (command != nullptr ? *command : root).get_option_no_throw(words[i]);
            i += TakesValue(option) ? 1U : 0U;
        } else if (command == nullptr) {
            command = FindCommand(root, words[i]);
        } else {
            arguments.push_back(words[i]);
        }
    }
    const std::string before = words.size() > 1 ? words[words.size() - 2] : "";
    if (const auto choice = Choices().find(before); choice != Choices().end()) {
        return choice->second;
    }
    if (before == "--domain") {
        return socket.empty() ? DomainNames(context.client) : DomainNames(Client(socket, std::chrono::seconds(0)));
    }
    const CLI::Option* valued = (command != nullptr ? *command : root).get_option_no_throw(before);
    if (TakesValue(valued)) {
        return {};
    }
    if (StartsWith(words.back(), "-")) {
        return OptionsOf(command != nullptr ? *command : root);
    }
    Words names;
    if (command == nullptr) {
        for (const Command& one : Commands()) {
            if (!one.hidden) {
                names.emplace_back(one.name);
            }
        }
    } else if (command->get_name() == "call") {
        names = CallArguments(arguments);
    } else if (command->get_name() == "explain" && arguments.empty()) {
        for (const auto& [code, text] : ErrorTexts()) {
            names.push_back(std::to_string(code));
        }
    }
    return names;
}

}  // namespace

Runner SetUpComplete(CLI::App& parser) {
    const auto words = std::make_shared<Words>();
    parser.add_option("WORD", *words, "the words of the line, the last one being typed")->type_name("");
    const CLI::App* const root = parser.get_parent();
    return [words, root](Context& context) {
        if (words->empty()) {
            words->emplace_back();
        }
        for (const std::string& candidate : Candidates(*root, context, *words)) {
            if (StartsWith(candidate, words->back())) {
                context.out.Line(candidate);
            }
        }
        return static_cast<int>(kDone);
    };
}

}  // namespace appliance::ctl
