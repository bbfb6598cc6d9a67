// What the appliance handed out and has not got back, and what was used against its declaration.

#ifndef VORN_TESTS_DOUBLE_HANDLES_H
#define VORN_TESTS_DOUBLE_HANDLES_H

#include <cstddef>
#include <map>
#include <string>
#include <vector>

namespace fake {

enum class HandleKind { kList, kHash, kTask, kTaskList, kPolling, kConf, kCopy };

const char* NameOf(HandleKind kind);

class Handles {
public:
    // Lists, hashes, task records, task lists, polling objects, VornConf objects and copies of strdup.
    int LiveHandles() const;
    // "list from VLIBCSzListAlloc(4); copy from strdup("x")", for a test's message.
    std::string LiveHandleNames() const;
    const std::vector<std::string>& Misuses() const;

    void AddHandle(const void* handle, HandleKind kind, const std::string& origin, std::size_t size = 0);
    bool IsLive(const void* handle, HandleKind kind) const;
    std::size_t SizeOf(const void* handle) const;
    void RemoveHandle(const void* handle);
    void ReplaceHandle(const void* from, const void* to);
    void AddMisuse(const std::string& text);

protected:
    void ResetHandles();

private:
    struct Handle {
        HandleKind kind;
        std::string origin;
        std::size_t size;
    };

    std::map<const void*, Handle> live;
    std::vector<std::string> misuses;
};

}  // namespace fake

#endif
