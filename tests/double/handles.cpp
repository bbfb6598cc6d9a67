#include "tests/double/handles.h"

#include <utility>

namespace fake {

const char* NameOf(HandleKind kind) {
    switch (kind) {
        case HandleKind::kList:
            return "list";
        case HandleKind::kHash:
            return "hash";
        case HandleKind::kTask:
            return "task";
        case HandleKind::kTaskList:
            return "task list";
        case HandleKind::kPolling:
            return "polling object";
        case HandleKind::kConf:
            return "conf";
        case HandleKind::kCopy:
            break;
    }
    return "copy";
}

int Handles::LiveHandles() const {
    return static_cast<int>(live.size());
}

std::string Handles::LiveHandleNames() const {
    std::string names;
    for (const auto& entry : live) {
        names += names.empty() ? "" : "; ";
        names += NameOf(entry.second.kind);
        names += " from " + entry.second.origin;
    }
    return names;
}

const std::vector<std::string>& Handles::Misuses() const {
    return misuses;
}

void Handles::AddHandle(const void* handle, HandleKind kind, const std::string& origin, std::size_t size) {
    live[handle] = Handle{kind, origin, size};
}

bool Handles::IsLive(const void* handle, HandleKind kind) const {
    const auto found = live.find(handle);
    return found != live.end() && found->second.kind == kind;
}

std::size_t Handles::SizeOf(const void* handle) const {
    const auto found = live.find(handle);
    return found == live.end() ? 0 : found->second.size;
}

void Handles::RemoveHandle(const void* handle) {
    live.erase(handle);
}

void Handles::ReplaceHandle(const void* from, const void* to) {
    const auto found = live.find(from);
    if (found != live.end()) {
        Handle handle = std::move(found->second);
        live.erase(found);
        live[to] = std::move(handle);
    }
}

void Handles::AddMisuse(const std::string& text) {
    misuses.push_back(text);
}

void Handles::ResetHandles() {
    live.clear();
    misuses.clear();
}

}  // namespace fake
