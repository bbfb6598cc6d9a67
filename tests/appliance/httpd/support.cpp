#include "tests/appliance/httpd/support.h"

#include <fcntl.h>
#include <json/reader.h>
#include <netinet/in.h>
#include <poll.h>
#include <signal.h>
#include <sys/socket.h>
#include <sys/stat.h>
#include <sys/un.h>
#include <sys/wait.h>

#include <cstring>
#include <filesystem>
#include <fstream>
#include <sstream>
#include <stdexcept>

#include "appliance/base/text.h"
#include "appliance/httpd/listen_address.h"

namespace httpd_test {
namespace {

namespace fs = std::filesystem;
using Clock = std::chrono::steady_clock;

template <typename Address>
const sockaddr* Plain(const Address& address) {
    return static_cast<const sockaddr*>(static_cast<const void*>(&address));
}

bool Readable(int descriptor, milliseconds wait) {
    pollfd waited{descriptor, POLLIN, 0};
    return poll(&waited, 1, static_cast<int>(wait.count())) > 0;
}

// Takes a whole message from the front of the bytes.
bool TakeMessage(std::string& bytes, bool noBody, Message& message) {
    const std::size_t end = bytes.find("\r\n\r\n");
    if (end == std::string::npos) {
        return false;
    }
    Message read;
    const std::vector<std::string> lines = appliance::Lines(bytes.substr(0, end));
    read.first = lines.front();
    for (std::size_t index = 1; index < lines.size(); ++index) {
        const std::size_t colon = lines[index].find(':');
        read.lines.push_back(lines[index]);
        read.header[appliance::Lower(lines[index].substr(0, colon))] = appliance::Trim(lines[index].substr(colon + 1));
    }
    const auto length = read.header.find("content-length");
    const std::size_t size = noBody || length == read.header.end() ? 0 : std::stoul(length->second);
    if (bytes.size() < end + 4 + size) {
        return false;
    }
    read.body = bytes.substr(end + 4, size);
    bytes.erase(0, end + 4 + size);
    message = read;
    return true;
}

}  // namespace

Folder::Folder() {
    std::string name = "/tmp/httpd-test.XXXXXX";
    if (mkdtemp(name.data()) == nullptr) {
        throw std::runtime_error("no temporary folder");
    }
    chmod(name.c_str(), 0777);
    path_ = name;
}

Folder::~Folder() {
    std::error_code ignored;
    fs::remove_all(path_, ignored);
}

std::string Folder::Write(const std::string& name, const std::string& content, mode_t mode) const {
    const std::string path = At(name);
    fs::create_directories(fs::path(path).parent_path());
    std::ofstream(path, std::ios::binary) << content;
    chmod(path.c_str(), mode);
    return path;
}

std::string Folder::Read(const std::string& name) const {
    std::ifstream file(At(name), std::ios::binary);
    std::stringstream content;
    content << file.rdbuf();
    return content.str();
}

void WritePage(const Folder& folder) {
    folder.Write("page/index.html", "<!doctype html><title>page</title>");
    folder.Write("page/assets/app.js", std::string(100000, 'a'));
    folder.Write("page/assets/app.js.br", "as brotli");
    folder.Write("page/assets/app.js.gz", "as gzip");
    folder.Write("page/secret/.hidden", "hidden");
}

int Message::status() const {
    const std::size_t blank = first.find(' ');
    return appliance::StartsWith(first, "HTTP/1.1 ") ? std::stoi(first.substr(blank + 1, 3)) : 0;
}

Json::Value Message::json() const {
    Json::Value value;
    const std::unique_ptr<Json::CharReader> reader(Json::CharReaderBuilder().newCharReader());
    reader->parse(body.data(), body.data() + body.size(), &value, nullptr);
    return value;
}

int Message::Code() const {
    return json()["error"]["code"].asInt();
}

FakeVornd::FakeVornd(std::string socket, Answer answer)
    : path_(std::move(socket)),
      answer_(answer ? std::move(answer) : [](const Message&) { return Reply(R"({"success": true, "data": null})"); }),
      listener_(::socket(AF_UNIX, SOCK_STREAM | SOCK_CLOEXEC, 0)) {
    sockaddr_un address{};
    address.sun_family = AF_UNIX;
    std::memcpy(address.sun_path, path_.data(), path_.size());
    unlink(path_.c_str());
    if (bind(listener_.get(), Plain(address), sizeof address) != 0 || chmod(path_.c_str(), 0777) != 0 ||
        listen(listener_.get(), 256) != 0) {
        throw std::runtime_error("the double of vornd can't listen");
    }
    server_ = std::thread([this] { Serve(); });
}

FakeVornd::~FakeVornd() {
    ending_ = true;
    server_.join();
    DropIdle();
    for (std::thread& thread : threads_) {
        thread.join();
    }
    unlink(path_.c_str());
}

std::string FakeVornd::Reply(const std::string& body, int status, const std::string& header, const std::string& type) {
    return "HTTP/1.1 " + std::to_string(status) + " Whatever\r\nContent-Type: " + type + "\r\n" + header +
           "Content-Length: " + std::to_string(body.size()) + "\r\n\r\n" + body;
}

std::vector<Message> FakeVornd::Requests() const {
    const std::lock_guard<std::mutex> guard(mutex_);
    return requests_;
}

void FakeVornd::DropIdle() {
    const std::lock_guard<std::mutex> guard(mutex_);
    for (const int socket : open_) {
        shutdown(socket, SHUT_RDWR);
    }
}

void FakeVornd::Serve() {
    while (!ending_) {
        if (!Readable(listener_.get(), milliseconds(20))) {
            continue;
        }
        const int socket = accept4(listener_.get(), nullptr, nullptr, SOCK_CLOEXEC);
        if (socket >= 0) {
            ++connections_;
            const std::lock_guard<std::mutex> guard(mutex_);
            open_.push_back(socket);
            threads_.emplace_back([this, socket] { ServeOne(socket); });
        }
    }
}

void FakeVornd::ServeOne(int socket) {
    std::string bytes;
    std::string answer = "none yet";
    while (!answer.empty()) {
        Message request;
        while (!TakeMessage(bytes, false, request)) {
            char some[4096];
            const ssize_t got = recv(socket, some, sizeof some, 0);
            if (got <= 0) {
                answer.clear();
                break;
            }
            bytes.append(some, static_cast<std::size_t>(got));
        }
        if (answer.empty()) {
            break;
        }
        {
            const std::lock_guard<std::mutex> guard(mutex_);
            requests_.push_back(request);
        }
        answer = answer_(request);
        std::size_t sent = 0;
        while (sent < answer.size()) {
            const ssize_t some = send(socket, answer.data() + sent, answer.size() - sent, MSG_NOSIGNAL);
            if (some <= 0) {
                answer.clear();
                break;
            }
            sent += static_cast<std::size_t>(some);
        }
        ++answered_;
    }
    const std::lock_guard<std::mutex> guard(mutex_);
    open_.erase(std::find(open_.begin(), open_.end(), socket));
    close(socket);
}

DoorThread::DoorThread(const Wishes& wishes) {
    signal(SIGPIPE, SIG_IGN);  // as the program does
    appliance::Door::Setup setup;
    setup.listeners.push_back(appliance::ListenOn(*appliance::ParseListenAddress(wishes.address)));
    port_ = appliance::PortOf(setup.listeners.front().get());
    setup.vornd = wishes.vornd;
    setup.page = wishes.page;
    setup.certificate = wishes.certificate;
    setup.limits = wishes.limits;
    door_ = std::make_unique<appliance::Door>(std::move(setup));
    thread_ = std::thread([this] { door_->Run(); });
}

DoorThread::~DoorThread() {
    // The first one ends it when nothing runs, and the second one in any case.
    kill(getpid(), SIGTERM);
    usleep(20000);
    kill(getpid(), SIGTERM);
    thread_.join();
}

DoorProcess::DoorProcess(const Folder& folder, std::vector<std::string> arguments, bool wait, uid_t user) {
    static int processes = 0;
    output_ = folder.At("output." + std::to_string(++processes));
    fs::create_directories(folder.At("state"));
    chmod(folder.At("state").c_str(), 0777);
    arguments.insert(arguments.begin(),
                     {"vorn-httpd", "--foreground", "--page", folder.At("page"), "--vornd", folder.At("vornd.sock"),
                      "--state", folder.At("state"), "--listen", "127.0.0.1:0"});
    std::vector<char*> argv;
    for (std::string& argument : arguments) {
        argv.push_back(argument.data());
    }
    argv.push_back(nullptr);
    // Sanitizers look for leaks by tracing, which a process that guards its memory does not let them.
    std::string sanitizer = "ASAN_OPTIONS=detect_leaks=0";
    char* environment[] = {sanitizer.data(), nullptr};
    const appliance::FileDescriptor program(open(VORN_TEST_HTTPD, O_RDONLY | O_CLOEXEC));
    const appliance::FileDescriptor output(open(output_.c_str(), O_WRONLY | O_CREAT | O_APPEND | O_CLOEXEC, 0600));
    pid_ = fork();
    if (pid_ == 0) {
        // The program may lie where this user has no way to.
        if (dup2(output.get(), 1) == 1 && dup2(output.get(), 2) == 2 && setgid(user) == 0 && setuid(user) == 0) {
            fexecve(program.get(), argv.data(), environment);
        }
        _exit(127);
    }
    if (!wait) {
        return;
    }
    const std::string word = "//127.0.0.1:";
    if (!Eventually([&] { return Output().find(word) != std::string::npos || End(milliseconds(0)); }) || status_) {
        throw std::runtime_error("vorn-httpd does not serve: " + Output());
    }
    const std::string said = Output();
    port_ = std::stoi(said.substr(said.find(word) + word.size()));
}

DoorProcess::~DoorProcess() {
    if (!status_) {
        kill(pid_, SIGKILL);
        End();
    }
}

void DoorProcess::Signal(int signal) const {
    kill(pid_, signal);
}

std::optional<int> DoorProcess::End(milliseconds wait) {
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

std::string DoorProcess::Output() const {
    std::ifstream file(output_);
    std::stringstream content;
    content << file.rdbuf();
    return content.str();
}

Client::Client(int port, Kind kind, const std::function<void(SSL*)>& prepare)
    : socket_(::socket(AF_INET, SOCK_STREAM | SOCK_CLOEXEC, 0)) {
    sockaddr_in address{};
    address.sin_family = AF_INET;
    address.sin_port = htons(static_cast<std::uint16_t>(port));
    address.sin_addr.s_addr = htonl(INADDR_LOOPBACK);
    const timeval patience{20, 0};
    setsockopt(socket_.get(), SOL_SOCKET, SO_RCVTIMEO, &patience, sizeof patience);
    isOpen_ = connect(socket_.get(), Plain(address), sizeof address) == 0;
    if (isOpen_ && kind == Kind::Tls) {
        context_ = SSL_CTX_new(TLS_client_method());
        ssl_ = SSL_new(context_);
        SSL_set_fd(ssl_, socket_.get());
        if (prepare) {
            prepare(ssl_);
        }
        isOpen_ = SSL_connect(ssl_) == 1;
    }
}

Client::Client(Client&& other) noexcept
    : socket_(std::move(other.socket_)),
      context_(std::exchange(other.context_, nullptr)),
      ssl_(std::exchange(other.ssl_, nullptr)),
      isOpen_(other.isOpen_),
      left_(std::move(other.left_)) {}

Client::~Client() {
    SSL_free(ssl_);
    SSL_CTX_free(context_);
}

bool Client::Send(const std::string& bytes) {
    std::size_t sent = 0;
    while (isOpen_ && sent < bytes.size()) {
        const auto left = bytes.size() - sent;
        const ssize_t some = ssl_ != nullptr ? SSL_write(ssl_, bytes.data() + sent, static_cast<int>(left))
                                             : send(socket_.get(), bytes.data() + sent, left, MSG_NOSIGNAL);
        if (some <= 0) {
            return false;
        }
        sent += static_cast<std::size_t>(some);
    }
    return isOpen_;
}

int Client::ReadSome(char* bytes, std::size_t size, milliseconds wait) {
    if ((ssl_ == nullptr || SSL_has_pending(ssl_) == 0) && !Readable(socket_.get(), wait)) {
        return -1;
    }
    return ssl_ != nullptr ? SSL_read(ssl_, bytes, static_cast<int>(size))
                           : static_cast<int>(recv(socket_.get(), bytes, size, 0));
}

Message Client::Receive(milliseconds wait, bool noBody) {
    const Clock::time_point end = Clock::now() + wait;
    Message message;
    while (!TakeMessage(left_, noBody, message)) {
        char bytes[65536];
        const auto patience = std::chrono::duration_cast<milliseconds>(end - Clock::now());
        const int got = ReadSome(bytes, sizeof bytes, std::max(patience, milliseconds(0)));
        if (got <= 0) {
            return {};
        }
        left_.append(bytes, static_cast<std::size_t>(got));
    }
    return message;
}

bool Client::Ends(milliseconds wait) {
    char byte = 0;
    return left_.empty() && Readable(socket_.get(), wait) && ReadSome(&byte, 1, wait) <= 0;
}

void Client::CloseSending() {
    shutdown(socket_.get(), SHUT_WR);
}

Message Client::Ask(const std::string& request) {
    Send(request);
    return Receive();
}

std::string GetText(const std::string& target, const std::string& header, const std::string& verb) {
    return verb + " " + target + " HTTP/1.1\r\nHost: nas:8443\r\n" + header + "\r\n";
}

std::string PostText(const std::string& target, const std::string& body, const std::string& header) {
    return "POST " + target + " HTTP/1.1\r\nHost: nas:8443\r\nContent-Type: application/json\r\n" + header +
           "Content-Length: " + std::to_string(body.size()) + "\r\n\r\n" + body;
}

}  // namespace httpd_test
