// The table of failures against the "Failure:" lines of the platform's headers.

#include "tests/double/failures.h"

#include <gtest/gtest.h>

#include <algorithm>
#include <fstream>
#include <map>
#include <optional>
#include <set>
#include <sstream>
#include <string>
#include <vector>

namespace {

using Values = std::set<std::string>;
using Lines = std::map<std::string, Values>;

const char* const kHeaders[] = {"core.h",      "domain.h",   "eventlog.h", "network.h",
                                "scheduler.h", "settings.h", "webapi.h",   "webutils.h"};

// Reads one header line by line: a comment's failure line holds for the declarations up to the next comment.
class HeaderReader {
public:
    void Read(const std::string& name) {
        header = name;
        std::ifstream file(std::string(VORN_PLATFORM_DIR "/") + name);
        ASSERT_TRUE(file) << name;
        std::string line;
        while (std::getline(file, line)) {
            line.erase(0, std::min(line.find_first_not_of(' '), line.size()));
            Take(line);
        }
    }

    Lines declared;                  // by "header function"
    std::set<std::string> unlisted;  // functions without a failure line

private:
    void Take(const std::string& line) {
        if (StartsWith(line, "//")) {
            TakeComment(line);
            return;
        }
        inComment = false;
        if (StartsWith(line, "}")) {
            EndScope(line);
        } else if (!line.empty() && line.front() != '#') {
            Collect(line);
        }
    }

    void TakeComment(const std::string& line) {
        static const std::string label = "// Failure: ";
        if (!inComment) {
            failures.reset();
        }
        inComment = true;
        if (StartsWith(line, label)) {
            ASSERT_EQ(line.back(), '.') << line;
            failures = Split(line.substr(label.size(), line.size() - label.size() - 1));
        }
    }

    void EndScope(const std::string& line) {
        const bool ofScope = line == "};" || line.find("// namespace") != std::string::npos;
        if (ofScope && !scopes.empty() && !inStruct) {
            scopes.pop_back();
        }
        inStruct = false;
    }

    void Collect(const std::string& line) {
        if (line.back() == '{') {
            BeginScope(line);
            return;
        }
        statement += line;
        if (line.back() != ';') {
            statement += ' ';
            return;
        }
        Declare(statement);
        statement.clear();
    }

    void BeginScope(const std::string& line) {
        for (const std::string word : {"class ", "namespace "}) {
            if (StartsWith(line, word)) {
                scopes.push_back(line.substr(word.size(), line.find(' ', word.size()) - word.size()));
                failures.reset();
            }
        }
        inStruct = StartsWith(line, "struct ");
    }

    void Declare(const std::string& text) {
        const std::size_t end = text.find('(');
        const bool other = StartsWith(text, "typedef ") || StartsWith(text, "using ") ||
                           StartsWith(text, "static_assert") || text.find("= delete;") != std::string::npos;
        if (other || end == std::string::npos) {
            return;
        }
        const std::size_t before = text.find_last_of(" *&", end - 1);
        const std::string own = text.substr(before == std::string::npos ? 0 : before + 1, end - before - 1);
        std::string name;
        for (const std::string& scope : scopes) {
            name += scope + "::";
        }
        name += own;
        if (failures && own.front() != '~') {
            declared[header + " " + name].insert(failures->begin(), failures->end());
        } else {
            unlisted.insert(name);
        }
    }

    static bool StartsWith(const std::string& text, const std::string& start) {
        return text.compare(0, start.size(), start) == 0;
    }

    static Values Split(const std::string& text) {
        Values values;
        std::istringstream stream(text);
        std::string value;
        while (std::getline(stream, value, ',')) {
            value.erase(0, value.find_first_not_of(' '));
            if (value != "none") {
                values.insert(value);
            }
        }
        return values;
    }

    std::string header;
    std::vector<std::string> scopes;
    std::optional<Values> failures;
    std::string statement;
    bool inComment = false;
    bool inStruct = false;
};

HeaderReader ReadHeaders() {
    HeaderReader reader;
    for (const char* header : kHeaders) {
        reader.Read(header);
    }
    return reader;
}

Lines TableLines() {
    Lines lines;
    for (const fake::FunctionFailures& row : fake::Failures()) {
        if (row.origin == "libc") {
            continue;
        }
        Values& values = lines[row.origin + " " + row.function];
        for (const fake::FailureValue& value : row.values) {
            if (value.declared) {
                values.insert(value.fault.Text());
            }
        }
    }
    return lines;
}

TEST(Failures, AreThoseOfTheHeaders) {
    const Lines declared = ReadHeaders().declared;
    const Lines table = TableLines();
    EXPECT_GT(declared.size(), 80U);
    for (const auto& line : declared) {
        const auto row = table.find(line.first);
        ASSERT_NE(row, table.end()) << line.first << " is not in the table";
        EXPECT_EQ(row->second, line.second) << line.first;
    }
    for (const auto& row : table) {
        EXPECT_EQ(declared.count(row.first), 1U) << row.first << " is not in its header";
    }
}

TEST(Failures, AreMissingOnlyForTheServersObjectsAndForDestructors) {
    const Values expected = {"VORN::APIRequest::APIRequest",   "VORN::APIRequest::~APIRequest",
                             "VORN::APIResponse::APIResponse", "VORN::APIResponse::~APIResponse",
                             "VORN::APIPolling::~APIPolling",  "VornConf::~VornConf"};
    EXPECT_EQ(ReadHeaders().unlisted, expected);
}

TEST(Failures, NameEachFunctionAndEachValueOnce) {
    std::set<std::string> functions;
    for (const fake::FunctionFailures& row : fake::Failures()) {
        EXPECT_TRUE(functions.insert(row.function).second) << row.function;
        Values values;
        for (const fake::FailureValue& value : row.values) {
            EXPECT_TRUE(values.insert(value.fault.Text()).second) << row.function << " " << value.fault.Text();
        }
    }
}

TEST(Failures, PutTheDefaultFirst) {
    ASSERT_NE(fake::DefaultFault("VLIBCFileGetKeyValue"), nullptr);
    EXPECT_EQ(fake::DefaultFault("VLIBCFileGetKeyValue")->Text(), "-1");
    EXPECT_EQ(fake::DefaultFault("VORNWinsIsJoined"), nullptr);
    EXPECT_EQ(fake::DefaultFault("VLIBCSzListFree"), nullptr);
    EXPECT_EQ(fake::DefaultFault("no such function"), nullptr);
}

}  // namespace
