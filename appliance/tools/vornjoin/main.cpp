// The join tool: joins a domain or leaves one, as the request on its standard input says. Started by the appliance's
// operations, in a session of its own, so that neither the end of the server nor a signal to it cuts a join short.

#include <poll.h>
#include <sys/resource.h>
#include <sys/stat.h>
#include <syslog.h>
#include <unistd.h>

#include <array>
#include <cerrno>
#include <chrono>
#include <csignal>
#include <cstdio>
#include <cstring>
#include <string>

#include "appliance/base/log.h"
#include "appliance/domain/directory/directory_store.h"
#include "appliance/domain/directory/domain_list.h"
#include "appliance/domain/join/join_request.h"
#include "appliance/domain/join/launcher.h"
#include "appliance/domain/join/membership_job.h"
#include "appliance/domain/join/recovery.h"
#include "appliance/domain/membership/membership.h"

namespace {

constexpr int kFailed = 1;
constexpr int kUsage = 2;
constexpr std::size_t kLargestRequest = 64 << 10;
constexpr std::chrono::milliseconds kRecoveryPatience{12000};
constexpr int kInputWait = 5000;  // milliseconds without a byte

constexpr char kHelp[] =
    "Usage: vornjoin                      do what the request on standard input says\n"
    "       vornjoin --recover            put right what an interrupted join or leave left behind\n"
    "       vornjoin --recover-later      the same in the background, until it is possible\n"
    "       vornjoin --recover-old-later  the same, but a new membership that is not in place yet is given up\n"
    "\n"
    "The request is one line of JSON, then the password up to the end of the input:\n"
    "    {\"action\": \"join\", \"domain\": NAME, \"username\": NAME, \"kdc\": TEXT, \"fqdn\": TEXT, \"netbios_name\": "
    "TEXT}\n"
    "    {\"action\": \"leave\", \"domain\": WORKGROUP, \"delete_account\": BOOL, \"reset_options\": BOOL, "
    "\"username\": NAME}\n"
    "Printed is one line of JSON with \"success\", and \"key\" and \"message\" of a failure.\n"
    "The steps are recorded in /run/vorn/join_steps.json.\n";

// Wiped when it goes.
struct Input {
    std::string text;
    ~Input() {
        explicit_bzero(text.data(), text.size());
    }
};

bool ReadInput(Input& input) {
    input.text.reserve(kLargestRequest);  // never moved, so that no copy stays behind
    std::array<char, 4096> buffer{};
    while (true) {
        pollfd waiting = {STDIN_FILENO, POLLIN, 0};
        const int ready = poll(&waiting, 1, kInputWait);
        if (ready < 0 && errno == EINTR) {
            continue;
        }
        const ssize_t length = ready > 0 ? read(STDIN_FILENO, buffer.data(), buffer.size()) : -1;
        if (length <= 0) {
            explicit_bzero(buffer.data(), buffer.size());
            return length == 0;
        }
        if (input.text.size() + static_cast<std::size_t>(length) > kLargestRequest) {
            explicit_bzero(buffer.data(), buffer.size());
            return false;
        }
        input.text.append(buffer.data(), static_cast<std::size_t>(length));
    }
}

void RefreshKnownDomains() {
    appliance::Membership membership;
    if (!appliance::ReadMembership(membership)) {
        static_cast<void>(appliance::ListDomains(membership));
    }
}

int Recover() {
    const appliance::Recovery recovery = appliance::RecoverOnce(kRecoveryPatience, appliance::Wanted::Either);
    for (const std::string& note : recovery.notes) {
        std::printf("%s\n", note.c_str());
    }
    if (recovery.completed) {
        return appliance::kRecoveredForward;
    }
    const bool open = recovery.result == appliance::Recovery::Result::Pending ||
                      recovery.result == appliance::Recovery::Result::Running;
    return open ? kFailed : 0;
}

// Comes back at once; the work is done by a child that nobody waits for.
int RecoverLater(appliance::Wanted wanted) {
    const pid_t child = fork();
    if (child == 0) {
        setsid();
        appliance::RecoverWhenPossible(wanted);
        _exit(0);
    }
    return child < 0 ? kFailed : 0;
}

int DoAsRequested() {
    appliance::JoinRequest request;
    std::string error = "it can't be read, or is too long";
    {
        Input input;
        if (!ReadInput(input) || !appliance::ParseJoinRequest(input.text, request, error)) {
            std::fprintf(stderr, "vornjoin: bad request: %s\n", error.c_str());
            return kUsage;
        }
    }
    const appliance::JobResult result = appliance::RunJob(request, {RefreshKnownDomains});
    if (result.success && request.action == appliance::JoinRequest::Action::Leave) {
        // Nobody can refresh them any more. What can't be removed is logged there.
        static_cast<void>(appliance::RemoveLists());
    }
    // Whoever asked may be gone by now.
    std::fputs(appliance::FormatJobResult(result).c_str(), stdout);
    std::fflush(stdout);
    return result.success ? 0 : kFailed;
}

}  // namespace

int main(int argc, char** argv) {
    if (argc == 2 && std::strcmp(argv[1], "--help") == 0) {
        std::fputs(kHelp, stdout);
        return 0;
    }
    const std::string option = argc > 1 ? argv[1] : "";
    const bool known =
        option.empty() || option == "--recover" || option == "--recover-later" || option == "--recover-old-later";
    if (argc > 2 || !known) {
        std::fprintf(stderr, "vornjoin: unknown arguments; --help shows the usage\n");
        return kUsage;
    }
    if (geteuid() != 0) {
        std::fprintf(stderr, "vornjoin: only root can change the membership\n");
        return kUsage;
    }
    openlog("vornjoin", LOG_PID, LOG_DAEMON);
    umask(077);
    const rlimit noCore = {0, 0};
    setrlimit(RLIMIT_CORE, &noCore);
    // It ends by itself, soon: nothing but SIGKILL cuts it short.
    for (const int signal : {SIGPIPE, SIGTERM, SIGINT, SIGHUP}) {
        std::signal(signal, SIG_IGN);
    }
    if (option == "--recover") {
        return Recover();
    }
    if (!option.empty()) {
        return RecoverLater(option == "--recover-later" ? appliance::Wanted::Either : appliance::Wanted::OldOrNone);
    }
    return DoAsRequested();
}
