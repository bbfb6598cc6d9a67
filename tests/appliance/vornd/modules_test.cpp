// Which files are modules, and which are not.

#include <gmock/gmock.h>
#include <sys/stat.h>
#include <unistd.h>

#include <filesystem>
#include <fstream>
#include <iterator>

#include "appliance/vornd/method_table.h"
#include "appliance/vornd/module.h"
#include "tests/appliance/vornd/support.h"

namespace vornd_test {
namespace {

using appliance::Module;
using ::testing::AllOf;
using ::testing::EndsWith;
using ::testing::HasSubstr;
using ::testing::StartsWith;

class ModulesTest : public ::testing::Test {
protected:
    // Why a module is refused; empty when it is not.
    static std::string Refusal(const std::string& path) {
        std::string reason;
        return Module::Load(path, reason) ? std::string() : reason;
    }

    Tree tree_;
    const std::string good_ = tree_.At("/usr/vorn/lib/modules/test_module.so");
};

TEST_F(ModulesTest, LoadsOneThatIsRight) {
    std::string reason;
    const auto module = Module::Load(good_, reason);
    ASSERT_TRUE(module) << reason;
    EXPECT_EQ(module->path(), good_);
    EXPECT_EQ(module->entries().size(), 14u);
    EXPECT_NE(module->FindTask("TaskSteps"), nullptr);
    EXPECT_EQ(module->FindTask("TaskNobody"), nullptr);
}

TEST_F(ModulesTest, UnloadsIt) {
    const auto mapped = [&] {
        std::ifstream maps("/proc/self/maps");
        return std::string(std::istreambuf_iterator<char>(maps), {}).find(good_) != std::string::npos;
    };
    std::string reason;
    auto module = Module::Load(good_, reason);
    EXPECT_TRUE(mapped());
    module.reset();
    EXPECT_FALSE(mapped());
}

TEST_F(ModulesTest, RefusesAFileThatOthersMayWrite) {
    chmod(good_.c_str(), 0775);
    EXPECT_THAT(Refusal(good_), EndsWith("test_module.so is writable by others than root"));
    chmod(good_.c_str(), 0757);
    EXPECT_THAT(Refusal(good_), EndsWith("test_module.so is writable by others than root"));
}

TEST_F(ModulesTest, RefusesAFileThatIsNotRoots) {
    ASSERT_EQ(chown(good_.c_str(), 65534, 0), 0);
    EXPECT_THAT(Refusal(good_), EndsWith("test_module.so does not belong to root"));
}

TEST_F(ModulesTest, RefusesAFolderThatOthersMayWrite) {
    const std::string folder = tree_.At("/usr/vorn/lib");
    chmod(folder.c_str(), 0777);
    EXPECT_THAT(Refusal(good_), EndsWith("/lib is writable by others than root"));
    // As /tmp is: others may add files but not replace root's.
    chmod(folder.c_str(), 01777);
    EXPECT_EQ(Refusal(good_), "");
    chmod(folder.c_str(), 0755);
    ASSERT_EQ(chown(folder.c_str(), 65534, 0), 0);
    EXPECT_THAT(Refusal(good_), EndsWith("/lib does not belong to root"));
}

TEST_F(ModulesTest, JudgesTheFileBehindALink) {
    const std::string target = tree_.Install("odd_empty", "/tmp");
    chmod(target.c_str(), 0666);
    const std::string link = tree_.At("/usr/vorn/lib/modules/link.so");
    std::filesystem::create_symlink(target, link);
    EXPECT_THAT(Refusal(link), AllOf(StartsWith("module " + link), HasSubstr("odd_empty.so is writable by others")));
}

TEST_F(ModulesTest, RefusesWhatIsNoLibrary) {
    tree_.Write("/usr/vorn/lib/modules/text.so", "not a library");
    EXPECT_THAT(Refusal(tree_.At("/usr/vorn/lib/modules/text.so")), HasSubstr("text.so refused: "));
    EXPECT_THAT(Refusal(tree_.At("/usr/vorn/lib/modules")), EndsWith("it is no regular file"));
    EXPECT_THAT(Refusal(tree_.At("/nowhere.so")), EndsWith("nowhere.so refused: No such file or directory"));
}

TEST_F(ModulesTest, RefusesALibraryThatWasCutShort) {
    for (const unsigned size : {100U, 3000U, 9000U}) {
        ASSERT_GT(std::filesystem::file_size(good_), size);
        std::filesystem::resize_file(good_, size);
        EXPECT_THAT(Refusal(good_), EndsWith("test_module.so refused: it is cut short"));
        std::filesystem::remove(good_);
        tree_.Install("test_module");
    }
}

TEST_F(ModulesTest, RefusesALibraryForAnotherProcessor) {
    std::fstream file(good_, std::ios::in | std::ios::out | std::ios::binary);
    file.seekp(18);
    file.put(static_cast<char>(0xF0));
    file.close();
    EXPECT_THAT(Refusal(good_), EndsWith("test_module.so refused: it is made for another kind of processor"));
}

TEST_F(ModulesTest, NamesTheSymbolThatThePlatformLacks) {
    const std::string path = tree_.Install("lacking_module");
    EXPECT_EQ(Refusal(path), "module " + path + " refused: the platform lacks the symbol VLIBCNobodyHasThis");
}

TEST_F(ModulesTest, RefusesTablesThatMakeNoSense) {
    const auto refusal = [&](const char* name) { return Refusal(tree_.Install(name)); };
    EXPECT_THAT(refusal("odd_no_table"), EndsWith("it is no web-API module, for it has no GetAPITable()"));
    EXPECT_THAT(refusal("odd_endless"), EndsWith("its API table has no end"));
    EXPECT_THAT(refusal("odd_no_function"), EndsWith("row 1 of its API table makes no sense"));
    EXPECT_THAT(refusal("odd_foreign"), EndsWith("row 1 of its API table makes no sense"));
    EXPECT_THAT(refusal("odd_name"), EndsWith("row 1 of its API table makes no sense"));
    EXPECT_THAT(refusal("odd_twice"), EndsWith("its API table has Test.Odd/1/nothing twice"));
    EXPECT_THAT(refusal("odd_empty"), EndsWith("its API table is empty"));
}

TEST_F(ModulesTest, TwoMayNotServeTheSameMethod) {
    const std::string copy = tree_.At("/usr/vorn/lib/modules/copy.so");
    std::filesystem::copy_file(good_, copy);
    appliance::MethodTable table;
    std::string reason;
    ASSERT_TRUE(table.Add(Module::Load(good_, reason), reason));
    EXPECT_FALSE(table.Add(Module::Load(copy, reason), reason));
    EXPECT_EQ(reason, "module " + copy + " refused: Test.Plain/1/nothing is served by another module");
    EXPECT_EQ(table.ModuleCount(), 1u);
}

TEST_F(ModulesTest, ServerLeavesOutWhatItRefuses) {
    tree_.Install("lacking_module");
    tree_.Write("/usr/vorn/lib/modules/readme.txt", "no module at all");
    Server server(tree_);
    EXPECT_THAT(server.Errors(),
                HasSubstr("lacking_module.so refused: the platform lacks the symbol VLIBCNobodyHasThis"));
    EXPECT_EQ(server.Call("nothing").status, 200);
}

TEST_F(ModulesTest, ServerEndsWithoutTheModuleThatWasNamed) {
    const std::string path = tree_.Install("odd_empty", "/tmp");
    Server server(tree_, {"--module", path}, false);
    EXPECT_EQ(server.End(), 1);
    EXPECT_THAT(server.Errors(), EndsWith("\nvornd: module " + path + " refused: its API table is empty\n"));
    EXPECT_FALSE(std::filesystem::exists(tree_.At("/run/vorn/vornd.sock")));
}

TEST_F(ModulesTest, ServerLoadsAModuleThatIsNamed) {
    std::filesystem::remove(good_);
    Server server(tree_, {"--module", tree_.Install("test_module", "/tmp")});
    EXPECT_EQ(server.Call("nothing").status, 200);
}

}  // namespace
}  // namespace vornd_test
