#include "appliance/vornd/figures.h"

#include <sys/stat.h>
#include <unistd.h>

#include <algorithm>
#include <array>
#include <ctime>
#include <exception>
#include <optional>
#include <vector>

#include "appliance/base/log.h"
#include "appliance/base/paths.h"
#include "appliance/base/process.h"
#include "appliance/base/sqlite.h"
#include "appliance/domain/directory/directory_store.h"
#include "appliance/domain/membership/last_test.h"
#include "appliance/domain/membership/membership.h"
#include "appliance/platform/webapi/task_store.h"
#include "appliance/vornd/metrics.h"

namespace appliance {
namespace {

std::string KindLabel(DomainKind kind) {
    switch (kind) {
        case DomainKind::ActiveDirectory:
            return "active_directory";
        case DomainKind::Nt4:
            return "nt4";
        case DomainKind::Workgroup:
            break;
    }
    return "workgroup";
}

std::string ServerFigures() {
    const std::string build = "vorn_build_info{version=\"" VORN_VERSION "\"} 1\n";
    const std::optional<double> start = ProcessStartTime(getpid());
    return FigureText("vorn_build_info", "gauge", "The server's version.", build) +
           (start ? FigureText("process_start_time_seconds", "gauge",
                               "When the server was started, in seconds since 1970.", *start)
                  : std::string());
}

std::string MembershipFigures(const Membership& membership) {
    std::string text = FigureText("vorn_member", "gauge", "Whether the appliance is a member of a domain.",
                                  membership.Joined() ? 1 : 0) +
                       FigureText("vorn_domain_kind", "gauge", "What the appliance is set up for.",
                                  "vorn_domain_kind{kind=\"" + KindLabel(membership.kind) + "\"} 1\n");
    if (const std::optional<MembershipTest> test = ReadLastTest(membership)) {
        text +=
            FigureText("vorn_last_test_time_seconds", "gauge",
                       "When the membership was last tested, in seconds since 1970.", static_cast<double>(test->time)) +
            FigureText("vorn_last_test_success", "gauge", "Whether the domain accepted the machine's account then.",
                       test->success ? 1 : 0) +
            FigureText("vorn_last_test_duration_seconds", "gauge", "How long that test took.",
                       static_cast<double>(test->milliseconds) / 1000);
    }
    return text;
}

// Ages of the own domain's list and of the oldest of all; entries of all together.
std::string ListFigures(const std::string& ownDomain) {
    struct Lists {
        std::int64_t count = 0;
        std::int64_t entries = 0;
        std::int64_t oldest = 0;
        std::int64_t own = 0;
    };
    std::array<Lists, 2> kinds;
    for (const ListInfo& list : FindLists()) {
        Lists& lists = kinds[list.kind == EntryKind::User ? 0 : 1];
        lists.oldest = lists.count == 0 ? list.fetched : std::min(lists.oldest, list.fetched);
        lists.own = list.domain == ownDomain ? list.fetched : lists.own;
        ++lists.count;
        lists.entries += list.count;
    }
    const std::int64_t now = std::time(nullptr);
    std::string counts;
    std::string entries;
    std::string ages;
    for (std::size_t index = 0; index < kinds.size(); ++index) {
        const Lists& lists = kinds[index];
        const std::string kind = std::string("kind=\"") + (index == 0 ? "user" : "group") + "\"";
        const auto age = [&](const char* of, std::int64_t fetched) {
            return "vorn_list_age_seconds{" + kind + ",of=\"" + of + "\"} " +
                   std::to_string(std::max<std::int64_t>(0, now - fetched)) + "\n";
        };
        counts += "vorn_lists{" + kind + "} " + std::to_string(lists.count) + "\n";
        entries += "vorn_list_entries{" + kind + "} " + std::to_string(lists.entries) + "\n";
        ages += lists.own > 0 ? age("own_domain", lists.own) : std::string();
        ages += lists.count > 0 ? age("oldest", lists.oldest) : std::string();
    }
    return FigureText("vorn_lists", "gauge", "Complete lists of domain users and groups.", counts) +
           FigureText("vorn_list_entries", "gauge", "Their entries.", entries) +
           FigureText("vorn_list_age_seconds", "gauge", "How long ago a list was completed.", ages);
}

std::string TaskFigures() {
    const std::string path = Path(kTasks);
    struct stat found {};
    std::int64_t running = 0;
    if (stat(path.c_str(), &found) == 0) {
        Database database(path, Database::Mode::ReadOnly, 1000);
        Statement count(database, "SELECT COUNT(*) FROM tasks WHERE state <> ?");
        count.Bind(1, static_cast<std::int64_t>(TaskState::Ended)).Step();
        running = count.Number(0);
    }
    return FigureText("vorn_tasks_running", "gauge", "Background tasks that run.", static_cast<double>(running));
}

template <typename Part>
void Append(std::string& text, Part part) {
    try {
        text += part();
    } catch (const std::exception& error) {
        Log(LOG_WARNING, std::string("figures are left out: ") + error.what());
    }
}

}  // namespace

const std::string& Figures::Text() {
    const auto now = std::chrono::steady_clock::now();
    if (!text_.empty() && now - read_ < kFresh) {
        return text_;
    }
    read_ = now;
    text_.clear();
    Append(text_, ServerFigures);
    Membership membership;
    const bool isKnown = !ReadMembership(membership);
    if (isKnown) {
        Append(text_, [&membership] { return MembershipFigures(membership); });
    }
    Append(text_, [&membership] { return ListFigures(membership.DomainMode() ? membership.domain : std::string()); });
    Append(text_, TaskFigures);
    return text_;
}

}  // namespace appliance
