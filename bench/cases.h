// What is measured: the operations in their usual sizes, and the operations that walk a list, by the list's length.

#ifndef VORN_BENCH_CASES_H
#define VORN_BENCH_CASES_H

#include <json/value.h>

#include <vector>

#include "bench/cheap_platform.h"
#include "platform/webapi.h"

namespace bench {

// An operation in one of its courses.
struct Case {
    const char* name;
    VORN::APIFunction call;           // through the API table, or a task body
    VORN::APIFunction platformCalls;  // the platform's side of it by itself
    Json::Value (*params)(const cheap::Sizes& sizes);
    cheap::Answers answers;
    int answer;  // the code that the client receives: 0 for success
};

// A case whose time depends on the length of a list.
struct ListCase {
    const char* name;
    const char* caseName;
    int cheap::Sizes::*length;
};

const std::vector<Case>& Cases();
const std::vector<ListCase>& ListCases();

// The case of a name; it must be there.
const Case& FindCase(const char* name);

// A request and a platform that are ready for a case.
class Fixture {
public:
    Fixture(const Case& aCase, const cheap::Sizes& sizes);
    void Call() {
        call_(&request_, &response_);
    }
    void CallPlatform() {
        platformCalls_(&request_, &response_);
    }

private:
    VORN::APIRequest request_;
    VORN::APIResponse response_;
    VORN::APIFunction call_;
    VORN::APIFunction platformCalls_;
};

}  // namespace bench

#endif
