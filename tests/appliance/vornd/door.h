// The server's door, as the server for browsers uses it: a vornd whose door is an ordinary account, and a stand-in for
// the program that asks PAM.

#ifndef VORN_TESTS_APPLIANCE_VORND_DOOR_H
#define VORN_TESTS_APPLIANCE_VORND_DOOR_H

#include <gmock/gmock.h>

#include <memory>
#include <string>
#include <vector>

#include "tests/appliance/vornd/support.h"

namespace vornd_test {

inline constexpr uid_t kDoorUser = 65534;  // "nobody"
inline constexpr uid_t kStranger = 1;      // "daemon"

struct Headers {
    std::string session = {};
    std::string csrf = {};
    std::string client = "192.0.2.1";
    bool background = false;

    std::string Text() const;
};

class DoorTest : public ::testing::Test {
protected:
    // The password is the verdict: right, wrong, unknown, refused, no-administrator, broken, killed; slow is wrong after
    // 2.1 s, and right-slow right once there is the file /go.
    DoorTest();

    void Restart();
    // A request on a connection of its own.
    Response Ask(const std::string& verb, const std::string& path, const std::string& body = {},
                 const Headers& headers = {}, uid_t user = kDoorUser) const;
    Response LogIn(const std::string& user, const std::string& password, const Headers& headers = {}) const;
    // Logs "anna" in.
    Headers Session() const;
    Response Call(const Headers& headers, const std::string& method = "nothing", const std::string& body = "{}") const;
    // The token of a link that root has made.
    std::string NewLink() const;

    Tree tree_;
    std::unique_ptr<Server> server_;
};

std::string RequestText(const std::string& verb, const std::string& path, const std::string& body,
                        const std::string& header);

void ExpectError(const Response& response, int status, int code);

}  // namespace vornd_test

#endif
