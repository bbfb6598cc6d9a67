// Every log statement is told by its unit and its number: the sources held against the list in support/log.h.

#include <gtest/gtest.h>

#include <filesystem>
#include <map>
#include <regex>
#include <set>
#include <sstream>
#include <string>
#include <vector>

#include "src/support/log.h"
#include "tests/unit/log_lines.h"

namespace {

using unit::ListedFile;
using unit::ListedFiles;
using unit::ReadAll;
using unit::SourceFolder;

std::vector<std::string> Lines(const std::string& text) {
    std::istringstream stream(text);
    std::vector<std::string> lines;
    for (std::string line; std::getline(stream, line);) {
        lines.push_back(line);
    }
    return lines;
}

// The text of each source file, by its path below the source folder; log.h, which only declares, is left out.
std::map<std::string, std::string> Sources() {
    std::map<std::string, std::string> sources;
    for (const auto& entry : std::filesystem::recursive_directory_iterator(SourceFolder())) {
        const std::string name = entry.path().lexically_relative(SourceFolder()).generic_string();
        if ((entry.path().extension() == ".cpp" || entry.path().extension() == ".h") && name != "support/log.h") {
            sources[name] = ReadAll(entry.path());
        }
    }
    return sources;
}

std::vector<std::smatch> Matches(const std::string& text, const std::regex& pattern) {
    return {std::sregex_iterator(text.begin(), text.end(), pattern), std::sregex_iterator()};
}

// Each call of syslog in a text, from its name to the end of the statement.
std::vector<std::string> LogStatements(const std::string& text) {
    std::vector<std::string> statements;
    for (std::size_t at = text.find("syslog("); at != std::string::npos; at = text.find("syslog(", at + 1)) {
        statements.push_back(text.substr(at, text.find(");\n", at) - at));
    }
    return statements;
}

std::set<std::string> UsedEnumerators(const std::string& text) {
    static const std::regex pattern(R"(LOG_NUMBER\((\w+)\))");
    std::set<std::string> used;
    for (const std::smatch& match : Matches(text, pattern)) {
        used.insert(match[1]);
    }
    return used;
}

TEST(LogNumbers, ANumberIsMadeOfTheFileAndTheLine) {
    EXPECT_EQ(LogNumber(LogFile::kHandlerRules, 1), 1001);
    EXPECT_EQ(LogNumber(LogFile::kJoin, 42), 6042);
    EXPECT_EQ(LogNumber(LogFile::kScheduleStore, 999), 14999);
}

// Readers of the log know these.
TEST(LogNumbers, TheUnitsKeepTheirNames) {
    EXPECT_STREQ(kDomainUnit, "domain.cpp");
    EXPECT_STREQ(kScheduleUnit, "domain_schedule.cpp");
}

TEST(LogNumbers, TheFilesAreNumberedFromOneOnWithoutAGap) {
    const std::vector<ListedFile> listed = ListedFiles();
    ASSERT_FALSE(listed.empty());
    for (std::size_t index = 0; index < listed.size(); ++index) {
        EXPECT_EQ(listed[index].number, static_cast<int>(index) + 1) << listed[index].enumerator;
    }
}

TEST(LogNumbers, EachFileThatLogsUsesItsOwnEntryOfTheList) {
    std::map<std::string, std::set<std::string>> listed;
    for (const ListedFile& entry : ListedFiles()) {
        EXPECT_TRUE(listed[entry.file].insert(entry.enumerator).second);
    }
    std::map<std::string, std::set<std::string>> used;
    for (const auto& [name, text] : Sources()) {
        const std::set<std::string> enumerators = UsedEnumerators(text);
        EXPECT_LE(enumerators.size(), 1U) << name;
        if (!enumerators.empty()) {
            used[name] = enumerators;
        }
    }
    EXPECT_EQ(used, listed);
}

TEST(LogNumbers, NoTwoLogStatementsShareANumber) {
    static const std::regex number(R"(LOG_NUMBER\()");
    for (const auto& [name, text] : Sources()) {
        const std::vector<std::string> lines = Lines(text);
        EXPECT_LT(lines.size(), static_cast<std::size_t>(kLogLinesPerFile)) << name;
        std::size_t numbers = 0;
        for (std::size_t index = 0; index < lines.size(); ++index) {
            const std::size_t inLine = Matches(lines[index], number).size();
            EXPECT_LE(inLine, 1U) << name << ":" << index + 1;
            numbers += inLine;
        }
        EXPECT_EQ(numbers, LogStatements(text).size()) << name;
    }
}

TEST(LogNumbers, EachLogStatementHasErrorPriorityAndBeginsWithUnitAndNumber) {
    static const std::regex form(
        R"re(syslog\(LOG_ERR,\s+"%s:%d [^"]+",\s+(kDomainUnit|kScheduleUnit|unit),\s+(LOG_NUMBER\(\w+\)|number)[\s\S]*)re");
    std::size_t statements = 0;
    for (const auto& [name, text] : Sources()) {
        for (const std::string& statement : LogStatements(text)) {
            EXPECT_TRUE(std::regex_match(statement, form)) << name << ": " << statement;
            ++statements;
        }
    }
    EXPECT_GT(statements, 0U);
}

TEST(LogNumbers, NothingIsLoggedInAnotherWay) {
    static const std::regex others(R"(\b(v?f?printf|vsyslog|perror|f?puts|openlog|closelog)\(|\b(cout|cerr|clog)\b)");
    static const std::regex any(R"(\bsyslog\b)");
    for (const auto& [name, text] : Sources()) {
        EXPECT_FALSE(std::regex_search(text, others)) << name;
        EXPECT_EQ(Matches(text, any).size(), LogStatements(text).size()) << name;
    }
}

// The tests' own check of what was logged, which every test makes at its end, must see a wrong number.
TEST(WrittenLines, AWrongNumberLeadsAstray) {
    const ListedFile file = ListedFiles().front();
    fake::LogLine line;
    line.format = "%s:%d wrong the paramter: %s";
    const std::vector<std::string> lines = Lines(ReadAll(SourceFolder() / file.file));
    int right = 0;
    for (std::size_t place = 1; place <= lines.size(); ++place) {
        line.line = kLogLinesPerFile * file.number + static_cast<int>(place);
        right += unit::AstrayFrom(line).empty() ? 1 : 0;
    }
    EXPECT_EQ(right, 1);
    line.line = 0;
    EXPECT_NE(unit::AstrayFrom(line), "");
}

}  // namespace
