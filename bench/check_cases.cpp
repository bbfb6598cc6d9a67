// Holds every case against the module before anything is measured: the operation must answer as the case says, and its
// platform calls must be those of platform_calls.h, in the same order. Otherwise the difference of the two means
// nothing.

#include <cstdio>
#include <cstring>

#include "bench/cases.h"

namespace {

using Names = std::vector<const char*>;

const char* NameAt(const Names& names, std::size_t index) {
    return index < names.size() ? names[index] : "(end)";
}

bool SameCalls(const char* caseName, const Names& module, const Names& platform) {
    for (std::size_t i = 0; i < module.size() || i < platform.size(); ++i) {
        if (std::strcmp(NameAt(module, i), NameAt(platform, i)) != 0) {
            std::printf("%s: call %zu is %s in the module, %s in platform_calls\n", caseName, i, NameAt(module, i),
                        NameAt(platform, i));
            return false;
        }
    }
    return true;
}

bool Check(const char* name, const bench::Case& aCase, const cheap::Sizes& sizes) {
    bench::Fixture fixture(aCase, sizes);
    cheap::Trace().clear();
    fixture.Call();
    const Names module = cheap::Trace();
    const int answer = cheap::TheState().lastCode;
    cheap::Trace().clear();
    fixture.CallPlatform();
    bool good = SameCalls(name, module, cheap::Trace());
    if (answer != aCase.answer) {
        std::printf("%s: answers %d instead of %d\n", name, answer, aCase.answer);
        good = false;
    }
    if (module.empty()) {
        std::printf("%s: no calls were noted\n", name);
        good = false;
    }
    return good;
}

}  // namespace

int main() {
    bool good = true;
    for (const bench::Case& aCase : bench::Cases()) {
        good = Check(aCase.name, aCase, cheap::Sizes()) && good;
    }
    for (const bench::ListCase& list : bench::ListCases()) {
        for (const int length : {1, 10, 1000}) {
            cheap::Sizes sizes;
            sizes.*list.length = length;
            good = Check(list.name, bench::FindCase(list.caseName), sizes) && good;
        }
    }
    std::printf(good ? "every case makes the platform calls that it is measured against\n" : "cases differ\n");
    return good ? 0 : 1;
}
