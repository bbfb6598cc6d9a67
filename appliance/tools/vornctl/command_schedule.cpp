// vornctl schedule

#include <memory>

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

Runner SetUpSchedule(Arguments arguments) {
    const auto wish = std::make_shared<ScheduleWish>();
    arguments.List("--weekly", wish->weekdays, "on these days of the week: sun,mon,... or all").TypeName("DAYS");
    arguments.Text("--date", wish->date, "on this day, or from it on with --repeat").TypeName("YYYY-MM-DD");
    arguments.Text("--repeat", wish->repeat, "with --date: once (also without it), daily, weekly, monthly or yearly")
        .TypeName("HOW");
    arguments.Text("--at", wish->time, "at this time of day, with either of them").TypeName("HH:MM");
    arguments.Number("--every", wish->every, "again on the same day, every so many hours")
        .TypeName("HOURS")
        .Between(1, 23);
    arguments
        .Number("--until", wish->until, "with --every: the last hour of the day at which it may start; 23 without it")
        .TypeName("HOUR")
        .Between(0, 23);
    arguments.Flag("--off", wish->off, "no schedule any more");
    arguments.Footer(
        "Shows or sets when the appliance refreshes its lists of users and groups by\n"
        "itself. Without an option the present schedule is shown, in words and as the\n"
        "API's values.\n\n"
        "Examples:\n"
        "  vornctl schedule --weekly sun,wed --at 03:30\n"
        "  vornctl schedule --weekly all --at 06:00 --every 4 --until 20\n"
        "  vornctl schedule --date 2026-11-29 --repeat monthly --at 03:30\n"
        "  vornctl schedule --off");
    return [wish, arguments](Context& context) {
        bool changes = wish->off;
        for (const char* name : {"--weekly", "--date", "--repeat", "--at", "--every", "--until"}) {
            changes = changes || arguments.Had(name);
        }
        return RunSchedule(context, *wish, changes);
    };
}

}  // namespace appliance::ctl
