// Whether the loader refuses the module in a host that lacks one of the appliance's symbols, and names the symbol.

#include <cstdio>
#include <exception>
#include <string>

#include "tests/library/module_library.h"

int main(int argc, char** argv) {
    if (argc != 3) {
        std::fprintf(stderr, "usage: %s vorn_directory_domain.so missing-symbol\n", argv[0]);
        return 2;
    }
    const std::string symbol = argv[2];
    try {
        const ModuleLibrary module(argv[1]);
    } catch (const std::exception& refusal) {
        std::printf("%s\n", refusal.what());
        const std::string words = refusal.what();
        const bool named =
            words.size() > symbol.size() && words.compare(words.size() - symbol.size(), std::string::npos, symbol) == 0;
        return named ? 0 : 1;
    }
    std::printf("the module was loaded although the host has no %s\n", symbol.c_str());
    return 1;
}
