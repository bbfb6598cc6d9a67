#include <arpa/inet.h>
#include <sys/stat.h>
#include <unistd.h>

#include <algorithm>
#include <cctype>
#include <chrono>
#include <cstdio>
#include <fstream>
#include <sstream>
#include <string>
#include <thread>

#include "platform/core.h"
#include "wrong.h"

namespace {

constexpr int kWrongCode = 1;

int sharedCode = 0;
const char* sharedFile = "";
int sharedLine = 0;

// Keys that differ in case become keys that differ.
std::string WithCase(const char* key) {
    std::string told;
    for (const char* letter = key; *letter != '\0'; ++letter) {
        told += std::isupper(static_cast<unsigned char>(*letter)) != 0 ? std::string("^") + *letter
                                                                       : std::string(1, *letter);
    }
    return told;
}

std::string ContentOf(const char* path) {
    std::stringstream content;
    content << std::ifstream(path, std::ios::binary).rdbuf();
    return content.str();
}

void CopyInTwoSteps(const char* from, const char* to) {
    const std::string content = ContentOf(from);
    std::ofstream file(to, std::ios::binary);
    file.flush();
    std::this_thread::sleep_for(std::chrono::milliseconds(2));
    file << content;
}

}  // namespace

extern "C" {

int VLIBCSzListPush(VLIBSZLIST** list, const char* text) {
    if (IsWrong("list has a fixed capacity") && (*list)->count >= 1024) {
        return -1;
    }
    if (IsWrong("list leaves empty texts out") && *text == '\0') {
        return 0;
    }
    return REAL(VLIBCSzListPush)(list, text);
}

const char* VLIBCSzListGet(const VLIBSZLIST* list, int index) {
    const bool outside = index < 0 || index >= list->count;
    if (IsWrong("list answers beyond its end") && outside) {
        return "";
    }
    if (IsWrong("failure without last error") && outside) {
        return nullptr;
    }
    return REAL(VLIBCSzListGet)(list, index);
}

const char* VLIBCSzHashGetValue(const VLIBSZHASH* hash, const char* key) {
    const char* value = REAL(VLIBCSzHashGetValue)(hash, IsWrong("hash tells case apart") ? WithCase(key).c_str() : key);
    return IsWrong("hash answers empty for missing") && value == nullptr ? "" : value;
}

int VLIBCSzHashSetValue(VLIBSZHASH** hash, const char* key, const char* value) {
    const std::string told = IsWrong("hash tells case apart") ? WithCase(key) : std::string(key);
    std::string stored = value;
    if (IsWrong("hash folds values")) {
        std::transform(stored.begin(), stored.end(), stored.begin(),
                       [](unsigned char letter) { return static_cast<char>(std::tolower(letter)); });
    }
    if (IsWrong("hash cuts values")) {
        stored = stored.substr(0, 255);
    }
    if (IsWrong("success sets last error")) {
        VLIBCErrSetEx(kWrongCode, "wrong", 1);
    }
    return REAL(VLIBCSzHashSetValue)(hash, told.c_str(), stored.c_str());
}

int VLIBCSzHashRemoveKey(VLIBSZHASH* hash, const char* key) {
    const std::string told = IsWrong("hash tells case apart") ? WithCase(key) : std::string(key);
    if (IsWrong("hash fails to remove missing") && REAL(VLIBCSzHashGetValue)(hash, told.c_str()) == nullptr) {
        return -1;
    }
    return IsWrong("hash removes nothing") ? 0 : REAL(VLIBCSzHashRemoveKey)(hash, told.c_str());
}

int VLIBCFileGetKeyValue(const char* path, const char* key, char* value, int size, int flags) {
    const int result = REAL(VLIBCFileGetKeyValue)(path, key, value, size, flags);
    if (IsWrong("key reader does not terminate") && result == size - 1) {
        value[size - 1] = 'x';
    }
    if (IsWrong("key reader overruns") && result == size - 1) {
        value[size] = '\0';
    }
    if (IsWrong("key reader keeps blanks") && result > 0 && result < size - 1) {
        std::memmove(value + 1, value, static_cast<std::size_t>(result) + 1);
        value[0] = ' ';
        return result + 1;
    }
    return IsWrong("key reader finds the missing") && result == 0 ? 1 : result;
}

int VLIBCFileGetSection(const char* path, const char* section, VLIBSZHASH** hash) {
    if (IsWrong("section loader reads all sections")) {
        REAL(VLIBCFileGetSection)(path, "other", hash);
    }
    if (IsWrong("section loader empties the hash")) {
        VLIBCSzHashFree(*hash);
        *hash = VLIBCSzHashAlloc(1);
    }
    return REAL(VLIBCFileGetSection)(path, section, hash);
}

int VLIBCFileAddSection(const char* path, const char* section, VLIBSZHASH* hash, const char* format) {
    const char* used = IsWrong("section writer has its own format") ? "%s = %s\n" : format;
    const int result = REAL(VLIBCFileAddSection)(path, section, hash, used);
    return IsWrong("section writer fails with -1") && result == 0 ? -1 : result;
}

int VLIBCFileRemoveKey(const char* path, const char* key) {
    if (IsWrong("key remover makes files")) {
        std::ofstream(path, std::ios::app).flush();
    }
    return IsWrong("key remover removes nothing") ? 0 : REAL(VLIBCFileRemoveKey)(path, key);
}

int VLIBCFileITmpName(const char* path, char* name, int size) {
    const std::string beside = std::string(path) + "." + std::to_string(getpid());
    if (IsWrong("temporary name is the process's")) {
        return std::snprintf(name, static_cast<std::size_t>(size), "%s", beside.c_str()) < size ? 0 : -1;
    }
    if (IsWrong("temporary name lies elsewhere")) {
        return std::snprintf(name, static_cast<std::size_t>(size), "/tmp/%d", getpid()) < size ? 0 : -1;
    }
    return REAL(VLIBCFileITmpName)(path, name, size);
}

int VLIBCFileExist(const char* path) {
    struct stat found {};
    if (IsWrong("folder does not exist")) {
        return stat(path, &found) == 0 && S_ISREG(found.st_mode) ? 1 : 0;
    }
    return REAL(VLIBCFileExist)(path);
}

int VLIBCFileTouch(const char* path) {
    if (IsWrong("touch empties")) {
        std::ofstream(path).flush();
    }
    if (IsWrong("touch leaves the time") && access(path, F_OK) == 0) {
        return 0;
    }
    return REAL(VLIBCFileTouch)(path);
}

int VLIBCSysRename(const char* from, const char* to) {
    if (IsWrong("rename copies")) {
        CopyInTwoSteps(from, to);
        return unlink(from);
    }
    const int result = REAL(VLIBCSysRename)(from, to);
    if (IsWrong("rename closes the file") && result == 0) {
        static_cast<void>(chmod(to, 0600));
    }
    return IsWrong("rename never fails") ? 0 : result;
}

int VLIBCSysRemove(const char* path) {
    const int result = REAL(VLIBCSysRemove)(path);
    return IsWrong("remove never fails") ? 0 : result;
}

int VLIBCReadPidFile(const char* path) {
    const int pid = std::atoi(ContentOf(path).c_str());
    if (IsWrong("pid file of a dead process counts")) {
        return pid > 0 ? pid : REAL(VLIBCReadPidFile)(path);
    }
    return IsWrong("pid file of nothing is 0") && pid == 0 ? 0 : REAL(VLIBCReadPidFile)(path);
}

int VLIBCErrGet(void) {
    return IsWrong("last error is everybody's") ? sharedCode : REAL(VLIBCErrGet)();
}

const char* VLIBCErrorGetFile(void) {
    return IsWrong("last error is everybody's") ? sharedFile : REAL(VLIBCErrorGetFile)();
}

int VLIBCErrorGetLine(void) {
    return IsWrong("last error is everybody's") ? sharedLine : REAL(VLIBCErrorGetLine)();
}

void VLIBCErrSetEx(int code, const char* file, int line) {
    sharedCode = code;
    sharedFile = file;
    sharedLine = line;
    REAL(VLIBCErrSetEx)(code, file, line);
}

int BlVLIBIsIpAddr(const char* text) {
    in_addr address{};
    return IsWrong("any number is an address") ? inet_aton(text, &address) : REAL(BlVLIBIsIpAddr)(text);
}

int BlVLIBIsv6IpAddrValid(const char* text) {
    const std::string whole(text);
    const bool scoped = IsWrong("scopes belong to addresses");
    return REAL(BlVLIBIsv6IpAddrValid)(scoped ? whole.substr(0, whole.find('%')).c_str() : text);
}

int VLIBCSupportGet(const char* capability) {
    return IsWrong("everything is supported") ? 1 : REAL(VLIBCSupportGet)(capability);
}

}  // extern "C"
