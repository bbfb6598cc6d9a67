// A server for tests: a tree of files under a temporary folder, vornd on it, and a client that sends what it is told.

#ifndef VORN_TESTS_APPLIANCE_VORND_SUPPORT_H
#define VORN_TESTS_APPLIANCE_VORND_SUPPORT_H

#include <json/value.h>
#include <json/writer.h>
#include <sys/types.h>
#include <unistd.h>

#include <chrono>
#include <map>
#include <optional>
#include <string>
#include <vector>

#include "appliance/base/file.h"

namespace vornd_test {

using std::chrono::milliseconds;

// A temporary root with all that a first start needs; removed at its end.
class Tree {
public:
    Tree();
    ~Tree();
    Tree(const Tree&) = delete;
    Tree& operator=(const Tree&) = delete;

    const std::string& root() const {
        return root_;
    }
    // The path of one of the appliance's files in the tree.
    std::string At(const std::string& path) const {
        return root_ + path;
    }
    std::string Socket() const {
        return At("/run/vorn/vornd.sock");
    }
    void Write(const std::string& path, const std::string& content, mode_t mode = 0644) const;
    std::string Read(const std::string& path) const;
    // Puts a module built for the tests ("test_module") into the folder of modules, or elsewhere.
    std::string Install(const std::string& module, const std::string& folder = "/usr/vorn/lib/modules") const;

private:
    std::string root_;
};

// One answer.
struct Response {
    int status = 0;                             // 0: the connection ended without an answer
    std::map<std::string, std::string> header;  // names in lower case
    std::string body;
    Json::Value json;

    int Code() const;  // of an error
    const Json::Value& Data() const;
};

// A connection.
class Client {
public:
    // As a process of this user would connect.
    explicit Client(const std::string& socket, uid_t user = 0);
    bool connected() const {
        return static_cast<bool>(socket_);
    }
    // False when the other side does not take it.
    bool Send(const std::string& bytes);
    // The next answer; status 0 after `wait` or at the end of the connection.
    Response Receive(milliseconds wait = milliseconds(20000));
    // True when the other side closes within `wait` and sends nothing more.
    bool Ends(milliseconds wait = milliseconds(3000));
    void CloseSending();

private:
    appliance::FileDescriptor socket_;
    std::string left_;
};

// A POST request of a method, with a JSON body.
std::string PostText(const std::string& method, const std::string& body, const std::string& version = "1",
                     const std::string& api = "Test.Plain", const std::string& header = {});

// Where vornd's standard error leads.
struct Output {
    bool foreground = true;  // with the option --foreground
    std::string file;        // empty: one of the server's own
};

// A process of vornd on a tree, as a service manager would start it.
class Server {
public:
    explicit Server(const Tree& tree, std::vector<std::string> arguments = {}, bool wait = true,
                    const Output& output = {});
    ~Server();
    Server(const Server&) = delete;
    Server& operator=(const Server&) = delete;

    pid_t pid() const {
        return pid_;
    }
    // Waits for this state ("READY=1") on the service manager's socket.
    bool Hears(const std::string& state, milliseconds wait = milliseconds(30000));
    void Signal(int signal) const;
    // The exit status, 128 + N for a signal; nothing when it does not end within `wait`.
    std::optional<int> End(milliseconds wait = milliseconds(30000));
    // What it has printed so far.
    std::string Errors() const;

    // One call on a connection of its own.
    Response Call(const std::string& method, const Json::Value& parameters = Json::Value(Json::objectValue)) const;
    // Its figures, as text.
    std::string Figures() const;
    Client Connect(uid_t user = 0) const;
    int Descriptors() const;

private:
    std::string socket_;
    std::string errors_;
    bool ownErrors_;
    appliance::FileDescriptor notify_;
    std::string notifyPath_;
    pid_t pid_ = -1;
    std::optional<int> status_;
};

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

bool IsAlive(pid_t pid);
std::vector<pid_t> PidsIn(const std::string& file);
Json::Value Object(std::initializer_list<std::pair<const char*, Json::Value>> members);

}  // namespace vornd_test

#endif
