#include "tests/faults/options.h"

#include <stdexcept>

namespace sweep {

const char* const kUsage =
    "sweep                                     all operations\n"
    "sweep --operation NAME [--scenario NAME]  one of them\n"
    "      --part NUMBER/PARTS                 every so manyth of its scenarios, without a look at the edges\n"
    "      --no-pairs                          single failures only\n"
    "      --fail CALL=VALUE ...               one run: this call fails by -1, null, false, throws, ...\n"
    "      --sticky                            ... and each later call of the same function\n"
    "      --from CALL                         ... and every call from this one on\n"
    "      --show                              one run without failures\n"
    "sweep --list                              the operations and their scenarios\n"
    "sweep --self-test                         whether the checks find what they are for\n";

namespace {

std::size_t ToNumber(const std::string& text) {
    std::size_t used = 0;
    const unsigned long number = std::stoul(text, &used);
    if (used != text.size()) {
        throw std::invalid_argument("no number: " + text);
    }
    return number;
}

Part ToPart(const std::string& text) {
    const std::size_t slash = text.find('/');
    if (slash == std::string::npos) {
        throw std::invalid_argument("--part takes NUMBER/PARTS");
    }
    const Part part{ToNumber(text.substr(0, slash)), ToNumber(text.substr(slash + 1))};
    if (part.number == 0 || part.number > part.of) {
        throw std::invalid_argument("there is no part " + text);
    }
    return part;
}

fake::Fault ToFault(const std::string& text) {
    if (text == "null") {
        return fake::Fault::Null();
    }
    if (text == "false") {
        return fake::Fault::False();
    }
    if (text == "throws") {
        return fake::Fault::Throw();
    }
    std::size_t used = 0;
    const int result = std::stoi(text, &used);
    if (used != text.size()) {
        throw std::invalid_argument("no result of a call: " + text);
    }
    return fake::Fault::Result(result);
}

Point ToPoint(const std::string& text) {
    const std::size_t equals = text.find('=');
    if (equals == std::string::npos) {
        throw std::invalid_argument("--fail takes CALL=VALUE");
    }
    return {ToNumber(text.substr(0, equals)), ToFault(text.substr(equals + 1))};
}

}  // namespace

Options ParseOptions(int count, const char* const* arguments) {
    Options options;
    for (int i = 1; i < count; ++i) {
        const std::string name = arguments[i];
        const auto value = [&] {
            if (++i >= count) {
                throw std::invalid_argument(name + " takes a value");
            }
            return std::string(arguments[i]);
        };
        if (name == "--operation") {
            options.operation = value();
        } else if (name == "--scenario") {
            options.scenario = value();
        } else if (name == "--part") {
            options.part = ToPart(value());
        } else if (name == "--fail") {
            options.plan.points.push_back(ToPoint(value()));
            options.single = true;
        } else if (name == "--from") {
            options.plan.from = ToNumber(value());
            options.single = true;
        } else if (name == "--sticky") {
            options.plan.sticky = true;
        } else if (name == "--show") {
            options.single = true;
        } else if (name == "--no-pairs") {
            options.pairs = false;
        } else if (name == "--list") {
            options.list = true;
        } else if (name == "--self-test") {
            options.selfTest = true;
        } else {
            throw std::invalid_argument("unknown option " + name);
        }
    }
    if (options.single && (options.operation.empty() || options.scenario.empty())) {
        throw std::invalid_argument("one run needs --operation and --scenario");
    }
    if (options.part.of > 1 && (options.operation.empty() || !options.scenario.empty())) {
        throw std::invalid_argument("--part goes with --operation alone");
    }
    return options;
}

}  // namespace sweep
