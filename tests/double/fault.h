// How a call of the imitated appliance is made to fail.

#ifndef VORN_TESTS_DOUBLE_FAULT_H
#define VORN_TESTS_DOUBLE_FAULT_H

#include <stdexcept>
#include <string>

namespace fake {

struct Fault {
    enum class Kind { kResult, kNull, kFalse, kThrow };

    static Fault Result(int result);
    static Fault Null();
    static Fault False();
    static Fault Throw();

    // "-1", "null", "false" or "throws", as the platform's headers write it.
    std::string Text() const;

    Kind kind = Kind::kResult;
    int result = -1;
};

bool operator==(const Fault& left, const Fault& right);

// What a call throws that fails by Fault::Throw().
class InjectedException : public std::runtime_error {
public:
    explicit InjectedException(const std::string& function);
};

// The code that a failing call of `function` leaves as last error.
int ErrorCodeOf(const std::string& function);

}  // namespace fake

#endif
