#include "tests/appliance/system/system_test.h"

#include <sys/stat.h>
#include <sys/wait.h>
#include <unistd.h>

#include <filesystem>
#include <fstream>
#include <sstream>

#include "appliance/base/paths.h"

namespace system_test {

SystemTest::SystemTest() {
    char folder[] = "/tmp/vorn-system-XXXXXX";
    root = mkdtemp(folder);
    for (const char* name : {"/etc/cron.d", "/usr/vorn/etc", "/var/lib", "/run"}) {
        std::filesystem::create_directories(root + name);
    }
    appliance::SetRoot(root);
}

SystemTest::~SystemTest() {
    appliance::SetRoot("");
    std::filesystem::remove_all(root);
}

std::optional<std::string> SystemTest::Content(const std::string& path) const {
    std::ifstream file(At(path), std::ios::binary);
    if (!file) {
        return std::nullopt;
    }
    std::ostringstream content;
    content << file.rdbuf();
    return content.str();
}

void SystemTest::Put(const std::string& path, const std::string& content, mode_t mode) const {
    std::filesystem::create_directories(std::filesystem::path(At(path)).parent_path());
    std::ofstream(At(path), std::ios::binary) << content;
    ASSERT_EQ(chmod(At(path).c_str(), mode), 0) << path;
}

pid_t StartChild(const std::function<void()>& body) {
    const pid_t child = fork();
    if (child == 0) {
        body();
        _exit(0);
    }
    return child;
}

int EndOf(pid_t child) {
    int status = 0;
    if (waitpid(child, &status, 0) != child) {
        return -1;
    }
    return WIFEXITED(status) ? WEXITSTATUS(status) : -1;
}

}  // namespace system_test
