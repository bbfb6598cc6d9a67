// The core library: lists, hashes, files, services, capabilities, the last error, address tests.
// See conventions.h for the rules that hold for every declaration.

#ifndef VORN_PLATFORM_CORE_H
#define VORN_PLATFORM_CORE_H

#include "platform/conventions.h"

extern "C" {

// ---- Lists of strings ----

// A list of strings. `count` entries are in use; an entry may be null. What else the list holds is the platform's.
struct VLIBSZLIST {
    int count;
};

// A new, empty list with room for `capacity` entries.
// Failure: null.
struct VLIBSZLIST* VLIBCSzListAlloc(int capacity);

// Appends a copy of `text`; may replace the list.
// Failure: -1.
int VLIBCSzListPush(struct VLIBSZLIST** list, const char* text);

// The entry at `index` (0 to count - 1), or null when it is null or out of range.
// Failure: null.
const char* VLIBCSzListGet(const struct VLIBSZLIST* list, int index);

// Frees the list with its entries.
// Failure: none.
void VLIBCSzListFree(struct VLIBSZLIST* list);

// ---- Hashes of strings ----

// A hash from string to string. Keys are told apart as the file-sharing service does: without regard to case.
struct VLIBSZHASH;

// A new, empty hash with room for `capacity` keys.
// Failure: null.
struct VLIBSZHASH* VLIBCSzHashAlloc(int capacity);

// The value of a key, or null when the hash does not hold it.
// Failure: null.
const char* VLIBCSzHashGetValue(const struct VLIBSZHASH* hash, const char* key);

// Sets a key to a copy of `value`; may replace the hash.
// Failure: -1.
int VLIBCSzHashSetValue(struct VLIBSZHASH** hash, const char* key, const char* value);

// Removes a key; a missing one is no failure.
// Failure: -1.
int VLIBCSzHashRemoveKey(struct VLIBSZHASH* hash, const char* key);

// Frees the hash with its content.
// Failure: none.
void VLIBCSzHashFree(struct VLIBSZHASH* hash);

// ---- Files of keys and values ----

// Fills `value` (`size` bytes) with the value of a key of a configuration file. Returns its length; 0 when the key is
// absent or empty. `flags` is 0.
// Failure: 0, -1.
int VLIBCFileGetKeyValue(const char* path, const char* key, char* value, int size, int flags);

// Loads the keys of a section into the hash; may replace it. A missing file or section loads nothing.
// Failure: -1.
int VLIBCFileGetSection(const char* path, const char* section, struct VLIBSZHASH** hash);

// Writes a section to a file, made when it is missing, each entry with the line format `format`, whose two %s take the
// key and the value. Returns 0 when nothing could be written; any other result counts as written.
// Failure: 0.
int VLIBCFileAddSection(const char* path, const char* section, struct VLIBSZHASH* hash, const char* format);

// Removes a key from a configuration file.
// Failure: -1.
int VLIBCFileRemoveKey(const char* path, const char* key);

// Fills `name` (`size` bytes) with the name of a temporary file beside `path`, so that a rename replaces `path` in one
// step.
// Failure: -1.
int VLIBCFileITmpName(const char* path, char* name, int size);

// Non-zero when the file exists.
// Failure: none.
int VLIBCFileExist(const char* path);

// Makes an empty file, or sets the times of the one that is there.
// Failure: -1.
int VLIBCFileTouch(const char* path);

// Takes the lock that `word` names in the bits above its lowest byte, in the way that the lowest byte asks for, waiting
// up to `seconds`. 0 when the lock is held.
// Failure: -1, 1.
int VLIBCFileLock(int word, int seconds);

// Gives the lock that `word` names back; the lowest byte does not count.
// Failure: -1.
int VLIBCFileUnlock(int word);

// Renames a file, replacing the target. 0 when done.
// Failure: -1, 1.
int VLIBCSysRename(const char* from, const char* to);

// Removes a file.
// Failure: -1.
int VLIBCSysRemove(const char* path);

// The pid of the live process that a pid file names.
// Failure: -1.
int VLIBCReadPidFile(const char* path);

// ---- Services and capabilities ----

// Reloads or restarts a service by its name.
// Failure: -1.
int VLIBServiceReload(const char* service);
int VLIBServiceRestart(const char* service);

// Reloads all services of a type.
// Failure: -1.
int VLIBServiceTypeReload(int type);

// 1 when the service is enabled.
// Failure: 0, -1.
int VLIBServiceIsEnabled(const char* service);

// Non-zero when this model of the appliance supports `capability`.
// Failure: 0.
int VLIBCSupportGet(const char* capability);

// ---- Last error of the calling thread ----

// Code, source file and line of the last failure. The file's name is a constant of the platform, never null.
// Failure: none.
int VLIBCErrGet(void);
const char* VLIBCErrorGetFile(void);
int VLIBCErrorGetLine(void);

// Sets the last error. `file` must be a constant: the pointer is kept.
// Failure: none.
void VLIBCErrSetEx(int code, const char* file, int line);

// ---- Addresses ----

// 1 when `text` is an IPv4 address (dotted decimal), or a valid IPv6 address.
// Failure: none.
int BlVLIBIsIpAddr(const char* text);
int BlVLIBIsv6IpAddrValid(const char* text);

}  // extern "C"

#endif
