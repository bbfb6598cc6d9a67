// vornctl schedule

#include <CLI/CLI.hpp>

#include "appliance/tools/vornctl/command.h"
#include "appliance/tools/vornctl/schedule_words.h"

namespace appliance::ctl {

namespace {

int ShowSchedule(Context& context) {
    Answer answer;
    int exitCode = kDone;
    if (!CallAndReport(context, methods::ScheduleGet(), Json::Value(Json::objectValue), answer, exitCode) ||
        context.json) {
        return exitCode;
    }
    if (!MemberOf(answer.data, "date_type").isInt()) {
        throw Failure(kNoAnswer, "The answer is no schedule.");
    }
    context.out.Paragraph("", 0, Escape(ScheduleWords(answer.data)));
    if (NumberOf(answer.data, "date_type") == 2) {
        return kDone;
    }
    std::string values;
    for (const std::string& name : answer.data.getMemberNames()) {
        values += (values.empty() ? "" : ", ") + name + " " + JsonLine(answer.data[name]);
    }
    context.out.Paragraph("Values:", 9, Escape(values));
    return kDone;
}

int RunSchedule(Context& context, const ScheduleWish& wish, bool changes) {
    if (!changes) {
        return ShowSchedule(context);
    }
    Answer answer;
    int exitCode = kDone;
    if (!CallAndReport(context, methods::ScheduleSet(), ScheduleRequest(wish), answer, exitCode) || context.json) {
        return exitCode;
    }
    return ShowSchedule(context);
}

}  // namespace

Runner SetUpSchedule(CLI::App& parser) {
    const auto wish = std::make_shared<ScheduleWish>();
    parser.add_option("--weekly", wish->weekdays, "on these days of the week: sun,mon,... or all")
        ->type_name("DAYS")
        ->delimiter(',')
        ->allow_extra_args(false);
    parser.add_option("--date", wish->date, "on this day, or from it on with --repeat")->type_name("YYYY-MM-DD");
    parser
        .add_option("--repeat", wish->repeat, "with --date: once (also without it), daily, weekly, monthly or yearly")
        ->type_name("HOW");
    parser.add_option("--at", wish->time, "at this time of day, with either of them")->type_name("HH:MM");
    parser.add_option("--every", wish->every, "again on the same day, every so many hours")
        ->type_name("HOURS")
        ->check(CLI::Range(1, 23).description(""));
    parser
        .add_option("--until", wish->until,
                    "with --every: the last hour of the day at which it may start; 23 without it")
        ->type_name("HOUR")
        ->check(CLI::Range(0, 23).description(""));
    parser.add_flag("--off", wish->off, "no schedule any more");
    parser.footer(
        "Shows or sets when the appliance refreshes its lists of users and groups by\n"
        "itself. Without an option the present schedule is shown, in words and as the\n"
        "API's values.\n\n"
        "Examples:\n"
        "  vornctl schedule --weekly sun,wed --at 03:30\n"
        "  vornctl schedule --weekly all --at 06:00 --every 4 --until 20\n"
        "  vornctl schedule --date 2026-11-29 --repeat monthly --at 03:30\n"
        "  vornctl schedule --off");
    CLI::App* const self = &parser;
    return [wish, self](Context& context) {
        bool changes = wish->off;
        for (const char* name : {"--weekly", "--date", "--repeat", "--at", "--every", "--until"}) {
            changes = changes || self->count(name) > 0;
        }
        return RunSchedule(context, *wish, changes);
    };
}

}  // namespace appliance::ctl
