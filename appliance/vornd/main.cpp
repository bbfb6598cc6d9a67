// vornd: the appliance's web-API server.

#include <fcntl.h>
#include <malloc.h>
#include <signal.h>
#include <sys/prctl.h>
#include <sys/stat.h>
#include <syslog.h>
#include <unistd.h>

#include <cstdio>
#include <exception>
#include <memory>
#include <string>

#include "appliance/base/log.h"
#include "appliance/base/paths.h"
#include "appliance/vornd/access.h"
#include "appliance/vornd/descriptions.h"
#include "appliance/vornd/listener.h"
#include "appliance/vornd/method_table.h"
#include "appliance/vornd/options.h"
#include "appliance/vornd/router.h"
#include "appliance/vornd/server.h"
#include "appliance/vornd/startup.h"
#include "appliance/vornd/task_main.h"
#include "appliance/web/notify.h"

namespace appliance {
namespace {

constexpr int kCouldNotStart = 1;
constexpr int kWrongCommandLine = 2;
constexpr const char* kDescriptions = "/usr/vorn/share/methods.json";

// An error of the start: to the log, and to standard error wherever that leads.
void Complain(const std::string& line) {
    LogAsServer("vornd", false);
    Log(LOG_ERR, line);
    static_cast<void>(std::fprintf(stderr, "vornd: %s\n", line.c_str()));
}

// The modules of the folder, and those named. One of the folder that is refused is left out; one that was named must
// load.
void LoadModules(const Options& options, MethodTable& table) {
    const std::string folder = Path(kModules);
    struct stat found {};
    if (options.modules.empty() && (stat(folder.c_str(), &found) != 0 || !S_ISDIR(found.st_mode))) {
        throw StartError("the folder of modules " + folder + " is missing");
    }
    const auto load = [&table](const std::string& file, std::string& reason) {
        std::unique_ptr<Module> module = Module::Load(file, reason);
        return module != nullptr && table.Add(std::move(module), reason);
    };
    std::string reason;
    for (const std::string& file : ModuleFiles(folder)) {
        if (!load(file, reason)) {
            Log(LOG_ERR, reason);
        }
    }
    for (const std::string& file : options.modules) {
        if (!load(file, reason)) {
            throw StartError(reason);
        }
    }
    if (table.ModuleCount() == 0) {
        throw StartError(reason.empty() ? "no module in " + folder : reason);
    }
}

TaskHost HostOf(const Options& options) {
    TaskHost host = TaskHost::Default();
    if (!options.root.empty()) {
        // The program under test is this one, wherever the test has it.
        host.command = {"/proc/self/exe", "--root", options.root};
    }
    return host;
}

// Takes the socket's file away when the start fails behind it. The lock is still held then.
class UnlessServed {
public:
    explicit UnlessServed(const std::string& path) : path_(path) {}
    ~UnlessServed() {
        if (!served_) {
            unlink(path_.c_str());
        }
    }
    UnlessServed(const UnlessServed&) = delete;
    UnlessServed& operator=(const UnlessServed&) = delete;
    void Served() {
        served_ = true;
    }

private:
    std::string path_;
    bool served_ = false;
};

int Serve(const Options& options) {
    AdoptNotifySocket();
    MakeFolders();
    const std::string path = options.socket.empty() ? Path(kSocket) : options.socket;
    Listener listener = Listen(path);
    UnlessServed guard(path);
    PrepareConfiguration();
    PrepareTasks();
    MethodTable table;
    LoadModules(options, table);
    RepairLeftovers();
    const Router router(table, ReadDescriptions(Path(kDescriptions)), HostOf(options));
    const auto server =
        std::make_unique<Server>(std::move(listener.socket), path, router, FindDoor(options.door), options.patience);
    guard.Served();
    Log(LOG_NOTICE, std::string("version " VORN_VERSION " serves ") + std::to_string(table.apis().size()) +
                        " APIs of " + std::to_string(table.ModuleCount()) + " modules on " + path);
    if (!server->Run()) {
        // Threads that are left behind use what would be destroyed on an ordinary way out.
        _exit(kCouldNotStart);
    }
    Log(LOG_NOTICE, "ended");
    return 0;
}

// What whoever started this has left open is no business of the programs that a module runs.
void CloseForeignDescriptors() {
    close_range(STDERR_FILENO + 1, ~0U, 0);
    // The place of a standard descriptor that is missing would be taken by the next file to be opened.
    int descriptor = 0;
    do {
        descriptor = open("/dev/null", O_RDWR);
    } while (descriptor >= 0 && descriptor <= STDERR_FILENO);
    if (descriptor >= 0) {
        close(descriptor);
    }
}

// Signals that would end the process in the middle of something. A handler that does nothing, and not to ignore them: a
// program that a module runs would inherit that.
void PrepareSignals() {
    struct sigaction action {};
    action.sa_handler = [](int) {};
    action.sa_flags = SA_RESTART;
    sigaction(SIGPIPE, &action, nullptr);
    // Whoever started this may have left it ignored, and then no child could be waited for.
    struct sigaction usual {};
    usual.sa_handler = SIG_DFL;
    sigaction(SIGCHLD, &usual, nullptr);
}

int Main(int count, char** arguments) {
    Options options;
    std::string reason;
    if (!ParseOptions(count, arguments, options, reason)) {
        static_cast<void>(std::fprintf(stderr, "vornd: %s\n", reason.c_str()));
        return kWrongCommandLine;
    }
    if (options.action == Options::Action::Help) {
        static_cast<void>(std::fputs(kHelp, stdout));
        return 0;
    }
    if (options.action == Options::Action::Version) {
        static_cast<void>(std::puts("vornd " VORN_VERSION));
        return 0;
    }
    CloseForeignDescriptors();
    const bool terminal = options.foreground || isatty(STDERR_FILENO) != 0;
    // The module calls syslog itself.
    openlog("vornd", LOG_PID | (terminal ? LOG_PERROR : 0), LOG_DAEMON);
    LogAsServer("vornd", terminal);
    umask(022);
    SetRoot(options.root);
    // Passwords pass through this memory.
    prctl(PR_SET_DUMPABLE, 0);
    PrepareSignals();
    try {
        if (geteuid() != 0) {
            throw StartError("only root can run this server");
        }
        if (options.action == Options::Action::Task) {
            return RunTask(HostOf(options), options.task);
        }
        return Serve(options);
    } catch (const std::exception& error) {
        Complain(error.what());
        return kCouldNotStart;
    }
}

}  // namespace
}  // namespace appliance

int main(int count, char** arguments) {
    // Few of the threads work at a time; an arena for each would cost more memory than it saves waiting.
    mallopt(M_ARENA_MAX, 2);
    return appliance::Main(count, arguments);
}
