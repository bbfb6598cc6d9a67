// A door for tests: pages in a temporary folder, a double of vornd, the door in this process or as one of its own, and a
// client that sends what it is told.

#ifndef VORN_TESTS_APPLIANCE_HTTPD_SUPPORT_H
#define VORN_TESTS_APPLIANCE_HTTPD_SUPPORT_H

#include <json/value.h>
#include <openssl/ssl.h>
#include <sys/types.h>
#include <unistd.h>

#include <atomic>
#include <chrono>
#include <functional>
#include <map>
#include <memory>
#include <mutex>
#include <optional>
#include <string>
#include <thread>
#include <vector>

#include "appliance/base/file.h"
#include "appliance/httpd/door.h"

namespace httpd_test {

using std::chrono::milliseconds;

// A folder under /tmp, open to all; removed at its end.
class Folder {
public:
    Folder();
    ~Folder();
    Folder(const Folder&) = delete;
    Folder& operator=(const Folder&) = delete;

    std::string At(const std::string& name) const {
        return path_ + "/" + name;
    }
    const std::string& path() const {
        return path_;
    }
    // Writes a file, and the folders that it lies in.
    std::string Write(const std::string& name, const std::string& content, mode_t mode = 0644) const;
    std::string Read(const std::string& name) const;

private:
    std::string path_;
};

// index.html, and assets/app.js with its .br and .gz.
void WritePage(const Folder& folder);

// A message as it came: of a client at the double, or of the server at a client.
struct Message {
    std::string first;                          // the first line; empty when none came
    std::map<std::string, std::string> header;  // names in lower case; of several the last one
    std::vector<std::string> lines;             // the header's lines
    std::string body;

    int status() const;
    Json::Value json() const;
    int Code() const;
};

// vornd, as far as the door can tell: answers with what the test says. Every connection has a thread.
class FakeVornd {
public:
    // Answers the bytes to send for a request. An empty text ends the connection without an answer.
    using Answer = std::function<std::string(const Message&)>;

    explicit FakeVornd(std::string socket, Answer answer = {});
    ~FakeVornd();
    FakeVornd(const FakeVornd&) = delete;
    FakeVornd& operator=(const FakeVornd&) = delete;

    static std::string Reply(const std::string& body, int status = 200, const std::string& header = {},
                             const std::string& type = "application/json");
    std::vector<Message> Requests() const;
    int Connections() const {
        return connections_;
    }
    // How many answers have been sent, or cut off by the other side.
    int Answered() const {
        return answered_;
    }
    // Ends the connections that wait for a request; new ones are taken as before.
    void DropIdle();

private:
    void Serve();
    void ServeOne(int socket);

    const std::string path_;
    const Answer answer_;
    appliance::FileDescriptor listener_;
    mutable std::mutex mutex_;
    std::vector<Message> requests_;
    std::vector<int> open_;
    std::vector<std::thread> threads_;
    std::atomic<int> connections_{0};
    std::atomic<int> answered_{0};
    std::atomic<bool> ending_{false};
    std::thread server_;
};

// The door, on a thread of this process: for tests that need other limits.
class DoorThread {
public:
    struct Wishes {
        std::string page;
        std::string vornd;
        appliance::DoorCertificate* certificate = nullptr;
        appliance::DoorLimits limits;
        std::string address = "127.0.0.1:0";
    };
    explicit DoorThread(const Wishes& wishes);
    ~DoorThread();
    DoorThread(const DoorThread&) = delete;
    DoorThread& operator=(const DoorThread&) = delete;

    int port() const {
        return port_;
    }

private:
    int port_ = 0;
    std::unique_ptr<appliance::Door> door_;
    std::thread thread_;
};

// The program, as the user nobody.
class DoorProcess {
public:
    // `arguments` go behind those that every test has: --foreground, --page, --vornd and --state in the folder, and one
    // address with any port. With `wait` it is up when this returns, else std::runtime_error.
    explicit DoorProcess(const Folder& folder, std::vector<std::string> arguments = {}, bool wait = true,
                         uid_t user = 65534);
    ~DoorProcess();
    DoorProcess(const DoorProcess&) = delete;
    DoorProcess& operator=(const DoorProcess&) = delete;

    int port() const {
        return port_;
    }
    pid_t pid() const {
        return pid_;
    }
    void Signal(int signal) const;
    // The exit status, 128 + N for a signal; nothing when it does not end within `wait`.
    std::optional<int> End(milliseconds wait = milliseconds(30000));
    // What it has printed so far.
    std::string Output() const;

private:
    std::string output_;
    pid_t pid_ = -1;
    int port_ = 0;
    std::optional<int> status_;
};

// A connection, in clear text or through TLS. Takes any certificate.
class Client {
public:
    enum class Kind { ClearText, Tls };
    explicit Client(int port, Kind kind = Kind::ClearText, const std::function<void(SSL*)>& prepare = {});
    ~Client();
    Client(Client&& other) noexcept;
    Client& operator=(Client&&) = delete;
    Client(const Client&) = delete;
    Client& operator=(const Client&) = delete;

    // Connected, and the handshake done.
    bool isOpen() const {
        return isOpen_;
    }
    SSL* ssl() const {
        return ssl_;
    }
    int socket() const {
        return socket_.get();
    }
    // False when the other side does not take it.
    bool Send(const std::string& bytes);
    // The next answer; an empty one after `wait` or at the end of the connection. `noBody` for answers to HEAD.
    Message Receive(milliseconds wait = milliseconds(20000), bool noBody = false);
    // True when the other side closes within `wait` and sends nothing more.
    bool Ends(milliseconds wait = milliseconds(10000));
    void CloseSending();
    // One request and its answer.
    Message Ask(const std::string& request);

private:
    int ReadSome(char* bytes, std::size_t size, milliseconds wait);

    appliance::FileDescriptor socket_;
    SSL_CTX* context_ = nullptr;
    SSL* ssl_ = nullptr;
    bool isOpen_ = false;
    std::string left_;
};

// Requests. `header`: further lines, each with its end.
std::string GetText(const std::string& target, const std::string& header = {}, const std::string& verb = "GET");
std::string PostText(const std::string& target, const std::string& body = "{}", const std::string& header = {});

inline const std::string kToken = "Session-Token_of-43-letters-abcdefghijklmno";
inline const std::string kCookie = "Cookie: __Host-vorn=" + kToken + "\r\n";

// Asks again and again until `condition` holds; false when it does not within `wait`.
template <typename Condition>
bool Eventually(Condition condition, milliseconds wait = milliseconds(30000)) {
    const auto end = std::chrono::steady_clock::now() + wait;
    while (!condition()) {
        if (std::chrono::steady_clock::now() >= end) {
            return false;
        }
        usleep(5000);
    }
    return true;
}

}  // namespace httpd_test

#endif
