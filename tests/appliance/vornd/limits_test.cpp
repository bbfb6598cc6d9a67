// The limits are promised: their numbers stand here once more, and in the document of the web API.

#include "appliance/web/limits.h"

#include <gmock/gmock.h>

#include <fstream>
#include <sstream>
#include <string>

namespace vornd_test {
namespace {

using ::testing::HasSubstr;

// The paragraphs under a heading, each line break a blank.
std::string Section(const std::string& file, const std::string& heading) {
    std::ifstream stream(std::string(VORN_SOURCES) + "/" + file);
    std::string text;
    bool inside = false;
    for (std::string line; std::getline(stream, line);) {
        if (line.rfind("## ", 0) == 0) {
            inside = line == "## " + heading;
        } else if (inside) {
            text += line + " ";
        }
    }
    return text;
}

TEST(LimitsTest, AreTheNumbersThatArePromised) {
    using namespace appliance;
    EXPECT_EQ(kHeaderLimit, 8192u);
    EXPECT_EQ(kBodyLimit, 65536u);
    EXPECT_EQ(kJsonDepth, 10);
    EXPECT_EQ(kConnections, 256u);
    EXPECT_EQ(kDoorConnections, 192u);
    EXPECT_EQ(kWaitingCalls, 64u);
    EXPECT_EQ(kWorkers, 16u);
    EXPECT_EQ(kSendLimit.count(), 15);
    EXPECT_EQ(kAnswerLimit.count(), 15);
    EXPECT_EQ(kLingerLimit.count(), 2);
    EXPECT_EQ(kDrainLimit.count(), 300);
}

TEST(LimitsTest, TheDocumentNamesThem) {
    const std::string text = Section("docs/web-api.md", "Limits");
    EXPECT_THAT(text, HasSubstr("Header 8 KiB; body 64 KiB; 10 levels of JSON,"));
    EXPECT_THAT(text, HasSubstr(" 15 seconds from a request's first byte to its last;"));
    EXPECT_THAT(text, HasSubstr(" 256 connections,"));
    EXPECT_THAT(text, HasSubstr(" 192 at most are of `vorn-httpd`;"));
    EXPECT_THAT(text, HasSubstr(" 64 waiting calls."));
}

}  // namespace
}  // namespace vornd_test
