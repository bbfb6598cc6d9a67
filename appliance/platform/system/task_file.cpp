#include "appliance/platform/system/task_file.h"

#include <algorithm>
#include <charconv>
#include <limits>
#include <optional>
#include <set>

#include "appliance/base/text.h"
#include "appliance/platform/system/cron_line.h"

namespace appliance {

namespace {

constexpr const char kHead[] =
    "# The appliance's scheduled tasks, a section for each; what the values mean: docs/schedule.md.\n"
    "# The task scheduler writes this file, and cron's table from it.\n";

std::optional<int> ParseNumber(std::string_view text) {
    int number = 0;
    const auto [end, error] = std::from_chars(text.data(), text.data() + text.size(), number);
    if (error != std::errc() || end != text.data() + text.size()) {
        return std::nullopt;
    }
    return number;
}

// Blanks at the ends of a text, and a quotation mark in front, would not survive without the marks around it.
std::string Quoted(const std::string& text) {
    const bool plain = Trim(text) == text && !StartsWith(text, "\"");
    return plain ? text : "\"" + text + "\"";
}

std::string Unquoted(std::string_view text) {
    if (text.size() >= 2 && text.front() == '"' && text.back() == '"') {
        text = text.substr(1, text.size() - 2);
    }
    return std::string(text);
}

// Sets one value of a task; false for an unknown key or a value that the key can't have.
bool SetValue(ScheduledTask& task, std::string_view key, std::string_view value) {
    Schedule& schedule = task.schedule;
    if (key == "command" || key == "date" || key == "week_name") {
        std::string& text = key == "command" ? task.command : key == "date" ? schedule.date : schedule.weekName;
        text = Unquoted(value);
        return true;
    }
    if (key == "listable") {
        task.listable = value == "yes";
        return value == "yes" || value == "no";
    }
    struct NumberKey {
        const char* name;
        int& number;
    };
    const NumberKey numbers[] = {
        {"date_type", schedule.dateType}, {"hour", schedule.hour},     {"last_work_hour", schedule.lastWorkHour},
        {"min", schedule.minute},         {"repeat", schedule.repeat}, {"repeat_hour", schedule.repeatHour}};
    for (const NumberKey& candidate : numbers) {
        if (key == candidate.name) {
            const std::optional<int> number = ParseNumber(value);
            candidate.number = number.value_or(0);
            return number.has_value();
        }
    }
    return false;
}

// Goes through the lines; what it finds wrong is about the line that it stopped at.
class Parser {
public:
    explicit Parser(TaskFile& file) : file_(file) {}

    // What is wrong with the line, or an empty text.
    std::string Take(std::string_view line) {
        if (line.empty() || line.front() == '#' || line.front() == ';') {
            return "";
        }
        return line.front() == '[' ? TakeSection(line) : TakeKey(line);
    }

    // To be called at the end, too: what is wrong with the section that ends here.
    std::string EndSection() {
        if (!inSection_) {
            return "";
        }
        inSection_ = false;
        return Impossible(file_.tasks.back());
    }

private:
    std::string TakeSection(std::string_view line) {
        if (std::string wrong = EndSection(); !wrong.empty()) {
            return "the task above: " + wrong;
        }
        const std::optional<int> id = line.back() == ']' ? ParseNumber(line.substr(1, line.size() - 2)) : std::nullopt;
        if (!id || *id < 0 || *id == std::numeric_limits<int>::max()) {
            return "a section's name must be the number of a task";
        }
        if (!ids_.insert(*id).second) {
            return "a second task " + std::to_string(*id);
        }
        file_.tasks.emplace_back();
        file_.tasks.back().id = *id;
        keys_.clear();
        inSection_ = true;
        return "";
    }

    std::string TakeKey(std::string_view line) {
        const std::size_t mark = line.find('=');
        if (mark == std::string_view::npos) {
            return "neither a section nor a key with a value";
        }
        const std::string key = Trim(line.substr(0, mark));
        const std::string value = Trim(line.substr(mark + 1));
        if (!keys_.insert(key).second) {
            return "a second value for a key";
        }
        if (inSection_) {
            return SetValue(file_.tasks.back(), key, value) ? "" : "an unknown key or an impossible value";
        }
        const std::optional<int> next = ParseNumber(value);
        if (key != "next" || !next || *next < 0) {
            return "an unknown key or an impossible value";
        }
        file_.nextId = *next;
        return "";
    }

    TaskFile& file_;
    std::set<int> ids_;
    std::set<std::string> keys_;
    bool inSection_ = false;
};

}  // namespace

std::string ImpossibleCommand(const std::string& command) {
    if (Trim(command).empty()) {
        return "there is no command";
    }
    if (HasControlBytes(command)) {
        return "the command holds a control byte";
    }
    return QuoteForCron(command).size() > kLongestQuotedCommand ? "the command is too long" : "";
}

std::string Impossible(const ScheduledTask& task) {
    std::string wrong = ImpossibleCommand(task.command);
    return wrong.empty() ? Impossible(task.schedule) : wrong;
}

std::string ParseTasks(std::string_view text, TaskFile& file) {
    TaskFile parsed;
    Parser parser(parsed);
    int number = 0;
    std::string wrong;
    for (const std::string& line : Lines(text)) {
        ++number;
        wrong = parser.Take(Trim(line));
        if (!wrong.empty()) {
            break;
        }
    }
    if (wrong.empty()) {
        wrong = parser.EndSection();
    }
    if (!wrong.empty()) {
        return "line " + std::to_string(number) + ": " + wrong;
    }
    std::sort(parsed.tasks.begin(), parsed.tasks.end(),
              [](const ScheduledTask& first, const ScheduledTask& second) { return first.id < second.id; });
    if (!parsed.tasks.empty() && parsed.nextId <= parsed.tasks.back().id) {
        parsed.nextId = parsed.tasks.back().id + 1;
    }
    file = std::move(parsed);
    return "";
}

std::string FormatTasks(const TaskFile& file) {
    std::string text = kHead;
    text += "next=" + std::to_string(file.nextId) + "\n";
    for (const ScheduledTask& task : file.tasks) {
        const Schedule& schedule = task.schedule;
        text += "\n[" + std::to_string(task.id) + "]\n";
        text += "command=" + Quoted(task.command) + "\n";
        text += std::string("listable=") + (task.listable ? "yes" : "no") + "\n";
        text += "date_type=" + std::to_string(schedule.dateType) + "\n";
        text += "date=" + Quoted(schedule.date) + "\n";
        text += "hour=" + std::to_string(schedule.hour) + "\n";
        text += "last_work_hour=" + std::to_string(schedule.lastWorkHour) + "\n";
        text += "min=" + std::to_string(schedule.minute) + "\n";
        text += "repeat=" + std::to_string(schedule.repeat) + "\n";
        text += "repeat_hour=" + std::to_string(schedule.repeatHour) + "\n";
        text += "week_name=" + Quoted(schedule.weekName) + "\n";
    }
    return text;
}

std::string CronTable(const TaskFile& file, const Date& today) {
    std::string text;
    for (const ScheduledTask& task : file.tasks) {
        if (IsOver(task.schedule, today)) {
            continue;
        }
        text += "# task " + std::to_string(task.id) + "\n";
        for (const std::string& line : CronLines(task.schedule, task.command)) {
            text += line;
        }
    }
    return text.empty() ? "" : CronTableHead() + text;
}

}  // namespace appliance
