// The list of DNS servers, through the operations of the platform.

#include <sys/stat.h>
#include <unistd.h>

#include <memory>
#include <string>
#include <vector>

#include "appliance/base/error_code.h"
#include "appliance/base/paths.h"
#include "appliance/platform/system/dns_servers.h"
#include "appliance/platform/system/resolv_conf.h"
#include "platform/core.h"
#include "platform/network.h"
#include "tests/appliance/system/system_test.h"

namespace {

using ::testing::ElementsAre;
using ::testing::ElementsAreArray;
using ::testing::IsEmpty;

using List = std::vector<std::string>;

constexpr const char* kFile = appliance::kResolvConf;
constexpr const char* kOptions = "options timeout:1 attempts:1\n";

class DnsServers : public system_test::SystemTest {
protected:
    static int Set(const List& entries) {
        VLIBSZLIST* list = VLIBCSzListAlloc(1024);
        for (const std::string& entry : entries) {
            EXPECT_GE(VLIBCSzListPush(&list, entry.c_str()), 0);
        }
        const int result = VORNNetDNSListSet(list);
        VLIBCSzListFree(list);
        return result;
    }

    static List Get() {
        VLIBSZLIST* list = VLIBCSzListAlloc(1024);
        EXPECT_GE(VORNNetDNSListGet(&list), 0);
        List servers;
        for (int index = 0; index < list->count; ++index) {
            servers.emplace_back(VLIBCSzListGet(list, index));
        }
        VLIBCSzListFree(list);
        return servers;
    }
};

// Files as administrators and programs leave them.
const List kFiles = {
    "nameserver 10.0.0.1\n",
    "nameserver 10.0.0.1",
    "",
    "\n",
    "# a comment only\n",
    "search lab.test\nnameserver 10.0.0.1\nnameserver 10.0.0.2\nnameserver fe80::1%eth0\noptions rotate ndots:3\n",
    "nameserver\t10.0.0.1 # the first\r\nnameserver 10.0.0.2;x\r\n\r\n",
    "options timeout:9\nnameserver 10.0.0.1\noptions attempts:5\n# end",
    " nameserver 10.9.9.9\nnameserver 10.0.0.1\nnameserver not-an-address\nnameserver\nnameservers 10.8.8.8\n",
    "nameserver 10.0.0.1\n\n\n# between\nnameserver ::1\nsortlist 10.0.0.0/8\n",
    "domain lab.test\nnameserver 10.0.0.1\noptions timeout:1 attempts:1\n",
    std::string("nul\0byte\nnameserver 10.0.0.1\n\xFF\xFE\x01", 32),
    "nameserver 10.0.0.1\nnameserver 10.0.0.2\nnameserver 10.0.0.3\nnameserver 10.0.0.4\nnameserver 10.0.0.5\n",
};

const List kNewServers = {"192.0.2.1", "2001:db8::53", "192.0.2.3"};

TEST_F(DnsServers, ComeBackByteForByte) {
    for (const std::string& file : kFiles) {
        Put(kFile, file, 0640);
        const List old = Get();
        ASSERT_EQ(Set(kNewServers), 0);
        EXPECT_NE(*Content(kFile), file);
        EXPECT_EQ(Get(), kNewServers);
        ASSERT_EQ(Set(old), 0);
        EXPECT_EQ(*Content(kFile), file);
        struct stat status = {};
        ASSERT_EQ(stat(At(kFile).c_str(), &status), 0);
        EXPECT_EQ(status.st_mode & 0777U, 0640U);
        EXPECT_FALSE(Content(appliance::kResolvCopy));
    }
}

TEST_F(DnsServers, ComeBackAfterAChainOfChanges) {
    for (const std::string& file : kFiles) {
        Put(kFile, file);
        const List old = Get();
        ASSERT_EQ(Set({"192.0.2.1"}), 0);
        const std::string first = *Content(kFile);
        ASSERT_EQ(Set({"192.0.2.2"}), 0);
        ASSERT_EQ(Set({"192.0.2.1"}), 0);
        EXPECT_EQ(*Content(kFile), first);
        ASSERT_EQ(Set(old), 0);
        EXPECT_EQ(*Content(kFile), file);
        ASSERT_EQ(Set({"192.0.2.1"}), 0);
        EXPECT_EQ(*Content(kFile), first);
    }
}

TEST_F(DnsServers, ComeBackToAMissingFile) {
    EXPECT_THAT(Get(), IsEmpty());
    ASSERT_EQ(Set(kNewServers), 0);
    EXPECT_EQ(*Content(kFile),
              std::string("nameserver 192.0.2.1\nnameserver 2001:db8::53\nnameserver 192.0.2.3\n") + kOptions);
    struct stat status = {};
    ASSERT_EQ(stat(At(kFile).c_str(), &status), 0);
    EXPECT_EQ(status.st_mode & 0777U, 0644U);
    ASSERT_EQ(Set({}), 0);
    EXPECT_FALSE(Content(kFile));
}

TEST_F(DnsServers, KeepWhatOthersWroteInBetween) {
    Put(kFile, "# first\nnameserver 10.0.0.1\n");
    ASSERT_EQ(Set({"192.0.2.1"}), 0);
    Put(kFile, "# another's\nnameserver 192.0.2.1\nsearch lab.test\n");
    ASSERT_EQ(Set({"10.0.0.1"}), 0);
    EXPECT_EQ(*Content(kFile), std::string("# another's\nnameserver 10.0.0.1\nsearch lab.test\n") + kOptions);
    ASSERT_EQ(Set({"192.0.2.1"}), 0);
    EXPECT_EQ(*Content(kFile), "# another's\nnameserver 192.0.2.1\nsearch lab.test\n");
}

TEST_F(DnsServers, ComeBackWithoutTheCopyToo) {
    Put(kFile, "nameserver 10.0.0.1\nsearch lab.test\n");
    ASSERT_EQ(Set({"192.0.2.1"}), 0);
    for (const char* copy : {"", "x", "kept\n", "kept x\n", "kept 99999\nx", "kept -1\n", "lost 3\nabc"}) {
        Put(appliance::kResolvCopy, copy, 0600);
        ASSERT_EQ(Set({"10.0.0.1"}), 0);
        EXPECT_THAT(Get(), ElementsAre("10.0.0.1"));
        ASSERT_EQ(Set({"192.0.2.1"}), 0);
    }
}

TEST_F(DnsServers, StandWhereTheFirstOneStood) {
    Put(kFile, "# head\nnameserver 10.0.0.1\nsearch lab.test\nnameserver 10.0.0.2\n# tail");
    ASSERT_EQ(Set({"192.0.2.1", "192.0.2.2"}), 0);
    EXPECT_EQ(*Content(kFile),
              std::string("# head\nnameserver 192.0.2.1\nnameserver 192.0.2.2\nsearch lab.test\n# tail\n") + kOptions);
}

TEST_F(DnsServers, AreNotWrittenWhenTheyAreInUse) {
    Put(kFile, "nameserver 10.0.0.1");
    for (const char* entry : {"10.0.0.1", " 10.0.0.1"}) {
        ASSERT_EQ(Set({entry}), 0);
        EXPECT_EQ(*Content(kFile), "nameserver 10.0.0.1");
        EXPECT_FALSE(Content(appliance::kResolvCopy));
    }
}

TEST_F(DnsServers, MayBeNone) {
    Put(kFile, "nameserver 10.0.0.1\nsearch lab.test\n");
    ASSERT_EQ(Set({}), 0);
    EXPECT_EQ(*Content(kFile), "search lab.test\n");
    EXPECT_THAT(Get(), IsEmpty());
    ASSERT_EQ(Set({"10.0.0.1"}), 0);
    EXPECT_EQ(*Content(kFile), "nameserver 10.0.0.1\nsearch lab.test\n");
}

TEST_F(DnsServers, AreKeptWholeBeyondThree) {
    const List five = {"192.0.2.1", "192.0.2.2", "192.0.2.3", "192.0.2.4", "192.0.2.5"};
    ASSERT_EQ(Set(five), 0);
    EXPECT_EQ(Get(), five);
}

TEST_F(DnsServers, MayHaveBlanksInFront) {
    ASSERT_EQ(Set({" 192.0.2.1", "   2001:db8::1"}), 0);
    EXPECT_THAT(Get(), ElementsAre("192.0.2.1", "2001:db8::1"));
}

TEST_F(DnsServers, ThatAreNoAddressesAreRefusedAsAWhole) {
    const std::string file = "nameserver 10.0.0.1\n";
    Put(kFile, file);
    const List entries = {"",
                          " ",
                          "x",
                          "dns.lab.test",
                          "10.0.0",
                          "10.0.0.256",
                          "10.0.0.1.1",
                          "010.0.0.1x",
                          "10.0.0.1 ",
                          "10.0.0.1\n",
                          "10.0.0.1\nnameserver 10.6.6.6",
                          "\t10.0.0.1",
                          "10.0.0.1\r",
                          "10.0.0.1 #",
                          "10.0.0.1,10.0.0.2",
                          "10.0.0.1:53",
                          "[::1]",
                          "::1%eth0",
                          "fe80::1%",
                          "fe80::1%eth0 x",
                          "fe80::1%eth0\n",
                          "fe80::1%0123456789abcdef",
                          ":::",
                          "12345::",
                          "1::2::3",
                          "0x0a000001",
                          "167772161",
                          "-10.0.0.1",
                          "10.0.0.1\x7F",
                          "\1 10.0.0.1"};
    for (const std::string& entry : entries) {
        for (const List& list : {List{entry}, List{"192.0.2.1", entry}, List{entry, "192.0.2.1"}}) {
            VLIBCErrSetEx(0, "", 0);
            EXPECT_EQ(Set(list), -1) << '"' << entry << '"';
            EXPECT_EQ(VLIBCErrGet(), static_cast<int>(appliance::ErrorCode::BadArgument));
        }
    }
    EXPECT_EQ(*Content(kFile), file);
    EXPECT_FALSE(Content(appliance::kResolvCopy));
    EXPECT_EQ(VORNNetDNSListSet(nullptr), -1);
    EXPECT_EQ(VORNNetDNSListGet(nullptr), -1);
}

TEST_F(DnsServers, AreWrittenThroughALink) {
    Put("/run/resolver/stub.conf", "# generated\nnameserver 127.0.0.53\n");
    ASSERT_EQ(symlink("../run/resolver/stub.conf", At(kFile).c_str()), 0);
    ASSERT_EQ(Set({"192.0.2.1"}), 0);
    EXPECT_EQ(*Content("/run/resolver/stub.conf"), std::string("# generated\nnameserver 192.0.2.1\n") + kOptions);
    ASSERT_EQ(Set({"127.0.0.53"}), 0);
    EXPECT_EQ(*Content("/run/resolver/stub.conf"), "# generated\nnameserver 127.0.0.53\n");
    struct stat status = {};
    ASSERT_EQ(lstat(At(kFile).c_str(), &status), 0);
    EXPECT_TRUE(S_ISLNK(status.st_mode));
}

TEST_F(DnsServers, ComeBackToALinkThatLeadsNowhere) {
    std::string folder = "/run/resolver";
    ASSERT_EQ(mkdir(At(folder).c_str(), 0755), 0);
    ASSERT_EQ(symlink("../run/resolver/stub.conf", At(kFile).c_str()), 0);
    ASSERT_EQ(Set({"192.0.2.1"}), 0);
    EXPECT_TRUE(Content("/run/resolver/stub.conf"));
    ASSERT_EQ(Set({}), 0);
    EXPECT_FALSE(Content("/run/resolver/stub.conf"));
    struct stat status = {};
    ASSERT_EQ(lstat(At(kFile).c_str(), &status), 0);
    EXPECT_TRUE(S_ISLNK(status.st_mode));
}

TEST_F(DnsServers, FailWhereTheFileCantBeReadOrWritten) {
    ASSERT_EQ(mkdir(At(kFile).c_str(), 0755), 0);
    VLIBSZLIST* list = VLIBCSzListAlloc(4);
    EXPECT_EQ(VORNNetDNSListGet(&list), -1);
    EXPECT_EQ(VLIBCErrGet(), static_cast<int>(appliance::ErrorCode::FileRead));
    VLIBCSzListFree(list);
    EXPECT_EQ(Set({"192.0.2.1"}), -1);
    ASSERT_EQ(rmdir(At(kFile).c_str()), 0);
    ASSERT_EQ(symlink("/nowhere/at/all", At(kFile).c_str()), 0);
    EXPECT_EQ(Set({"192.0.2.1"}), -1);
    EXPECT_EQ(VLIBCErrGet(), static_cast<int>(appliance::ErrorCode::FileWrite));
}

// The folder can be written, but nothing fits in beside a name this long.
TEST_F(DnsServers, LeaveNoCopyOfAFileThatCouldNotBeChanged) {
    const std::string longest = "/etc/" + std::string(250, 'x');
    Put(longest, "nameserver 10.0.0.1\n");
    ASSERT_EQ(symlink(std::string(250, 'x').c_str(), At(kFile).c_str()), 0);
    EXPECT_EQ(Set({"192.0.2.1"}), -1);
    EXPECT_FALSE(Content(appliance::kResolvCopy));
    EXPECT_EQ(*Content(longest), "nameserver 10.0.0.1\n");
}

TEST_F(DnsServers, ComeBackAlsoAfterAChangeThatFailed) {
    const std::string longest = "/etc/" + std::string(250, 'x');
    Put(kFile, "nameserver 10.0.0.1");
    ASSERT_EQ(Set({"192.0.2.1"}), 0);
    ASSERT_EQ(rename(At(kFile).c_str(), At(longest).c_str()), 0);
    ASSERT_EQ(symlink(std::string(250, 'x').c_str(), At(kFile).c_str()), 0);
    EXPECT_EQ(Set({"192.0.2.2"}), -1);
    ASSERT_EQ(rename(At(longest).c_str(), At(kFile).c_str()), 0);
    ASSERT_EQ(Set({"10.0.0.1"}), 0);
    EXPECT_EQ(*Content(kFile), "nameserver 10.0.0.1");
}

TEST(ResolverText, IsReadAsTheResolverReadsIt) {
    EXPECT_THAT(appliance::Servers(" nameserver 10.9.9.9\nnameserver 10.0.0.1\nnameserver bad\nnameserver\n"
                                   "nameservers 10.8.8.8\nnameserver\t 10.0.0.2;x\nnameserver 10.0.0.3#y\r\n"
                                   "#nameserver 10.7.7.7\nNAMESERVER 10.6.6.6\nnameserver fe80::1%eth0 z"),
                ElementsAre("10.0.0.1", "10.0.0.2", "10.0.0.3", "fe80::1%eth0"));
}

TEST(ResolverText, GetsTheOptionsAtItsEnd) {
    EXPECT_EQ(appliance::WithServers("options timeout:1 attempts:1\noptions timeout:9\n", {"10.0.0.1"}),
              std::string("options timeout:1 attempts:1\noptions timeout:9\nnameserver 10.0.0.1\n") + kOptions);
    EXPECT_EQ(appliance::WithServers("# no newline", {"10.0.0.1"}),
              std::string("# no newline\nnameserver 10.0.0.1\n") + kOptions);
    EXPECT_EQ(appliance::WithServers("options timeout:1 attempts:1\n# x\n", {"10.0.0.1"}),
              "options timeout:1 attempts:1\n# x\nnameserver 10.0.0.1\n");
}

}  // namespace
