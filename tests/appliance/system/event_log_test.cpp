// The event log: what is kept, what is shown, and how many.

#include "appliance/platform/system/event_log.h"

#include <sys/resource.h>
#include <sys/stat.h>
#include <unistd.h>

#include <csignal>
#include <ctime>
#include <set>
#include <string>
#include <vector>

#include "appliance/base/error_code.h"
#include "appliance/base/paths.h"
#include "appliance/base/sqlite.h"
#include "platform/core.h"
#include "platform/eventlog.h"
#include "tests/appliance/system/system_test.h"

namespace {

using appliance::EventPage;
using appliance::EventText;
using appliance::ReadEvents;
using ::testing::ElementsAre;

class EventLog : public system_test::SystemTest {
protected:
    static std::vector<std::string> Texts(const EventPage& page) {
        std::vector<std::string> texts;
        for (const appliance::Event& event : page.events) {
            texts.push_back(event.text);
        }
        return texts;
    }

    static int Write(const std::string& argument, int code = 0x11800999) {
        return VORNLogSet1(1, 1, code, argument.c_str(), "", "", "");
    }
};

TEST_F(EventLog, ShowsTheEventsOfAMembership) {
    const std::time_t before = std::time(nullptr);
    ASSERT_EQ(VORNLogSet1(2, 1, 0x11800404, "LAB", "", "", ""), 0);
    ASSERT_EQ(VORNLogSet1(2, 1, 0x11800506, "WORKGROUP", "", "", ""), 0);
    const EventPage page = ReadEvents(0, 10);
    EXPECT_EQ(page.total, 2);
    EXPECT_THAT(Texts(page), ElementsAre("The appliance left its domain and is back in the workgroup WORKGROUP.",
                                         "The appliance joined the domain LAB."));
    EXPECT_EQ(page.events[1].code, 0x11800404);
    EXPECT_EQ(appliance::EventKindName(page.events[1].kind), "domain");
    EXPECT_EQ(appliance::EventLevelName(page.events[1].level), "information");
    EXPECT_GE(page.events[1].time, before);
    EXPECT_LE(page.events[0].time, std::time(nullptr));
}

TEST_F(EventLog, KeepsAnUnknownCodeWithItsArguments) {
    ASSERT_EQ(VORNLogSet1(7, 3, -2, "one", "", "three", ""), 0);
    const EventPage page = ReadEvents(0, 1);
    EXPECT_THAT(Texts(page), ElementsAre(R"(event 0xFFFFFFFE: "one", "", "three")"));
    EXPECT_EQ(page.events[0].code, -2);
    EXPECT_EQ(appliance::EventKindName(page.events[0].kind), "kind 7");
    EXPECT_EQ(appliance::EventLevelName(page.events[0].level), "level 3");
    EXPECT_EQ(EventText(0x11800999, {}), "event 0x11800999");
}

TEST_F(EventLog, ShowsArgumentsAsOneLineOfUtf8) {
    EXPECT_EQ(EventText(0x11800404, {"a\nb\x1B[31m\x7F\r\t"}),
              "The appliance joined the domain a\\x0Ab\\x1B[31m\\x7F\\x0D\\x09.");
    EXPECT_EQ(appliance::Shown("\xC3\xA4 \xE2\x82\xAC \xF0\x9F\x98\x80"), "\xC3\xA4 \xE2\x82\xAC \xF0\x9F\x98\x80");
    EXPECT_EQ(appliance::Shown("\xC3"), "\\xC3");
    EXPECT_EQ(appliance::Shown("\xC3("), "\\xC3(");
    EXPECT_EQ(appliance::Shown("\xC0\xAF"), "\\xC0\\xAF");
    EXPECT_EQ(appliance::Shown("\xED\xA0\x80"), "\\xED\\xA0\\x80");
    EXPECT_EQ(appliance::Shown("\xE0\x80\x80"), "\\xE0\\x80\\x80");
    EXPECT_EQ(appliance::Shown("\xF4\x90\x80\x80"), "\\xF4\\x90\\x80\\x80");
    EXPECT_EQ(appliance::Shown("\xC2\x85"), "\\xC2\\x85");
    EXPECT_EQ(appliance::Shown("\xFF\xFE\x80"), "\\xFF\\xFE\\x80");
    EXPECT_EQ(appliance::Shown("\xE2\x82"), "\\xE2\\x82");
}

TEST_F(EventLog, IsReadInPages) {
    for (int number = 0; number < 25; ++number) {
        ASSERT_EQ(Write(std::to_string(number)), 0);
    }
    EXPECT_THAT(Texts(ReadEvents(0, 2)), ElementsAre(R"(event 0x11800999: "24")", R"(event 0x11800999: "23")"));
    EXPECT_THAT(Texts(ReadEvents(23, 10)), ElementsAre(R"(event 0x11800999: "1")", R"(event 0x11800999: "0")"));
    for (const auto& [offset, limit, count] : std::vector<std::tuple<std::int64_t, std::int64_t, std::size_t>>{
             {25, 10, 0}, {1000, 10, 0}, {0, 0, 0}, {0, -1, 0}, {-5, 3, 3}, {0, 1000, 25}, {INT64_MAX, INT64_MAX, 0}}) {
        const EventPage page = ReadEvents(offset, limit);
        EXPECT_EQ(page.events.size(), count) << offset << " " << limit;
        EXPECT_EQ(page.total, 25);
    }
}

TEST_F(EventLog, IsEmptyBeforeTheFirstEvent) {
    EXPECT_EQ(ReadEvents(0, 10).total, 0);
    EXPECT_FALSE(Content(appliance::kEvents));
}

TEST_F(EventLog, KeepsTheNewest) {
    ASSERT_EQ(Write("first"), 0);
    {
        appliance::Database database(At(appliance::kEvents), appliance::Database::Mode::ReadWrite);
        database.Execute(
            "WITH RECURSIVE number(n) AS (SELECT 1 UNION ALL SELECT n + 1 FROM number WHERE n < 12000)"
            " INSERT INTO events (time, kind, level, code, argument1, argument2, argument3, argument4)"
            " SELECT n, 1, 1, 5, n, '', '', '' FROM number");
    }
    ASSERT_EQ(Write("last"), 0);
    const EventPage page = ReadEvents(0, 20000);
    EXPECT_EQ(page.total, appliance::kMostEvents);
    ASSERT_EQ(page.events.size(), std::size_t{appliance::kMostEvents});
    EXPECT_EQ(page.events.front().text, R"(event 0x11800999: "last")");
    EXPECT_EQ(page.events.back().text, R"(event 0x00000005: "2002")");
    ASSERT_EQ(Write("one more"), 0);
    EXPECT_EQ(ReadEvents(0, 1).total, appliance::kMostEvents);
}

TEST_F(EventLog, CutsALongArgument) {
    ASSERT_EQ(Write(std::string(5000, 'x')), 0);
    EXPECT_EQ(ReadEvents(0, 1).events.at(0).text, "event 0x11800999: \"" + std::string(1024, 'x') + "\"");
}

TEST_F(EventLog, IsWrittenBySeveralProcessesAtOnce) {
    constexpr int kProcesses = 4;
    constexpr int kEach = 25;
    std::vector<pid_t> children;
    for (int process = 0; process < kProcesses; ++process) {
        children.push_back(system_test::StartChild([process] {
            for (int number = 0; number < kEach; ++number) {
                if (Write(std::to_string(process) + "/" + std::to_string(number)) != 0) {
                    _exit(1);
                }
            }
        }));
    }
    for (const pid_t child : children) {
        EXPECT_EQ(system_test::EndOf(child), 0);
    }
    const EventPage page = ReadEvents(0, 1000);
    EXPECT_EQ(page.total, kProcesses * kEach);
    const std::vector<std::string> texts = Texts(page);
    EXPECT_EQ(std::set<std::string>(texts.begin(), texts.end()).size(), std::size_t{kProcesses * kEach});
}

TEST_F(EventLog, IsRootsAlone) {
    ASSERT_EQ(Write("x"), 0);
    struct stat status = {};
    ASSERT_EQ(stat(At(appliance::kEvents).c_str(), &status), 0);
    EXPECT_EQ(status.st_mode & 0777U, 0600U);
    ASSERT_EQ(stat(At(appliance::kState).c_str(), &status), 0);
    EXPECT_EQ(status.st_mode & 0777U, 0700U);
}

// A limit on the size of files fails writes as a full disk does.
TEST_F(EventLog, FailsOnAFullDiskAndKeepsWhatItHas) {
    for (int number = 0; number < 30; ++number) {
        ASSERT_EQ(Write("kept"), 0);
    }
    const pid_t child = system_test::StartChild([] {
        // SQLite's journal is small; the database itself must not grow.
        const rlimit limit = {12288, 12288};
        if (signal(SIGXFSZ, SIG_IGN) == SIG_ERR || setrlimit(RLIMIT_FSIZE, &limit) != 0) {
            _exit(2);
        }
        for (int number = 0; number < 200; ++number) {
            if (Write(std::string(1000, 'x')) != 0) {
                _exit(VLIBCErrGet() == static_cast<int>(appliance::ErrorCode::Database) ? 0 : 3);
            }
        }
        _exit(4);
    });
    EXPECT_EQ(system_test::EndOf(child), 0);
    const std::int64_t total = ReadEvents(0, 0).total;
    EXPECT_GE(total, 30);
    ASSERT_EQ(Write("after"), 0);
    EXPECT_EQ(ReadEvents(0, 0).total, total + 1);
}

TEST_F(EventLog, FailsWithABrokenFile) {
    Put(appliance::kEvents, std::string(5000, 'x'), 0600);
    EXPECT_EQ(Write("x"), -1);
    EXPECT_EQ(VLIBCErrGet(), static_cast<int>(appliance::ErrorCode::Database));
    EXPECT_THROW(ReadEvents(0, 1), appliance::SqliteError);
    EXPECT_EQ(*Content(appliance::kEvents), std::string(5000, 'x'));
}

TEST_F(EventLog, TakesNoNull) {
    EXPECT_EQ(VORNLogSet1(2, 1, 0x11800404, nullptr, "", "", ""), -1);
    EXPECT_EQ(VORNLogSet1(2, 1, 0x11800404, "LAB", "", "", nullptr), -1);
    EXPECT_EQ(VLIBCErrGet(), static_cast<int>(appliance::ErrorCode::BadArgument));
    EXPECT_EQ(ReadEvents(0, 0).total, 0);
}

}  // namespace
