#include "tests/appliance/vornd/support.h"

#include <dirent.h>
#include <fcntl.h>
#include <json/reader.h>
#include <json/writer.h>
#include <poll.h>
#include <signal.h>
#include <spawn.h>
#include <sys/socket.h>
#include <sys/stat.h>
#include <sys/syscall.h>
#include <sys/un.h>
#include <sys/wait.h>
#include <unistd.h>

#include <cerrno>
#include <cstring>
#include <filesystem>
#include <fstream>
#include <memory>
#include <sstream>
#include <stdexcept>
#include <utility>

#include "appliance/base/process.h"
#include "appliance/base/text.h"

namespace vornd_test {
namespace {

namespace fs = std::filesystem;
using Clock = std::chrono::steady_clock;

sockaddr_un AddressOf(const std::string& path) {
    sockaddr_un address{};
    address.sun_family = AF_UNIX;
    if (path.size() >= sizeof address.sun_path) {
        throw std::runtime_error("path too long: " + path);
    }
    std::memcpy(address.sun_path, path.data(), path.size());
    return address;
}

const sockaddr* Plain(const sockaddr_un& address) {
    return static_cast<const sockaddr*>(static_cast<const void*>(&address));
}

bool Readable(int descriptor, Clock::time_point end) {
    const auto left = std::chrono::duration_cast<milliseconds>(end - Clock::now()).count();
    pollfd waited{descriptor, POLLIN, 0};
    return poll(&waited, 1, left > 0 ? static_cast<int>(left) : 0) > 0;
}

// This thread's user, and no other thread's: the library's function would change all of them.
class ThreadsUser {
public:
    explicit ThreadsUser(uid_t user) : changed_(user != geteuid()) {
        if (changed_ && !Set(user)) {
            throw std::runtime_error("the user can't be changed");
        }
    }
    ~ThreadsUser() {
        if (changed_) {
            Set(0);
        }
    }
    ThreadsUser(const ThreadsUser&) = delete;
    ThreadsUser& operator=(const ThreadsUser&) = delete;

private:
    static bool Set(uid_t user) {
        return syscall(SYS_setresuid, -1, user, -1) == 0;
    }

