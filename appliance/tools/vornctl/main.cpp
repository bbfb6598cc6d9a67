// vornctl: the appliance's membership of a domain, from the command line.

#include <CLI/CLI.hpp>
#include <iostream>
#include <sstream>

#include "appliance/base/paths.h"
#include "appliance/base/text.h"
#include "appliance/tools/vornctl/command.h"
#include "appliance/tools/vornctl/interrupt.h"

namespace appliance::ctl {

const std::vector<Command>& Commands() {
    static const std::vector<Command> commands = {
        {"status", "Is the appliance a member of a domain, and of which?", SetUpStatus},
        {"join", "Join a domain.", SetUpJoin},
        {"leave", "Leave the domain.", SetUpLeave},
        {"test", "Does the domain accept the appliance?", SetUpTest},
        {"list", "List the domains whose users it can see.", SetUpList},
        {"refresh", "Fetch the users and groups of the domains.", SetUpRefresh},
        {"options", "Show or change options of the file service.", SetUpOptions},
        {"schedule", "Show or set when the refresh runs by itself.", SetUpSchedule},
        {"users", "Show the users of a domain.", SetUpUsers},
        {"groups", "Show the groups of a domain.", SetUpGroups},
        {"events", "Show what happened to the membership.", SetUpEvents},
        {"steps", "Show the steps of the last join or leave.", SetUpSteps},
        {"link", "Make a link that logs in to the page once.", SetUpLink},
        {"explain", "Say what an error code means and what to do.", SetUpExplain},
        {"call", "Call any method of the web API.", SetUpCall},
        {"__complete", "", SetUpComplete, true},
    };
    return commands;
}

void AddGlobalOptions(Arguments arguments, GlobalOptions& options) {
    const char* const group = "Options of every command";
    arguments.Flag("--json", options.json, "print the answer as one line of JSON").Group(group);
    arguments.Text("--socket", options.socket, "socket of the server, instead of /run/vorn/vornd.sock")
        .TypeName("PATH")
        .Group(group);
    arguments.Number("--timeout", options.timeout, "wait so long for each answer, instead of what suits the command")
        .TypeName("SECONDS")
        .Between(1, 86400)
        .Group(group);
}

namespace {

constexpr std::size_t kHelpColumn = 28;
constexpr std::size_t kHelpWidth = 80;

// Help that fits 80 columns.
class HelpFormatter : public CLI::Formatter {
public:
    HelpFormatter() {
        column_width(kHelpColumn);
        label("REQUIRED", "(required)");
        label("SUBCOMMAND", "COMMAND");
        label("SUBCOMMANDS", "COMMANDS");
        label("Positionals", "Arguments");
    }
    std::string make_option_desc(const CLI::Option* option) const override {
        std::string text;
        for (const std::string& line : Wrap(option->get_description(), kHelpWidth - kHelpColumn)) {
            text += (text.empty() ? "" : "\n") + line;
        }
        return text;
    }
    std::string make_option_opts(const CLI::Option* option) const override {
        const std::string type = option->get_type_name();
        const bool isFlag = option->get_type_size() == 0;
        return (isFlag || type.empty() ? "" : " " + type) + (option->get_required() ? " (required)" : "");
    }
};

struct Program {
    CLI::App app{"Makes this appliance a member of a Windows domain and shows how it does there.", "vornctl"};
    GlobalOptions options;
    std::map<const CLI::App*, Runner> runners;
};

void SetUp(Program& program) {
    CLI::App& app = program.app;
    app.formatter(std::make_shared<HelpFormatter>());
    app.set_help_flag("-h,--help", "this help")->group("Options of every command");
    app.set_version_flag("--version", "vornctl " VORN_VERSION, "the version");
    app.require_subcommand(1);
    AddGlobalOptions(Arguments(app), program.options);
    for (const Command& command : Commands()) {
        CLI::App* const parser = app.add_subcommand(command.name, command.summary);
        parser->group(command.hidden ? "" : "Commands");
        program.runners[parser] = command.setUp(Arguments(*parser));
        AddGlobalOptions(Arguments(*parser), program.options);
    }
    app.footer(
        "\"vornctl COMMAND --help\" tells what a command takes.\n\n"
        "Ends with: 0 done, 1 refused or failed, 2 wrong usage, 3 no usable answer of\n"
        "vornd, 4 interrupted, 5 \"test\": the membership does not work, 6 the output could\n"
        "not be written.");
}

// What is wrong with a command line, in words. Never a value of an option: it might be a password.
std::string UsageText(const CLI::App& app, const CLI::ParseError& error) {
    if (dynamic_cast<const CLI::ExtrasError*>(&error) == nullptr && !app.get_subcommands().empty()) {
        const std::string text = error.what();
        // "--user: 1 required ACCOUNT missing"
        return dynamic_cast<const CLI::ArgumentMismatch*>(&error) != nullptr
                   ? text.substr(0, text.find(':')) + " needs a value."
                   : text + ".";
    }
    for (const std::string& word : app.remaining(true)) {
        if (StartsWith(word, "-") && word.size() > 1) {
            // A short option may have its value behind it without a sign between them.
            const std::size_t end = StartsWith(word, "--") ? word.find('=') : 2;
            return "There is no option " + word.substr(0, end) + ".";
        }
        if (app.get_subcommands().empty()) {
            return "There is no command \"" + word + "\".";
        }
    }
    return app.get_subcommands().empty() ? "A command is missing." : "There are too many arguments.";
}

int ReportUsage(const Program& program, Output& err, const std::string& text) {
    const auto chosen = program.app.get_subcommands();
    const std::string command = chosen.empty() ? "vornctl" : "vornctl " + chosen[0]->get_name();
    const std::string sentence = text.substr(0, text.find_last_not_of('.') + 1);
    err.Line("vornctl: " + Escape(sentence) + "; \"" + command + " --help\" tells what it takes.");
    return kUsage;
}

// A complaint about the command line that the parser would answer with the words themselves.
std::string Forbidden(int count, char** words) {
    for (int i = 1; i < count; ++i) {
        const std::string word = words[i];
        if (word == "--") {
            break;
        }
        if (StartsWith(word, "--password") && word != "--password-stdin") {
            return "A password is no option, since other users could read it. It is asked for, or read from standard "
                   "input with --password-stdin.";
        }
        if (!IsUtf8(word)) {
            return "An argument is not UTF-8.";
        }
    }
    return "";
}

// The parser's help without its double empty lines.
std::string Tidied(std::string text) {
    for (std::size_t at = text.find("\n\n\n"); at != std::string::npos; at = text.find("\n\n\n", at)) {
        text.erase(at, 1);
    }
    text.erase(text.find_last_not_of('\n') + 1);
    return text;
}

int RunCommand(Program& program, Output& out, Output& err) {
    const GlobalOptions& options = program.options;
    const Client client(options.socket.empty() ? Path(kSocket) : options.socket, std::chrono::seconds(options.timeout));
    Context context{client, out, err, options.json};
    WatchInterrupts();
    try {
        return program.runners.at(program.app.get_subcommands()[0])(context);
    } catch (const Failure& failure) {
        out.Transient("");
        if (failure.code() == kUsage) {
            return ReportUsage(program, err, failure.what());
        }
        err.Line(std::string("vornctl: ") + failure.what());
        return failure.code();
    }
}

int Run(int count, char** words) {
    Output out(stdout);
    Output err(stderr);
    Program program;
    SetUp(program);
    const std::string forbidden = Forbidden(count, words);
    int code = kDone;
    try {
        if (!forbidden.empty()) {
            return ReportUsage(program, err, forbidden);
        }
        program.app.parse(count, words);
        code = RunCommand(program, out, err);
    } catch (const CLI::Success& success) {
        std::ostringstream help;
        program.app.exit(success, help, help);
        out.Line(Tidied(help.str()));
    } catch (const CLI::ParseError& error) {
        return ReportUsage(program, err, UsageText(program.app, error));
    }
    if (!out.Flush()) {
        err.Line("vornctl: The output could not be written.");
        return code == kDone ? kOutputFailed : code;
    }
    return code;
}

}  // namespace

}  // namespace appliance::ctl

int main(int count, char** words) {
    try {
        return appliance::ctl::Run(count, words);
    } catch (const std::exception& error) {
        std::fprintf(stderr, "vornctl: %s\n", error.what());
        return appliance::ctl::kNoAnswer;
    }
}
