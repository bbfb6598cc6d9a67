// What a command line may hold. The commands declare it here; the parser behind it, CLI11, is known to arguments.cpp and
// main.cpp alone, since each source that includes it takes many times as long to compile.

#ifndef VORN_APPLIANCE_TOOLS_VORNCTL_ARGUMENTS_H
#define VORN_APPLIANCE_TOOLS_VORNCTL_ARGUMENTS_H

#include <optional>
#include <string>
#include <vector>

namespace CLI {
class App;
class Option;
}  // namespace CLI

namespace appliance::ctl {

// An argument that was declared, to say more of it. Valid as long as the parser that it belongs to.
class Argument {
public:
    explicit Argument(CLI::Option& option) : m_option(&option) {}

    Argument& TypeName(const char* name);    // what the help calls the value; "" for no name
    Argument& Group(const char* title);      // the heading of the help that it stands under
    Argument& Required();                    // wrong usage without it
    Argument& Between(int least, int most);  // any other number is wrong usage
    Argument& OneOf(const std::vector<std::string>& values);

private:
    CLI::Option* m_option;
};

// The arguments of one command, or of the program itself. A copy stands for the same ones. Names are as on the command
// line: "--long", "-s,--long", or "WORD" for one that goes by its place. What is given there is put where the declaration
// says, before the command runs; that place must live as long as the parser.
class Arguments {
public:
    explicit Arguments(CLI::App& parser) : m_parser(&parser) {}

    Argument Flag(const char* names, bool& given, const char* help);
    Argument Text(const char* names, std::string& value, const char* help);
    Argument Number(const char* names, int& value, const char* help);
    // One word that holds several values with commas between them. The option may come more than once.
    Argument List(const char* names, std::vector<std::string>& values, const char* help);
    // All words that are left.
    Argument Rest(const char* name, std::vector<std::string>& words, const char* help);
    // What stands below the help.
    void Footer(const char* text);

    // Whether the command line had this option.
    bool Had(const char* option) const;

    // What completion asks.
    std::string Name() const;
    Arguments Program() const;  // of a command
    std::optional<Arguments> Command(const std::string& name) const;
    std::vector<std::string> LongOptions() const;
    bool TakesValue(const std::string& option) const;  // false for one that is not declared

private:
    CLI::App* m_parser;
};

}  // namespace appliance::ctl

#endif
