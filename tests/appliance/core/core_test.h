// What the tests of the core operations share.

#ifndef VORN_TESTS_APPLIANCE_CORE_CORE_TEST_H
#define VORN_TESTS_APPLIANCE_CORE_CORE_TEST_H

#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <initializer_list>
#include <string>
#include <utility>

#include "appliance/base/error_code.h"
#include "platform/core.h"
#include "tests/appliance/base/temporary_folder.h"

namespace appliance_test {

using appliance::ErrorCode;

class CoreTest : public FolderTest {
protected:
    CoreTest() {
        VLIBCErrSetEx(0, "untouched", 0);
    }
};

// An owned hash that follows its replacements.
class Hash {
public:
    Hash(std::initializer_list<std::pair<std::string, std::string>> entries = {}) : hash_(VLIBCSzHashAlloc(1024)) {
        for (const auto& [key, value] : entries) {
            EXPECT_GE(VLIBCSzHashSetValue(&hash_, key.c_str(), value.c_str()), 0);
        }
    }
    ~Hash() {
        VLIBCSzHashFree(hash_);
    }
    Hash(const Hash&) = delete;
    Hash& operator=(const Hash&) = delete;

    VLIBSZHASH* get() const {
        return hash_;
    }
    VLIBSZHASH** address() {
        return &hash_;
    }
    std::string Value(const std::string& key) const {
        const char* value = VLIBCSzHashGetValue(hash_, key.c_str());
        return value == nullptr ? "<none>" : value;
    }

private:
    VLIBSZHASH* hash_;
};

}  // namespace appliance_test

// The call failed with `result`, and left this code and a place as its thread's last error.
#define EXPECT_FAILS(call, result, code)                                         \
    do {                                                                         \
        VLIBCErrSetEx(0, "untouched", 0);                                        \
        EXPECT_EQ(call, result);                                                 \
        EXPECT_EQ(VLIBCErrGet(), static_cast<int>(appliance::ErrorCode::code));  \
        EXPECT_THAT(VLIBCErrorGetFile(), testing::EndsWith(".cpp"));             \
        EXPECT_THAT(VLIBCErrorGetFile(), testing::Not(testing::HasSubstr("/"))); \
        EXPECT_GT(VLIBCErrorGetLine(), 0);                                       \
    } while (false)

// The call answered `result` and left the last error alone.
#define EXPECT_SUCCEEDS(call, result)                   \
    do {                                                \
        VLIBCErrSetEx(4711, "untouched", 17);           \
        EXPECT_EQ(call, result);                        \
        EXPECT_EQ(VLIBCErrGet(), 4711);                 \
        EXPECT_STREQ(VLIBCErrorGetFile(), "untouched"); \
        EXPECT_EQ(VLIBCErrorGetLine(), 17);             \
    } while (false)

#endif
