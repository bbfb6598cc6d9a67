// A root folder of the test's own with an appliance's files and tools that record how they were called and answer as
// the test says.

#ifndef VORN_TESTS_APPLIANCE_JOIN_JOIN_TEST_H
#define VORN_TESTS_APPLIANCE_JOIN_JOIN_TEST_H

#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <map>
#include <string>
#include <vector>

#include "appliance/domain/join/journal.h"
#include "appliance/domain/membership/membership.h"

namespace join_test {

// smb.conf of an appliance in its workgroup, with all that an administrator may have written.
extern const char kWorkgroupConf[];

class JoinTest : public testing::Test {
protected:
    JoinTest();
    ~JoinTest() override;

    // A fixed path under the test's root.
    std::string At(const std::string& path) const {
        return root + path;
    }
    // The file's bytes, or "<missing>".
    std::string Content(const std::string& path) const;
    bool Exists(const std::string& path) const;
    // Makes the file and its folders.
    void Put(const std::string& path, const std::string& content, unsigned mode = 0644) const;

    // Makes a tool: a shell script that writes its name and arguments as a line of /calls and goes on with `script`.
    void Tool(const std::string& path, const std::string& script) const;
    // The lines of /calls so far.
    std::vector<std::string> Calls() const;
    // The calls with this text in them.
    std::vector<std::string> Calls(const std::string& part) const;

    // A database of secrets with these keys and values.
    void PutSecrets(const std::string& path, const std::map<std::string, std::string>& records) const;
    std::map<std::string, std::string> Secrets(const std::string& path) const;

    // Makes the appliance a member: smb.conf, secret "old".
    void MakeMember(const std::string& security, const std::string& domain, const std::string& realm) const;

    std::string root;
};

// The keys that a join of Active Directory leaves for a domain.
std::map<std::string, std::string> SecretsOf(const std::string& domain, const std::string& realm,
                                             const std::string& password);

appliance::Membership AdMembership(const std::string& domain, const std::string& realm);

}  // namespace join_test

#endif
