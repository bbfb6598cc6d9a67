#include "contract_test.h"

#include <signal.h>
#include <stdlib.h>
#include <sys/stat.h>
#include <sys/wait.h>
#include <unistd.h>

#include <cstring>
#include <filesystem>
#include <fstream>
#include <sstream>
#include <stdexcept>
#include <utility>

namespace contract {

namespace {

constexpr int kMarkCode = 0x5A5A;
constexpr const char* kMarkFile = "the mark of a test";
constexpr int kMarkLine = 4711;

constexpr char kGuardByte = '\x5A';

}  // namespace

ErrorMark::ErrorMark() {
    VLIBCErrSetEx(kMarkCode, kMarkFile, kMarkLine);
}

bool ErrorMark::Stands() const {
    return VLIBCErrGet() == kMarkCode && VLIBCErrorGetLine() == kMarkLine &&
           std::strcmp(VLIBCErrorGetFile(), kMarkFile) == 0;
}

GuardedBuffer::GuardedBuffer(int size) : bytes_(static_cast<std::size_t>(size) + 2 * kGuard, kGuardByte) {}

bool GuardedBuffer::IsTerminated() const {
    return std::memchr(bytes_.data() + kGuard, '\0', bytes_.size() - 2 * kGuard) != nullptr;
}

bool GuardedBuffer::GuardsStand() const {
    const std::string guard(kGuard, kGuardByte);
    return std::memcmp(bytes_.data(), guard.data(), kGuard) == 0 &&
           std::memcmp(bytes_.data() + bytes_.size() - kGuard, guard.data(), kGuard) == 0;
}

std::string GuardedBuffer::Text() const {
    return bytes_.data() + kGuard;
}

std::vector<std::string> List::Texts() const {
    std::vector<std::string> texts;
    for (int index = 0; index < list->count; ++index) {
        const char* text = VLIBCSzListGet(list, index);
        texts.emplace_back(text == nullptr ? "(null)" : text);
    }
    return texts;
}

std::string Hash::Get(const std::string& key) const {
    const char* value = VLIBCSzHashGetValue(hash, key.c_str());
    return value == nullptr ? "(null)" : value;
}

Folder::Folder() {
    const char* parent = getenv("TMPDIR");
    std::string name = std::string(parent == nullptr ? "/tmp" : parent) + "/vorn-contract-XXXXXX";
    if (mkdtemp(name.data()) == nullptr) {
        throw std::runtime_error("no temporary folder can be made at " + name);
    }
    path_ = name;
}

Folder::~Folder() {
    std::error_code ignored;
    std::filesystem::remove_all(path_, ignored);
}

std::string Folder::Put(const std::string& name, const std::string& content) const {
    const std::string path = *this / name;
    WriteFile(path, content);
    return path;
}

void WriteFile(const std::string& path, const std::string& content) {
    std::ofstream file(path, std::ios::binary);
    file << content;
    file.close();
    if (!file) {
        throw std::runtime_error(path + " can't be written");
    }
}

std::string ReadFile(const std::string& path) {
    const std::ifstream file(path, std::ios::binary);
    if (!file) {
        return "(missing)";
    }
    std::stringstream content;
    content << file.rdbuf();
    return content.str();
}

KeptFile::KeptFile(std::string path) : path_(std::move(path)) {
    struct stat found {};
    existed_ = stat(path_.c_str(), &found) == 0;
    if (existed_) {
        content_ = ReadFile(path_);
        mode_ = found.st_mode & 07777;
        owner_ = found.st_uid;
        group_ = found.st_gid;
    }
}

KeptFile::~KeptFile() {
    if (!existed_) {
        unlink(path_.c_str());
        return;
    }
    std::ofstream(path_, std::ios::binary) << content_;
    if (chown(path_.c_str(), owner_, group_) != 0 || chmod(path_.c_str(), mode_) != 0 || ReadFile(path_) != content_) {
        ADD_FAILURE() << path_ << " could not be put back";
    }
}

pid_t Fork(const std::function<bool()>& body) {
    const pid_t child = fork();
    if (child == 0) {
        _exit(body() ? 0 : 1);
    }
    return child;
}

int Await(pid_t child, std::chrono::seconds deadline) {
    int status = 0;
    const bool ended = Eventually([&] { return waitpid(child, &status, WNOHANG) == child; }, deadline);
    if (!ended) {
        kill(child, SIGKILL);
        waitpid(child, &status, 0);
        return -1;
    }
    return WIFSIGNALED(status) ? 1000 + WTERMSIG(status) : WEXITSTATUS(status);
}

void InThreads(int count, const std::function<void(int)>& work) {
    std::vector<std::thread> threads;
    for (int number = 0; number < count; ++number) {
        threads.emplace_back([&work, number] { work(number); });
    }
    for (std::thread& thread : threads) {
        thread.join();
    }
}

}  // namespace contract
