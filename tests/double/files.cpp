// Files of keys and values, plain files, locks and pid files.

#include <algorithm>

#include "tests/double/containers.h"

using fake::KeyValueFile;
using fake::Number;
using fake::Quoted;
using fake::Recording;
using fake::SizeText;
using fake::State;
using fake::TheAppliance;

namespace {

// Only the key and the value may be taken up by a line's format.
bool IsLineFormat(const std::string& format) {
    int places = 0;
    for (std::size_t at = format.find('%'); at != std::string::npos; at = format.find('%', at + 2)) {
        if (format.compare(at, 2, "%s") == 0) {
            ++places;
        } else if (format.compare(at, 2, "%%") != 0) {
            return false;
        }
    }
    return places == 2;
}

const std::string* FindValue(const KeyValueFile& file, const char* key) {
    for (const auto& section : file) {
        const std::string* value = fake::FindKey(section.second, key);
        if (value != nullptr) {
            return value;
        }
    }
    return nullptr;
}

// What is locked; the rest of the word says how.
int LockOf(int word) {
    return word & ~0xFF;
}

}  // namespace

int VLIBCFileGetKeyValue(const char* path, const char* key, char* value, int size, int flags) {
    Recording call("VLIBCFileGetKeyValue", {Quoted(path), Quoted(key), SizeText(size), Number(flags)});
    if (call.BadBuffer(value, size) || call.Null(path, key)) {
        return call.Failure(-1);
    }
    if (flags != 0) {
        call.Misuse("flags must be 0");
    }
    call.Spoil(value, size);
    if (call.Fails()) {
        return call.Failure(-1);
    }
    const auto& files = TheAppliance().state.keyValueFiles;
    const auto file = files.find(path);
    if (file == files.end()) {
        return call.Failure(-1);
    }
    const std::string* found = FindValue(file->second, key);
    if (found == nullptr || found->empty()) {
        return call.Failure(0);
    }
    call.Fill(value, size, *found);
    return call.Answer(std::min(static_cast<int>(found->size()), size - 1));
}

int VLIBCFileGetSection(const char* path, const char* section, VLIBSZHASH** hash) {
    Recording call("VLIBCFileGetSection", {Quoted(path), Quoted(section), fake::Named(hash, "hash")});
    if (!fake::LiveHash(call, hash) || call.Null(path, section)) {
        return call.Failure(-1);
    }
    State& state = TheAppliance().state;
    fake::ReplaceHash(hash, state.sectionLoaderReplacesHash);
    if (call.Fails()) {
        return call.Failure(-1);
    }
    const auto file = state.keyValueFiles.find(path);
    if (file != state.keyValueFiles.end()) {
        const auto found = file->second.find(section);
        if (found != file->second.end()) {
            for (const auto& entry : found->second) {
                fake::SetKey((*hash)->entries, entry.first, entry.second);
            }
        }
    }
    return call.Answer(0);
}

int VLIBCFileAddSection(const char* path, const char* section, VLIBSZHASH* hash, const char* format) {
    Recording call("VLIBCFileAddSection", {Quoted(path), Quoted(section), fake::HashText(hash), Quoted(format)});
    if (!call.Live(hash, fake::HandleKind::kHash) || call.Null(path, section, format)) {
        return call.Failure(0);
    }
    if (!IsLineFormat(format)) {
        call.Misuse("not a line's format");
        return call.Failure(0);
    }
    if (call.Fails()) {
        return call.Failure(0);
    }
    State& state = TheAppliance().state;
    state.keyValueFiles[path][section] = hash->entries;
    state.sectionFormats[path] = format;
    return call.Answer(1);
}

int VLIBCFileRemoveKey(const char* path, const char* key) {
    Recording call("VLIBCFileRemoveKey", {Quoted(path), Quoted(key)});
    if (call.Null(path, key) || call.Fails()) {
        return call.Failure(-1);
    }
    State& state = TheAppliance().state;
    const auto file = state.keyValueFiles.find(path);
    if (file == state.keyValueFiles.end()) {
        return call.Failure(-1);
    }
    for (auto& section : file->second) {
        fake::RemoveKey(section.second, key);
    }
    return call.Answer(0);
}

int VLIBCFileITmpName(const char* path, char* name, int size) {
    Recording call("VLIBCFileITmpName", {Quoted(path), SizeText(size)});
    if (call.BadBuffer(name, size) || call.Null(path)) {
        return call.Failure(-1);
    }
    if (call.Fails()) {
        call.Spoil(name, size);
        return call.Failure(-1);
    }
    call.Fill(name, size, std::string(path) + ".tmp");
    return call.Answer(0);
}

int VLIBCFileExist(const char* path) {
    Recording call("VLIBCFileExist", {Quoted(path)});
    if (call.Null(path)) {
        return call.Answer(0);
    }
    return call.Answer(TheAppliance().state.Exists(path) ? 1 : 0);
}

int VLIBCFileTouch(const char* path) {
    Recording call("VLIBCFileTouch", {Quoted(path)});
    if (call.Null(path) || call.Fails()) {
        return call.Failure(-1);
    }
    State& state = TheAppliance().state;
    if (!state.Exists(path)) {
        state.files.insert(path);
    }
    return call.Answer(0);
}

int VLIBCFileLock(int word, int seconds) {
    Recording call("VLIBCFileLock", {Number(word), Number(seconds)});
    // An injected 0 says that the lock is held.
    if (call.Fails() && call.Answer(-1) != 0) {
        return call.Failure(-1);
    }
    return TheAppliance().state.heldLocks.insert(LockOf(word)).second ? call.Answer(0) : call.Failure(1);
}

int VLIBCFileUnlock(int word) {
    Recording call("VLIBCFileUnlock", {Number(word)});
    if (TheAppliance().state.heldLocks.count(LockOf(word)) == 0) {
        call.Misuse("the lock isn't held");
        return call.Failure(-1);
    }
    if (call.Fails()) {
        return call.Failure(-1);
    }
    TheAppliance().state.heldLocks.erase(LockOf(word));
    return call.Answer(0);
}

int VLIBCSysRename(const char* from, const char* to) {
    Recording call("VLIBCSysRename", {Quoted(from), Quoted(to)});
    if (call.Null(from, to) || call.Fails()) {
        return call.Failure(-1);
    }
    return TheAppliance().state.Rename(from, to) ? call.Answer(0) : call.Failure(-1);
}

int VLIBCSysRemove(const char* path) {
    Recording call("VLIBCSysRemove", {Quoted(path)});
    if (call.Null(path) || call.Fails()) {
        return call.Failure(-1);
    }
    return TheAppliance().state.Remove(path) ? call.Answer(0) : call.Failure(-1);
}

int VLIBCReadPidFile(const char* path) {
    Recording call("VLIBCReadPidFile", {Quoted(path)});
    if (call.Null(path) || call.Fails()) {
        return call.Failure(-1);
    }
    const auto& pidFiles = TheAppliance().state.pidFiles;
    const auto found = pidFiles.find(path);
    return found == pidFiles.end() || found->second < 0 ? call.Failure(-1) : call.Answer(found->second);
}
