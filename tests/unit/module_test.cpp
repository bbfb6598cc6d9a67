#include "tests/unit/module_test.h"

#include <syslog.h>

#include <cstdio>
#include <sstream>

#include "tests/unit/log_lines.h"

namespace unit {

using ::testing::AllOf;
using ::testing::Field;
using ::testing::IsEmpty;

Json::Value FromJson(const std::string& text) {
    Json::CharReaderBuilder builder;
    Json::Value value;
    std::string errors;
    std::istringstream stream(text);
    EXPECT_TRUE(Json::parseFromStream(builder, stream, &value, &errors)) << text << ": " << errors;
    return value;
}

Json::Value JoinRequest() {
    return FromJson(
        R"({"enable_domain": true, "domain_name": "lab.test", "username": "joiner", "password": "Canary-1"})");
}

ModuleTest::ModuleTest() : appliance(fake::TheAppliance()), state(appliance.state) {
    appliance.Reset();
}

void ModuleTest::TearDown() {
    EXPECT_EQ(appliance.LiveHandles(), 0) << appliance.LiveHandleNames();
    EXPECT_THAT(appliance.Misuses(), IsEmpty());
    for (const fake::LogLine& line : appliance.Logs()) {
        EXPECT_EQ(AstrayFrom(line), "");
    }
}

void ModuleTest::Restart() {
    ModuleTest::TearDown();
    appliance.Reset();
}

fake::Answer ModuleTest::Call(VORN::APIFunction function, const Json::Value& parameters) {
    const std::size_t before = appliance.Answers().size();
    fake::Exchange exchange(parameters);
    function(&exchange.request, &exchange.response);
    const auto& answers = appliance.Answers();
    EXPECT_EQ(answers.size(), before + 1) << "a request is answered once";
    return answers.empty() ? fake::Answer() : answers.back();
}

void ModuleTest::BeMember() {
    state.domainName = "LAB";
    state.workgroup = "LAB";
    state.ownDomain = "LAB";
    state.firstFlag = 1;
    state.secondFlag = 1;
    state.joinedFlag = 1;
    state.adsJoined = 1;
    state.keyValueFiles[kSmbConfPath]["global"] = {{"security", "ads"}, {"workgroup", "LAB"}, {"realm", "LAB.TEST"}};
}

::testing::Matcher<const fake::Answer&> Succeeds(const std::string& json) {
    return AllOf(Field("success", &fake::Answer::success, true), Field("data", &fake::Answer::data, FromJson(json)));
}

::testing::Matcher<const fake::Answer&> FailsWith(int code, const std::string& json) {
    return AllOf(Field("success", &fake::Answer::success, false), Field("code", &fake::Answer::code, code),
                 Field("data", &fake::Answer::data, FromJson(json)));
}

::testing::Matcher<const fake::LogLine&> Logs(const std::string& unit, const std::string& format,
                                              const std::string& message) {
    return AllOf(Field("priority", &fake::LogLine::priority, LOG_ERR), Field("unit", &fake::LogLine::unit, unit),
                 Field("format", &fake::LogLine::format, format), Field("message", &fake::LogLine::message, message));
}

std::string LastErrorText(const fake::State& state) {
    char text[128];
    std::snprintf(text, sizeof(text), "[0x%04X %s:%d]", static_cast<unsigned>(state.lastError.code),
                  state.lastError.file, state.lastError.line);
    return text;
}

}  // namespace unit
