#include "appliance/tools/vornctl/arguments.h"

#include <CLI/CLI.hpp>

namespace appliance::ctl {

Argument& Argument::TypeName(const char* name) {
    m_option->type_name(name);
    return *this;
}

Argument& Argument::Group(const char* title) {
    m_option->group(title);
    return *this;
}

Argument& Argument::Required() {
    m_option->required();
    return *this;
}

// The help names the values itself, so the checks add nothing to it.
Argument& Argument::Between(int least, int most) {
    m_option->check(CLI::Range(least, most).description(""));
    return *this;
}

Argument& Argument::OneOf(const std::vector<std::string>& values) {
    m_option->check(CLI::IsMember(values).description(""));
    return *this;
}

Argument Arguments::Flag(const char* names, bool& given, const char* help) {
    return Argument(*m_parser->add_flag(names, given, help));
}

Argument Arguments::Text(const char* names, std::string& value, const char* help) {
    return Argument(*m_parser->add_option(names, value, help));
}

Argument Arguments::Number(const char* names, int& value, const char* help) {
    return Argument(*m_parser->add_option(names, value, help));
}

Argument Arguments::List(const char* names, std::vector<std::string>& values, const char* help) {
    return Argument(*m_parser->add_option(names, values, help)->delimiter(',')->allow_extra_args(false));
}

Argument Arguments::Rest(const char* name, std::vector<std::string>& words, const char* help) {
    return Argument(*m_parser->add_option(name, words, help));
}

void Arguments::Footer(const char* text) {
    m_parser->footer(text);
}

bool Arguments::Had(const char* option) const {
    return m_parser->count(option) > 0;
}

std::string Arguments::Name() const {
    return m_parser->get_name();
}

Arguments Arguments::Program() const {
    return Arguments(*m_parser->get_parent());
}

std::optional<Arguments> Arguments::Command(const std::string& name) const {
    for (CLI::App* const command : m_parser->get_subcommands(nullptr)) {
        if (command->get_name() == name) {
            return Arguments(*command);
        }
    }
    return std::nullopt;
}

std::vector<std::string> Arguments::LongOptions() const {
    std::vector<std::string> names;
    for (const CLI::Option* const option : m_parser->get_options()) {
        for (const std::string& name : option->get_lnames()) {
            names.push_back("--" + name);
        }
    }
    return names;
}

bool Arguments::TakesValue(const std::string& option) const {
    const CLI::Option* const found = m_parser->get_option_no_throw(option);
    return found != nullptr && found->get_items_expected_max() > 0;
}

}  // namespace appliance::ctl
