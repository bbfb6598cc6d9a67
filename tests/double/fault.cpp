#include "tests/double/fault.h"

#include <cstdint>

namespace fake {

Fault Fault::Result(int result) {
    return {Kind::kResult, result};
}

Fault Fault::Null() {
    return {Kind::kNull, 0};
}

Fault Fault::False() {
    return {Kind::kFalse, 0};
}

Fault Fault::Throw() {
    return {Kind::kThrow, 0};
}

std::string Fault::Text() const {
    switch (kind) {
        case Kind::kNull:
            return "null";
        case Kind::kFalse:
            return "false";
        case Kind::kThrow:
            return "throws";
        case Kind::kResult:
            break;
    }
    return std::to_string(result);
}

bool operator==(const Fault& left, const Fault& right) {
    return left.kind == right.kind && left.result == right.result;
}

InjectedException::InjectedException(const std::string& function)
    : std::runtime_error("injected failure of " + function) {}

int ErrorCodeOf(const std::string& function) {
    std::uint32_t hash = 2166136261U;
    for (const char character : function) {
        hash = (hash ^ static_cast<unsigned char>(character)) * 16777619U;
    }
    return static_cast<int>(0x10000U + hash % 0x1000000U);
}

}  // namespace fake
