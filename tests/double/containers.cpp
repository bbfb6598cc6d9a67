// Lists and hashes of strings.

#include "tests/double/containers.h"

#include <memory>

namespace fake {

const OptionalTexts& EntriesOf(const VLIBSZLIST* list) {
    return static_cast<const List*>(list)->entries;
}

void Append(VLIBSZLIST** list, const OptionalTexts& texts) {
    ReplaceList(list);
    List* own = static_cast<List*>(*list);
    own->entries.insert(own->entries.end(), texts.begin(), texts.end());
    own->count = static_cast<int>(own->entries.size());
}

void ReplaceList(VLIBSZLIST** list) {
    if (!TheAppliance().state.listGrowthReplacesList) {
        return;
    }
    const std::unique_ptr<List> old(static_cast<List*>(*list));
    *list = new List(*old);
    TheAppliance().ReplaceHandle(old.get(), *list);
}

void ReplaceHash(VLIBSZHASH** hash, bool replace) {
    if (!replace) {
        return;
    }
    const std::unique_ptr<VLIBSZHASH> old(*hash);
    *hash = new VLIBSZHASH(*old);
    TheAppliance().ReplaceHandle(old.get(), *hash);
}

std::string ListText(const VLIBSZLIST* list) {
    if (!TheAppliance().IsLive(list, HandleKind::kList)) {
        return Named(list, "stale list");
    }
    std::string text;
    for (const OptionalText& entry : EntriesOf(list)) {
        text += (text.empty() ? "" : ", ") + (entry ? Quoted(*entry) : "null");
    }
    return "[" + text + "]";
}

std::string HashText(const VLIBSZHASH* hash) {
    if (!TheAppliance().IsLive(hash, HandleKind::kHash)) {
        return Named(hash, "stale hash");
    }
    std::string text;
    for (const auto& entry : hash->entries) {
        text += (text.empty() ? "" : ", ") + Quoted(entry.first) + ": " + Quoted(entry.second);
    }
    return "{" + text + "}";
}

bool LiveList(Recording& call, VLIBSZLIST** list) {
    return call.Live(list == nullptr ? nullptr : *list, HandleKind::kList);
}

bool LiveHash(Recording& call, VLIBSZHASH** hash) {
    return call.Live(hash == nullptr ? nullptr : *hash, HandleKind::kHash);
}

}  // namespace fake

using fake::HandleKind;
using fake::Named;
using fake::Number;
using fake::Quoted;
using fake::Recording;
using fake::TheAppliance;

VLIBSZLIST* VLIBCSzListAlloc(int capacity) {
    Recording call("VLIBCSzListAlloc", {Number(capacity)});
    if (call.Fails()) {
        return call.FailureNull();
    }
    auto* list = new fake::List;
    list->count = 0;
    TheAppliance().AddHandle(list, HandleKind::kList, call.Text());
    return list;
}

int VLIBCSzListPush(VLIBSZLIST** list, const char* text) {
    Recording call("VLIBCSzListPush", {Named(list, "list"), Quoted(text)});
    if (!fake::LiveList(call, list) || call.Null(text)) {
        return call.Failure(-1);
    }
    if (call.Fails()) {
        fake::ReplaceList(list);
        return call.Failure(-1);
    }
    fake::Append(list, {std::string(text)});
    return call.Answer(0);
}

const char* VLIBCSzListGet(const VLIBSZLIST* list, int index) {
    Recording call("VLIBCSzListGet", {Named(list, "list"), Number(index)});
    if (!call.Live(list, HandleKind::kList) || call.Fails() || index < 0 || index >= list->count) {
        return call.FailureNull();
    }
    const fake::OptionalText& entry = fake::EntriesOf(list)[static_cast<std::size_t>(index)];
    return entry ? entry->c_str() : nullptr;
}

void VLIBCSzListFree(VLIBSZLIST* list) {
    Recording call("VLIBCSzListFree", {Named(list, "list")});
    if (list != nullptr && call.Live(list, HandleKind::kList)) {
        TheAppliance().RemoveHandle(list);
        delete static_cast<fake::List*>(list);
    }
}

VLIBSZHASH* VLIBCSzHashAlloc(int capacity) {
    Recording call("VLIBCSzHashAlloc", {Number(capacity)});
    if (call.Fails()) {
        return call.FailureNull();
    }
    auto* hash = new VLIBSZHASH;
    TheAppliance().AddHandle(hash, HandleKind::kHash, call.Text());
    return hash;
}

const char* VLIBCSzHashGetValue(const VLIBSZHASH* hash, const char* key) {
    Recording call("VLIBCSzHashGetValue", {Named(hash, "hash"), Quoted(key)});
    if (!call.Live(hash, HandleKind::kHash) || call.Null(key) || call.Fails()) {
        return call.FailureNull();
    }
    const std::string* value = fake::FindKey(hash->entries, key);
    return value == nullptr ? call.FailureNull() : value->c_str();
}

int VLIBCSzHashSetValue(VLIBSZHASH** hash, const char* key, const char* value) {
    Recording call("VLIBCSzHashSetValue", {Named(hash, "hash"), Quoted(key), Quoted(value)});
    if (!fake::LiveHash(call, hash) || call.Null(key, value)) {
        return call.Failure(-1);
    }
    // Taken before the hash is replaced: the value may be one of its own texts.
    const std::string newKey = key;
    const std::string newValue = value;
    fake::ReplaceHash(hash, TheAppliance().state.hashGrowthReplacesHash);
    if (call.Fails()) {
        return call.Failure(-1);
    }
    fake::SetKey((*hash)->entries, newKey, newValue);
    return call.Answer(0);
}

int VLIBCSzHashRemoveKey(VLIBSZHASH* hash, const char* key) {
    Recording call("VLIBCSzHashRemoveKey", {Named(hash, "hash"), Quoted(key)});
    if (!call.Live(hash, HandleKind::kHash) || call.Null(key) || call.Fails()) {
        return call.Failure(-1);
    }
    fake::RemoveKey(hash->entries, key);
    return call.Answer(0);
}

void VLIBCSzHashFree(VLIBSZHASH* hash) {
    Recording call("VLIBCSzHashFree", {Named(hash, "hash")});
    if (hash != nullptr && call.Live(hash, HandleKind::kHash)) {
        TheAppliance().RemoveHandle(hash);
        delete hash;
    }
}
