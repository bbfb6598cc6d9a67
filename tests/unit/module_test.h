// What the module's unit tests share: a fresh appliance for each test, calls of entry functions, and matchers for what
// was logged and answered. After each test nothing may be left over: no handle, and no use against a declaration.

#ifndef VORN_TESTS_UNIT_MODULE_TEST_H
#define VORN_TESTS_UNIT_MODULE_TEST_H

#include <gmock/gmock.h>
#include <gtest/gtest.h>
#include <json/json.h>

#include <string>
#include <vector>

#include "platform/webapi.h"
#include "tests/double/appliance.h"

namespace unit {

constexpr const char* kSmbConfPath = "/usr/vorn/etc/smb.conf";
constexpr const char* kSmbInfoPath = "/usr/vorn/etc/smbinfo.conf";

// A JSON text as a value; a text that is no JSON fails the test.
Json::Value FromJson(const std::string& text);

// A request that can't be mistaken: domain, account and password are all different.
Json::Value JoinRequest();

class ModuleTest : public ::testing::Test {
protected:
    ModuleTest();
    void TearDown() override;

    // What TearDown checks, and a fresh appliance: for tests that go through many cases.
    void Restart();

    // Calls an entry function and returns the only answer that it gave.
    fake::Answer Call(VORN::APIFunction function, const Json::Value& parameters = Json::Value(Json::objectValue));

    // Makes the appliance a member of the Active Directory domain "LAB".
    void BeMember();

    fake::Appliance& appliance;
    fake::State& state;
};

// An answer of success with this data (as JSON text), or of failure with this code and, unless given, null data.
::testing::Matcher<const fake::Answer&> Succeeds(const std::string& json);
::testing::Matcher<const fake::Answer&> FailsWith(int code, const std::string& json = "null");

// A log line of `unit` at error priority: the format word for word, and the text that it gave behind "unit:number ".
::testing::Matcher<const fake::LogLine&> Logs(const std::string& unit, const std::string& format,
                                              const std::string& message);

// The last error as a log line shows it, "[0x1234 platform.c:77]".
std::string LastErrorText(const fake::State& state);

}  // namespace unit

#endif
