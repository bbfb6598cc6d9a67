#include <gmock/gmock.h>

#include <cstdio>
#include <memory>

#include "appliance/tools/vornctl/catalogue.h"
#include "appliance/tools/vornctl/client.h"
#include "appliance/tools/vornctl/exit_code.h"
#include "appliance/tools/vornctl/output.h"
#include "appliance/tools/vornctl/schedule_words.h"

namespace appliance::ctl {
namespace {

using testing::ElementsAre;

// What `print` writes to an output that is no terminal.
template <typename Print>
std::string Printed(Print print) {
    const std::unique_ptr<std::FILE, int (*)(std::FILE*)> file(std::tmpfile(), std::fclose);
    Output output(file.get());
    print(output);
    EXPECT_TRUE(output.Flush());
    std::string text(static_cast<std::size_t>(std::ftell(file.get())), '\0');
    std::rewind(file.get());
    EXPECT_EQ(std::fread(text.data(), 1, text.size(), file.get()), text.size());
    return text;
}

TEST(Escape, KeepsOrdinaryText) {
    EXPECT_EQ(Escape(""), "");
    EXPECT_EQ(Escape("Anna Bergström, 北京 😀 \\x41"), "Anna Bergström, 北京 😀 \\x41");
}

TEST(Escape, ShowsControlBytes) {
    EXPECT_EQ(Escape(std::string_view("a\0b", 3)), "a\\x00b");
    EXPECT_EQ(Escape("\x1b[2J\r\n\t\x7f"), "\\x1B[2J\\x0D\\x0A\\x09\\x7F");
}

TEST(Escape, ShowsWhatIsHiddenOrTurnsTheText) {
    EXPECT_EQ(Escape("a\u200bb\u202ec\u0085\ufeff"), "a\\u{200B}b\\u{202E}c\\u{0085}\\u{FEFF}");
}

TEST(Escape, ShowsBytesThatAreNoUtf8) {
    EXPECT_EQ(Escape("\xff"), "\\xFF");
    EXPECT_EQ(Escape("\xc3"), "\\xC3");
    EXPECT_EQ(Escape("\xc0\xaf"), "\\xC0\\xAF");
    EXPECT_EQ(Escape("\xe0\x80\x80"), "\\xE0\\x80\\x80");
    EXPECT_EQ(Escape("\xed\xa0\x80"), "\\xED\\xA0\\x80");
    EXPECT_EQ(Escape("\xf4\x90\x80\x80"), "\\xF4\\x90\\x80\\x80");
    EXPECT_EQ(Escape("\xf8\x88\x80\x80\x80"), "\\xF8\\x88\\x80\\x80\\x80");
    EXPECT_EQ(Escape("\xe2\x82 "), "\\xE2\\x82 ");
}

TEST(Escape, LeavesNothingThatNeedsEscapingForAnyTwoBytes) {
    for (int first = 0; first < 256; ++first) {
        for (int second = 0; second < 256; ++second) {
            const std::string text = {static_cast<char>(first), static_cast<char>(second)};
            const std::string shown = Escape(text);
            ASSERT_TRUE(IsUtf8(shown));
            for (const char byte : shown) {
                const auto value = static_cast<unsigned char>(byte);
                ASSERT_TRUE(value >= 0x20 && value != 0x7F) << first << " " << second;
            }
        }
    }
}

TEST(IsUtf8, TellsThem) {
    EXPECT_TRUE(IsUtf8("Ü€😀"));
    EXPECT_FALSE(IsUtf8("\xdc"));
}

TEST(Columns, CountsWhatATerminalShows) {
    EXPECT_EQ(Columns(""), 0U);
    EXPECT_EQ(Columns("Bergström"), 9U);
    EXPECT_EQ(Columns("北京"), 4U);
    EXPECT_EQ(Columns("e\u0301"), 1U);
}

TEST(Wrap, BreaksAtBlanks) {
    EXPECT_THAT(Wrap("one two three", 7), ElementsAre("one two", "three"));
    EXPECT_THAT(Wrap("one two three", 8), ElementsAre("one two", "three"));
    EXPECT_THAT(Wrap("one  two", 4), ElementsAre("one ", "two"));
    EXPECT_THAT(Wrap("", 5), ElementsAre());
}

TEST(Wrap, BreaksLongWords) {
    EXPECT_THAT(Wrap("abcdefgh", 3), ElementsAre("abc", "def", "gh"));
    EXPECT_THAT(Wrap("北京", 3), ElementsAre("北", "京"));
    EXPECT_THAT(Wrap("北", 1), ElementsAre("北"));
}

TEST(Output, HasEightyColumnsAndNoColoursInAFile) {
    EXPECT_EQ(Printed([](Output& output) {
                  EXPECT_EQ(output.width(), 80U);
                  EXPECT_FALSE(output.isTerminal());
                  output.Line(output.Coloured(Colour::Bad, "text"));
                  output.Transient("gone");
              }),
              "text\n");
}

TEST(Output, AlignsFacts) {
    EXPECT_EQ(Printed([](Output& output) {
                  output.Facts({{"Name", "LAB"}, {"Longer name", ""}, {"Text", "a\nb"}});
              }),
              "Name         LAB\nLonger name  -\nText         a\\x0Ab\n");
}

TEST(Output, AlignsColumns) {
    EXPECT_EQ(Printed([](Output& output) {
                  output.Table({"NAME", ">ID", "TEXT"}, {{"anna", "7", "x"}, {"北", "1000", ""}, {"short"}});
              }),
              "NAME     ID  TEXT\nanna      7  x\n北     1000\nshort\n");
}

TEST(Output, WrapsCellsSoThatNothingIsLost) {
    const std::string text = Printed([](Output& output) {
        output.Table({"A", "B", "C"}, {{std::string(60, 'a'), std::string(90, 'b'), "c"}});
    });
    std::size_t letters = 0;
    std::size_t begin = 0;
    for (std::size_t end = text.find('\n'); end != std::string::npos; end = text.find('\n', begin)) {
        EXPECT_LE(end - begin, 80U);
        begin = end + 1;
    }
    for (const char byte : text) {
        letters += byte == 'a' || byte == 'b' || byte == 'c' ? 1U : 0U;
    }
    EXPECT_EQ(letters, 151U);
}

TEST(Output, TellsThatItCanNotBeWritten) {
    const std::unique_ptr<std::FILE, int (*)(std::FILE*)> file(std::fopen("/dev/full", "w"), std::fclose);
    Output output(file.get());
    output.Line("text");
    EXPECT_FALSE(output.Flush());
}

TEST(Texts, OfTimes) {
    EXPECT_EQ(TimeText(Json::Value()), "never");
    EXPECT_EQ(TimeText(0), "never");
    EXPECT_EQ(TimeText("1"), "never");
    EXPECT_EQ(TimeText(Json::Value(Json::Int64{9223372036854775807})), "never");
    EXPECT_THAT(TimeText(1764230400), testing::MatchesRegex("2025-11-2[678] ..:..:00"));
    EXPECT_EQ(DurationText(42), "0.04 s");
    EXPECT_EQ(DurationText(-1), "");
    EXPECT_EQ(DurationText("x"), "");
}

TEST(Json, IsPrintedInAscii) {
    Json::Value value;
    value["text"] = "Ü\u0085\x1b\x7f\\";
    EXPECT_EQ(JsonLine(value), R"({"text":"\u00dc\u0085\u001b\u007f\\"})");
    EXPECT_EQ(JsonPretty(value), "{\n    \"text\" : \"\\u00dc\\u0085\\u001b\\u007f\\\\\"\n}");
}

TEST(Json, IsReadStrictly) {
    Json::Value value;
    EXPECT_TRUE(ParseJson("{\"a\":1}", value));
    for (const char* text : {"", "{", "{\"a\":1,}", "{a:1}", "{} {}", "{\"a\":1,\"a\":2}", "// c\n{}"}) {
        EXPECT_FALSE(ParseJson(text, value)) << text;
    }
    EXPECT_FALSE(ParseJson(std::string(100000, '['), value));
}

TEST(Json, MembersOfAnyValue) {
    Json::Value value;
    value["text"] = "a";
    value["number"] = 7;
    value["half"] = 7.5;
    value["list"].append(1);
    EXPECT_EQ(TextOf(value, "text"), "a");
    EXPECT_EQ(TextOf(value, "number"), "");
    EXPECT_EQ(TextOf(Json::Value(7), "text"), "");
    EXPECT_EQ(NumberOf(value, "number"), 7);
    EXPECT_EQ(NumberOf(value, "half"), 0);
    EXPECT_EQ(NumberOf(value, "text"), 0);
    EXPECT_EQ(ListOf(value, "list").size(), 1U);
    EXPECT_TRUE(ListOf(value, "text").isArray());
    EXPECT_FALSE(FlagOf(value, "number"));
}

TEST(Catalogue, IsInTheProgram) {
    ASSERT_NE(FindErrorText(2605), nullptr);
    EXPECT_EQ(FindErrorText(2605)->meaning, "No domain controller was found.");
    EXPECT_EQ(FindErrorText(2616), nullptr);
    EXPECT_GE(MethodCatalogue().size(), 19U);
}

Json::Value Schedule(const char* text) {
    Json::Value value;
    EXPECT_TRUE(ParseJson(text, value)) << text;
    return value;
}

TEST(ScheduleWords, OfEachKind) {
    EXPECT_EQ(ScheduleWords(Schedule(R"({"date_type":0,"week_name":"0","hour":3,"min":30})")),
              "Every Sunday at 03:30.");
    EXPECT_EQ(ScheduleWords(Schedule(R"({"date_type":0,"week_name":"0,1,6","hour":3,"min":5})")),
              "Every Sunday, Monday and Saturday at 03:05.");
    EXPECT_EQ(ScheduleWords(Schedule(R"({"date_type":0,"week_name":"0,1,2,3,4,5,6","hour":23,"min":0})")),
              "Every day at 23:00.");
    EXPECT_EQ(ScheduleWords(Schedule(R"({"date_type":1,"date":"2026/11/29","repeat":0,"hour":3,"min":30})")),
              "Once, on 2026/11/29, at 03:30.");
    EXPECT_EQ(ScheduleWords(Schedule(R"({"date_type":1,"date":"2026/11/29","repeat":1,"hour":3,"min":30})")),
              "Every day from 2026/11/29 on, at 03:30.");
    EXPECT_EQ(ScheduleWords(Schedule(R"({"date_type":1,"date":"2026/11/29","repeat":2,"hour":3,"min":30})")),
              "Every seventh day from 2026/11/29 on, at 03:30.");
    EXPECT_EQ(ScheduleWords(Schedule(R"({"date_type":1,"date":"2026/11/29","repeat":3,"hour":3,"min":30})")),
              "Every month on day 29, or its last one, from 2026/11/29 on, at 03:30.");
    EXPECT_EQ(ScheduleWords(Schedule(R"({"date_type":1,"date":"2027/1/5","repeat":3,"hour":3,"min":30})")),
              "Every month on day 5 from 2027/1/5 on, at 03:30.");
    EXPECT_EQ(ScheduleWords(Schedule(R"({"date_type":1,"date":"2026/11/29","repeat":4,"hour":3,"min":30})")),
              "Every year on 11/29 from 2026/11/29 on, at 03:30.");
    EXPECT_THAT(ScheduleWords(Schedule(R"({"date_type":2})")), testing::HasSubstr("no schedule"));
}

TEST(ScheduleWords, OfRepeatedHours) {
    const char* const values =
        R"({"date_type":0,"week_name":"1","hour":6,"min":5,"repeat_hour":%d,"last_work_hour":%d})";
    const auto words = [values](int every, int until) {
        char text[200];
#pragma GCC diagnostic push
#pragma GCC diagnostic ignored "-Wformat-nonliteral"
        std::snprintf(text, sizeof(text), values, every, until);
#pragma GCC diagnostic pop
        return ScheduleWords(Schedule(text));
    };
    EXPECT_EQ(words(4, 20), "Every Monday at 06:05 and every 4 hours from then to 18:05.");
    EXPECT_EQ(words(1, 7), "Every Monday at 06:05 and every hour from then to 07:05.");
    EXPECT_EQ(words(0, 20), "Every Monday at 06:05.");
    EXPECT_EQ(words(4, 9), "Every Monday at 06:05.");
}

TEST(ScheduleWords, OfValuesThatAreNone) {
    for (const char* text : {R"({"date_type":0})", R"({"date_type":0,"week_name":"9,,xyz","hour":"x"})",
                             R"({"date_type":1,"date":"","repeat":99})", R"({"date_type":1,"date":7})", "[]", "null"}) {
        EXPECT_FALSE(ScheduleWords(Schedule(text)).empty());
    }
}

TEST(ScheduleRequest, SaysWhatIsWrong) {
    ScheduleWish wish;
    wish.weekdays = {"sun"};
    wish.time = "25:00";
    try {
        ScheduleRequest(wish);
        FAIL();
    } catch (const Failure& failure) {
        EXPECT_EQ(failure.code(), kUsage);
        EXPECT_STREQ(failure.what(), "\"25:00\" is no time of day: write it as 03:30.");
    }
}

TEST(ScheduleRequest, KnowsTheDays) {
    ScheduleWish wish;
    wish.time = "00:00";
    wish.weekdays = {"Saturday", " mon", "1", "0"};
    EXPECT_EQ(ScheduleRequest(wish)["week_name"], "0,1,6");
}

}  // namespace
}  // namespace appliance::ctl