    const bool changed_;
};

Json::Value Parse(const std::string& text) {
    Json::Value value;
    const std::unique_ptr<Json::CharReader> reader(Json::CharReaderBuilder().newCharReader());
    reader->parse(text.data(), text.data() + text.size(), &value, nullptr);
    return value;
}

std::string ToText(const Json::Value& value) {
    Json::StreamWriterBuilder builder;
    builder["indentation"] = "";
    return Json::writeString(builder, value);
}

}  // namespace

Tree::Tree() {
    std::string name = "/tmp/vornd-test.XXXXXX";
    if (mkdtemp(name.data()) == nullptr) {
        throw std::runtime_error("no temporary folder");
    }
    root_ = name;
    for (const char* folder : {"/usr/vorn/etc", "/usr/vorn/lib/modules", "/usr/vorn/share/defaults", "/usr/vorn/sbin",
                               "/usr/sbin", "/usr/bin", "/etc/cron.d", "/var/lib", "/var/log", "/run", "/tmp"}) {
        fs::create_directories(At(folder));
    }
    for (const char* program : {"/usr/sbin/smbd", "/usr/bin/net", "/usr/sbin/winbindd"}) {
        Write(program, "", 0755);
    }
    Write("/usr/vorn/share/defaults/smb.conf", "[global]\n    workgroup = WORKGROUP\n    security = user\n");
    Write("/usr/vorn/share/defaults/vorninfo.conf", "trustdomain=yes\n");
    Write("/usr/vorn/share/capabilities.conf", "supportdomain=yes\n");
    Install("test_module");
}

Tree::~Tree() {
    std::error_code ignored;
    fs::remove_all(root_, ignored);
}

void Tree::Write(const std::string& path, const std::string& content, mode_t mode) const {
    std::ofstream(At(path)) << content;
    chmod(At(path).c_str(), mode);
}

std::string Tree::Read(const std::string& path) const {
    std::ifstream file(At(path));
    std::stringstream content;
    content << file.rdbuf();
    return content.str();
}

std::string Tree::Install(const std::string& module, const std::string& folder) const {
    const std::string target = At(folder) + "/" + module + ".so";
    fs::create_directories(At(folder));
    fs::copy_file(std::string(VORN_TEST_MODULES) + "/" + module + ".so", target);
    chmod(target.c_str(), 0755);
    return target;
}

int Response::Code() const {
    return json["error"]["code"].asInt();
}

const Json::Value& Response::Data() const {
    return json["data"];
}

Client::Client(const std::string& socket, uid_t user) : socket_(::socket(AF_UNIX, SOCK_STREAM | SOCK_CLOEXEC, 0)) {
    const sockaddr_un address = AddressOf(socket);
    const ThreadsUser as(geteuid() == 0 ? user : geteuid());
    if (connect(socket_.get(), Plain(address), sizeof address) != 0) {
        socket_.Reset();
    }
}

bool Client::Send(const std::string& bytes) {
    std::size_t sent = 0;
    while (sent < bytes.size()) {
        const ssize_t some = send(socket_.get(), bytes.data() + sent, bytes.size() - sent, MSG_NOSIGNAL);
        if (some < 0) {
            return false;
        }
        sent += static_cast<std::size_t>(some);
    }
    return true;
}

Response Client::Receive(milliseconds wait) {
    const Clock::time_point end = Clock::now() + wait;
    Response response;
    for (;;) {
        const std::size_t header = left_.find("\r\n\r\n");
        if (header != std::string::npos) {
            std::size_t length = 0;
            const std::vector<std::string> lines = appliance::Lines(left_.substr(0, header));
            for (std::size_t index = 1; index < lines.size(); ++index) {
                const std::size_t colon = lines[index].find(':');
                const std::string name = appliance::Lower(lines[index].substr(0, colon));
                response.header[name] = appliance::Trim(lines[index].substr(colon + 1));
            }
            if (response.header.count("content-length") > 0) {
                length = std::stoul(response.header["content-length"]);
            }
            if (left_.size() >= header + 4 + length) {
                response.status = std::stoi(left_.substr(left_.find(' ') + 1, 3));
                response.body = left_.substr(header + 4, length);
                response.json = Parse(response.body);
                left_.erase(0, header + 4 + length);
                return response;
            }
        }
        char bytes[65536];
        const ssize_t got = Readable(socket_.get(), end) ? recv(socket_.get(), bytes, sizeof bytes, 0) : -1;
        if (got <= 0) {
            return {};
        }
        left_.append(bytes, static_cast<std::size_t>(got));
    }
}

bool Client::Ends(milliseconds wait) {
    char byte = 0;
    return left_.empty() && Readable(socket_.get(), Clock::now() + wait) && recv(socket_.get(), &byte, 1, 0) <= 0;
}

void Client::CloseSending() {
    shutdown(socket_.get(), SHUT_WR);
}

std::string PostText(const std::string& method, const std::string& body, const std::string& version,
                     const std::string& api, const std::string& header) {
    return "POST /webapi/" + api + "/" + version + "/" + method + " HTTP/1.1\r\nHost: localhost\r\n" + header +
           "Content-Type: application/json\r\nContent-Length: " + std::to_string(body.size()) + "\r\n\r\n" + body;
}

Server::Server(const Tree& tree, std::vector<std::string> arguments, bool wait, const Output& output)
    : socket_(tree.Socket()), errors_(output.file), ownErrors_(output.file.empty()) {
    static int servers = 0;
    const std::string own = tree.root() + "." + std::to_string(++servers);
    if (ownErrors_) {
        errors_ = own + ".err";
    }
    notifyPath_ = own + ".notify";
    notify_.Reset(::socket(AF_UNIX, SOCK_DGRAM | SOCK_CLOEXEC, 0));
    const sockaddr_un address = AddressOf(notifyPath_);
    if (bind(notify_.get(), Plain(address), sizeof address) != 0) {
        throw std::runtime_error("no notify socket");
    }
    if (output.foreground) {
        arguments.insert(arguments.begin(), "--foreground");
    }
    arguments.insert(arguments.begin(), {VORN_TEST_VORND, "--root", tree.root()});
    std::vector<char*> argv;
    for (std::string& argument : arguments) {
        argv.push_back(argument.data());
    }
    argv.push_back(nullptr);
    std::string path = "PATH=/usr/sbin:/usr/bin:/sbin:/bin";
    std::string notify = "NOTIFY_SOCKET=" + notifyPath_;
    std::string watchdog = "WATCHDOG_USEC=1000000";
    char* environment[] = {path.data(), notify.data(), watchdog.data(), nullptr};
    posix_spawn_file_actions_t actions;
    posix_spawn_file_actions_init(&actions);
    posix_spawn_file_actions_addopen(&actions, 2, errors_.c_str(), O_WRONLY | O_CREAT | O_TRUNC | O_APPEND | O_NOCTTY,
                                     0600);
    const int failed = posix_spawn(&pid_, argv[0], &actions, nullptr, argv.data(), environment);
    posix_spawn_file_actions_destroy(&actions);
    if (failed != 0) {
        throw std::runtime_error("vornd can't be started");
    }
    if (wait && !Hears("READY=1")) {
        throw std::runtime_error("vornd does not serve: " + Errors());
    }
}

Server::~Server() {
    if (!status_) {
        kill(pid_, SIGKILL);
        End();
    }
    if (ownErrors_) {
        unlink(errors_.c_str());
    }
    unlink(notifyPath_.c_str());
}

bool Server::Hears(const std::string& state, milliseconds wait) {
    const Clock::time_point end = Clock::now() + wait;
    while (Readable(notify_.get(), std::min(end, Clock::now() + milliseconds(50))) || Clock::now() < end) {
        char bytes[512];
        const ssize_t got = recv(notify_.get(), bytes, sizeof bytes, MSG_DONTWAIT);
        if (got > 0 && std::string(bytes, static_cast<std::size_t>(got)) == state) {
            return true;
        }
        if (got < 0 && End(milliseconds(0))) {
            return false;
        }
    }
    return false;
}

void Server::Signal(int signal) const {
    kill(pid_, signal);
}

std::optional<int> Server::End(milliseconds wait) {
    const Clock::time_point end = Clock::now() + wait;
    while (!status_) {
        int status = 0;
        if (waitpid(pid_, &status, WNOHANG) == pid_) {
            status_ = WIFEXITED(status) ? WEXITSTATUS(status) : 128 + WTERMSIG(status);
        } else if (Clock::now() >= end) {
            return std::nullopt;
        } else {
            usleep(2000);
        }
    }
    return status_;
}

std::string Server::Errors() const {
    std::ifstream file(errors_);
    std::stringstream content;
    content << file.rdbuf();
    return content.str();
}

Client Server::Connect(uid_t user) const {
    return Client(socket_, user);
}

Response Server::Call(const std::string& method, const Json::Value& parameters) const {
    Client client = Connect();
    client.Send(PostText(method, ToText(parameters)));
    return client.Receive();
}

std::string Server::Figures() const {
    Client client = Connect();
    client.Send("GET /metrics HTTP/1.1\r\nHost: localhost\r\n\r\n");
    return client.Receive().body;
}

int Server::Descriptors() const {
    const std::string folder = "/proc/" + std::to_string(pid_) + "/fd";
    return static_cast<int>(std::distance(fs::directory_iterator(folder), fs::directory_iterator()));
}

bool IsAlive(pid_t pid) {
    return appliance::ProcessStart(pid).has_value();
}

std::vector<pid_t> PidsIn(const std::string& file) {
    std::vector<pid_t> pids;
    std::ifstream stream(file);
    for (pid_t pid = 0; stream >> pid;) {
        pids.push_back(pid);
    }
    return pids;
}

Json::Value Object(std::initializer_list<std::pair<const char*, Json::Value>> members) {
    Json::Value object(Json::objectValue);
    for (const auto& [name, value] : members) {
        object[name] = value;
    }
    return object;
}

}  // namespace vornd_test
