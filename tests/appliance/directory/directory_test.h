// A test with an appliance of its own under a temporary root: its configuration, and programs that stand in for Samba's
// tools by printing what a test lays down.

#ifndef VORN_TESTS_APPLIANCE_DIRECTORY_DIRECTORY_TEST_H
#define VORN_TESTS_APPLIANCE_DIRECTORY_DIRECTORY_TEST_H

#include <string>
#include <vector>

#include "appliance/base/file.h"
#include "appliance/domain/directory/directory_store.h"
#include "appliance/domain/membership/membership.h"
#include "tests/appliance/base/temporary_folder.h"

namespace appliance_test {

class DirectoryTest : public FolderTest {
protected:
    DirectoryTest();

    // An address of the loopback that no other test process uses: the controller of MakeMember.
    static std::string ControllerAddress();
    // Its port for sessions, open as long as the descriptor is.
    static appliance::FileDescriptor ListenAsController();

    // The appliance as a member of LAB (lab.test), Active Directory or NT4-style, with LAB's and OTHER's ids.
    static void MakeMember(bool activeDirectory);

    // A program of that name (wbinfo, net, rpcclient, nmblookup) that runs `script` with /bin/sh.
    static void PutProgram(const std::string& name, const std::string& script);
    // A program that prints `output` and ends with `code`.
    void PutAnswer(const std::string& name, const std::string& output, int code = 0);

    // Publishes a list of these names, with ids from 1000 on.
    static void Publish(appliance::EntryKind kind, const std::string& domain, const std::vector<std::string>& names);
    // The names of the list, in its order; "<none>" without a list.
    static std::vector<std::string> Listed(appliance::EntryKind kind, const std::string& domain);
};

}  // namespace appliance_test

#endif
