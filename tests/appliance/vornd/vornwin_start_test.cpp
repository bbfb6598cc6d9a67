// What the server starts without waiting for it.

#include "appliance/platform/domain/vornwin_start.h"

#include <gmock/gmock.h>
#include <stdlib.h>

#include "appliance/base/paths.h"
#include "appliance/base/text.h"
#include "tests/appliance/vornd/support.h"

namespace vornd_test {
namespace {

using ::testing::UnorderedElementsAre;

// The appliance's files are those of a tree.
class UnderRoot {
public:
    explicit UnderRoot(const Tree& tree) {
        appliance::SetRoot(tree.root());
    }
    ~UnderRoot() {
        appliance::SetRoot("");
    }
    UnderRoot(const UnderRoot&) = delete;
    UnderRoot& operator=(const UnderRoot&) = delete;
};

TEST(VornwinStartTest, HasACleanEnvironmentAndASessionOfItsOwn) {
    Tree tree;
    // No shell in front, which would add to the environment.
    tree.Write("/usr/vorn/sbin/vornwin",
               "#!/usr/bin/python3 -I\n"
               "import os, sys\n"
               "out = open(sys.argv[0] + '.new', 'w')\n"
               "print('arguments', *sys.argv[1:], file=out)\n"
               "print('leads', os.getsid(0) == os.getpid(), file=out)\n"
               "for entry in open('/proc/self/environ').read().split('\\0')[:-1]: print(entry, file=out)\n"
               "out.close()\n"
               "os.rename(out.name, sys.argv[0] + '.out')\n",
               0755);
    const UnderRoot root(tree);
    setenv("LEAK", "secret", 1);
    appliance::StartVornwin("-syncTime");
    unsetenv("LEAK");
    ASSERT_TRUE(Eventually([&] { return !tree.Read("/usr/vorn/sbin/vornwin.out").empty(); }));
    EXPECT_THAT(appliance::Lines(tree.Read("/usr/vorn/sbin/vornwin.out")),
                UnorderedElementsAre("arguments -syncTime", "leads True", "PATH=/usr/sbin:/usr/bin:/sbin:/bin",
                                     "HOME=/", "LC_ALL=C", "VORN_TEST_ROOT=" + tree.root()));
}

}  // namespace
}  // namespace vornd_test
