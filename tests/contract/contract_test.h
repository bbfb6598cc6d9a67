// What the contract's tests share. Nothing here or in the tests knows of more than the headers of platform/.

#ifndef VORN_TESTS_CONTRACT_CONTRACT_TEST_H
#define VORN_TESTS_CONTRACT_CONTRACT_TEST_H

#include <gtest/gtest.h>
#include <sys/types.h>

#include <chrono>
#include <functional>
#include <string>
#include <thread>
#include <vector>

#include "platform/core.h"

namespace contract {

// ---- The last error ----

// A last error that no operation sets by itself.
class ErrorMark {
public:
    ErrorMark();
    bool Stands() const;
};

// The result of a call that has to fail or to succeed, as far as the last error tells.
template <typename Call>
auto Failing(const char* file, int line, const char* what, Call call) {
    const ErrorMark mark;
    const auto result = call();
    if (mark.Stands()) {
        ADD_FAILURE_AT(file, line) << what << " failed without setting the last error, or did not fail";
    }
    return result;
}

template <typename Call>
auto Succeeding(const char* file, int line, const char* what, Call call) {
    const ErrorMark mark;
    const auto result = call();
    if (!mark.Stands()) {
        ADD_FAILURE_AT(file, line) << what << " set the last error to " << VLIBCErrGet() << " at "
                                   << VLIBCErrorGetFile() << ":" << VLIBCErrorGetLine();
    }
    return result;
}

#define FAILING(call) contract::Failing(__FILE__, __LINE__, #call, [&] { return call; })
#define SUCCEEDING(call) contract::Succeeding(__FILE__, __LINE__, #call, [&] { return call; })

// ---- Buffers ----

// A buffer of `size` bytes with more on both sides that nobody may write.
class GuardedBuffer {
public:
    explicit GuardedBuffer(int size);
    char* data() {
        return bytes_.data() + kGuard;
    }
    int size() const {
        return static_cast<int>(bytes_.size() - 2 * kGuard);
    }
    bool IsTerminated() const;
    bool GuardsStand() const;
    // Only for a terminated one.
    std::string Text() const;

private:
    static constexpr std::size_t kGuard = 64;
    std::vector<char> bytes_;
};

// ---- Lists and hashes, freed at their end ----

struct List {
    explicit List(int capacity = 16) : list(VLIBCSzListAlloc(capacity)) {}
    ~List() {
        VLIBCSzListFree(list);
    }
    List(const List&) = delete;
    List& operator=(const List&) = delete;

    // The entries; a null one is "(null)".
    std::vector<std::string> Texts() const;
    bool Push(const std::string& text) {
        return VLIBCSzListPush(&list, text.c_str()) >= 0;
    }

    VLIBSZLIST* list;
};

struct Hash {
    explicit Hash(int capacity = 16) : hash(VLIBCSzHashAlloc(capacity)) {}
    ~Hash() {
        VLIBCSzHashFree(hash);
    }
    Hash(const Hash&) = delete;
    Hash& operator=(const Hash&) = delete;

    // The value of a key, or "(null)".
    std::string Get(const std::string& key) const;
    bool Set(const std::string& key, const std::string& value) {
        return VLIBCSzHashSetValue(&hash, key.c_str(), value.c_str()) >= 0;
    }

    VLIBSZHASH* hash;
};

// ---- Files ----

// A folder for one test, removed at its end.
class Folder {
public:
    Folder();
    ~Folder();
    Folder(const Folder&) = delete;
    Folder& operator=(const Folder&) = delete;

    std::string operator/(const std::string& name) const {
        return path_ + "/" + name;
    }
    std::string Put(const std::string& name, const std::string& content) const;

private:
    std::string path_;
};

void WriteFile(const std::string& path, const std::string& content);
std::string ReadFile(const std::string& path);  // "(missing)" when there is none

// A file of the machine as it was, put back at the end with its mode and owner.
class KeptFile {
public:
    explicit KeptFile(std::string path);
    ~KeptFile();
    KeptFile(const KeptFile&) = delete;
    KeptFile& operator=(const KeptFile&) = delete;

    const std::string& path() const {
        return path_;
    }
    bool existed() const {
        return existed_;
    }

private:
    std::string path_;
    std::string content_;
    mode_t mode_ = 0;
    uid_t owner_ = 0;
    gid_t group_ = 0;
    bool existed_ = false;
};

// ---- Processes, threads and time ----

// Runs `body` in a child process, which ends with 0 when it answers true.
pid_t Fork(const std::function<bool()>& body);
// The child's exit code; 1000 + N for signal N; -1 when it does not end in time and is killed.
int Await(pid_t child, std::chrono::seconds deadline = std::chrono::seconds(30));

// Asks again and again until `condition` holds; false when it does not in time.
template <typename Condition>
bool Eventually(Condition condition, std::chrono::milliseconds deadline = std::chrono::seconds(20)) {
    const auto end = std::chrono::steady_clock::now() + deadline;
    while (!condition()) {
        if (std::chrono::steady_clock::now() >= end) {
            return false;
        }
        std::this_thread::sleep_for(std::chrono::milliseconds(5));
    }
    return true;
}

// Runs `work` in `count` threads at once, each with its number.
void InThreads(int count, const std::function<void(int)>& work);

}  // namespace contract

#endif
