// vorn-httpd: the appliance's door to the network.

#include <fcntl.h>
#include <malloc.h>
#include <openssl/ssl.h>
#include <signal.h>
#include <sys/prctl.h>
#include <sys/stat.h>
#include <syslog.h>
#include <unistd.h>

#include <cerrno>
#include <cstdio>
#include <cstring>
#include <exception>
#include <stdexcept>
#include <string>
#include <utility>
#include <vector>

#include "appliance/base/log.h"
#include "appliance/httpd/door.h"
#include "appliance/httpd/options.h"
#include "appliance/web/notify.h"

namespace appliance {
namespace {

constexpr int kCouldNotStart = 1;
constexpr int kWrongCommandLine = 2;

// An error of the start: to the log, and to standard error wherever that leads.
void Complain(const std::string& line) {
    LogAsServer("vorn-httpd", false);
    Log(LOG_ERR, line);
    static_cast<void>(std::fprintf(stderr, "vorn-httpd: %s\n", line.c_str()));
}

std::vector<FileDescriptor> Listen(const DoorOptions& options) {
    std::vector<FileDescriptor> listeners;
    std::string reason;
    for (const ListenAddress& address : options.addresses) {
        FileDescriptor listener = ListenOn(address);
        if (!listener) {
            reason = "can't listen on " + address.text + ": " + std::strerror(errno);
            // A machine may do without one of the two families.
            if (options.hasOwnAddresses || (errno != EADDRNOTAVAIL && errno != EAFNOSUPPORT)) {
                throw std::runtime_error(reason);
            }
            Log(LOG_WARNING, reason);
            continue;
        }
        const std::string place =
            address.text.substr(0, address.text.rfind(':')) + ":" + std::to_string(PortOf(listener.get()));
        Log(LOG_NOTICE, std::string("listens on ") + (options.clearText ? "http://" : "https://") + place);
        listeners.push_back(std::move(listener));
    }
    if (listeners.empty()) {
        throw std::runtime_error(reason);
    }
    return listeners;
}

int Serve(const DoorOptions& options, bool terminal) {
    AdoptNotifySocket();
    const bool isOwn = options.certificate.empty();
    DoorCertificate certificate(isOwn ? CertificateFiles{options.state + "/certificate.pem", options.state + "/key.pem"}
                                      : CertificateFiles{options.certificate, options.key},
                                isOwn);
    std::string reason;
    if (!options.clearText && !certificate.Load(reason)) {
        throw std::runtime_error(reason);
    }
    Door::Setup setup;
    setup.listeners = Listen(options);
    setup.vornd = options.vornd;
    setup.page = options.page;
    setup.certificate = options.clearText ? nullptr : &certificate;
    setup.terminal = terminal;
    Door door(std::move(setup));
    if (!door.Run()) {
        return kCouldNotStart;
    }
    Log(LOG_NOTICE, "ended");
    return 0;
}

// What whoever started this has left open is none of this program's business; and the place of a standard descriptor
// that is missing would be taken by the next file to be opened.
void PrepareDescriptors() {
    close_range(STDERR_FILENO + 1, ~0U, 0);
    int descriptor = 0;
    do {
        descriptor = open("/dev/null", O_RDWR);
    } while (descriptor >= 0 && descriptor <= STDERR_FILENO);
    if (descriptor >= 0) {
        close(descriptor);
    }
}

int Main(int count, char** arguments) {
    DoorOptions options;
    std::string reason;
    if (!ParseDoorOptions(count, arguments, options, reason)) {
        static_cast<void>(std::fprintf(stderr, "vorn-httpd: %s\n", reason.c_str()));
        return kWrongCommandLine;
    }
    if (options.action == DoorOptions::Action::Help) {
        static_cast<void>(std::fputs(kDoorHelp, stdout));
        return 0;
    }
    if (options.action == DoorOptions::Action::Version) {
        static_cast<void>(std::puts("vorn-httpd " VORN_VERSION));
        return 0;
    }
    PrepareDescriptors();
    const bool terminal = options.foreground || isatty(STDERR_FILENO) != 0;
    LogAsServer("vorn-httpd", terminal);
    umask(077);
    // Passwords pass through this memory.
    prctl(PR_SET_DUMPABLE, 0);
    signal(SIGPIPE, SIG_IGN);
    try {
        if (geteuid() == 0) {
            throw std::runtime_error("root must not run this server: start it as the user vorn-httpd");
        }
        // What is allowed stands in the program, whatever a file of the machine says.
        OPENSSL_init_ssl(OPENSSL_INIT_NO_LOAD_CONFIG, nullptr);
        return Serve(options, terminal);
    } catch (const std::exception& error) {
        Complain(error.what());
        return kCouldNotStart;
    }
}

}  // namespace
}  // namespace appliance

int main(int count, char** arguments) {
    mallopt(M_ARENA_MAX, 1);
    return appliance::Main(count, arguments);
}
