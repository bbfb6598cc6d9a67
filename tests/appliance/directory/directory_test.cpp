#include "tests/appliance/directory/directory_test.h"

#include <arpa/inet.h>
#include <fcntl.h>
#include <netinet/in.h>
#include <sys/socket.h>
#include <sys/stat.h>
#include <tdb.h>
#include <unistd.h>

#include <filesystem>

#include "appliance/base/paths.h"
#include "appliance/domain/directory/list_writer.h"
#include "appliance/domain/membership/secrets.h"

namespace appliance_test {

using appliance::Path;

DirectoryTest::DirectoryTest() {
    for (const char* path : {"/usr/vorn/etc/private", "/usr/bin", "/etc", "/tmp", "/run/vorn", "/var/lib/vorn",
                             "/var/lib/samba/private"}) {
        std::filesystem::create_directories(Path(path));
    }
}

std::string DirectoryTest::ControllerAddress() {
    const auto pid = static_cast<unsigned>(getpid());
    return "127." + std::to_string(64 + pid / 62500 % 128) + "." + std::to_string(1 + pid / 250 % 250) + "." +
           std::to_string(1 + pid % 250);
}

appliance::FileDescriptor DirectoryTest::ListenAsController() {
    appliance::FileDescriptor listener(socket(AF_INET, SOCK_STREAM | SOCK_CLOEXEC, 0));
    const int on = 1;
    setsockopt(listener.get(), SOL_SOCKET, SO_REUSEADDR, &on, sizeof(on));
    sockaddr_in address{};
    address.sin_family = AF_INET;
    address.sin_port = htons(445);
    inet_pton(AF_INET, ControllerAddress().c_str(), &address.sin_addr);
    EXPECT_EQ(bind(listener.get(), reinterpret_cast<sockaddr*>(&address), sizeof(address)), 0);
    EXPECT_EQ(listen(listener.get(), 16), 0);
    return listener;
}

void DirectoryTest::MakeMember(bool activeDirectory) {
    Put(Path(appliance::kSmbConf),
        std::string("[global]\n    workgroup = LAB\n    netbios name = NAS1\n    password server = ") +
            ControllerAddress() + "\n" +
            (activeDirectory ? "    security = ads\n    realm = LAB.TEST\n" : "    security = domain\n") +
            "    idmap config LAB : backend = rid\n    idmap config LAB : range = 1000000-1999999\n"
            "    idmap config OTHER : backend = rid\n    idmap config OTHER : range = 2000000-2999999\n");
    tdb_context* secrets = tdb_open(Path(appliance::kSecrets).c_str(), 0, TDB_DEFAULT, O_RDWR | O_CREAT, 0600);
    ASSERT_NE(secrets, nullptr);
    std::string key = "SECRETS/MACHINE_PASSWORD/LAB";
    std::string value = "not a real one";
    const auto data = [](std::string& text) {
        return TDB_DATA{reinterpret_cast<unsigned char*>(text.data()), text.size() + 1};
    };
    TDB_DATA keyData = data(key);
    keyData.dsize -= 1;
    EXPECT_EQ(tdb_store(secrets, keyData, data(value), TDB_REPLACE), 0);
    tdb_close(secrets);
}

void DirectoryTest::PutProgram(const std::string& name, const std::string& script) {
    const std::string path = Path("/usr/bin/" + name);
    Put(path, "#!/bin/sh\n" + script + "\n");
    chmod(path.c_str(), 0755);
}

void DirectoryTest::PutAnswer(const std::string& name, const std::string& output, int code) {
    const std::string file = folder / (name + ".txt");
    Put(file, output);
    PutProgram(name, "cat '" + file + "'\nexit " + std::to_string(code));
}

void DirectoryTest::Publish(appliance::EntryKind kind, const std::string& domain,
                            const std::vector<std::string>& names) {
    appliance::ListWriter writer(kind, domain);
    std::int64_t id = 1000;
    for (const std::string& name : names) {
        writer.Add(name, id++, "");
    }
    EXPECT_TRUE(writer.Publish("ldap", "dc1.lab.test"));
}

std::vector<std::string> DirectoryTest::Listed(appliance::EntryKind kind, const std::string& domain) {
    const auto page = appliance::ReadEntries(kind, domain, 0, 1000);
    if (!page) {
        return {"<none>"};
    }
    std::vector<std::string> names;
    for (const appliance::DirectoryEntry& entry : page->entries) {
        names.push_back(entry.name);
    }
    return names;
}

}  // namespace appliance_test
