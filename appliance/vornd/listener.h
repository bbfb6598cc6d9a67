// The server's socket in the file system.

#ifndef VORN_APPLIANCE_VORND_LISTENER_H
#define VORN_APPLIANCE_VORND_LISTENER_H

#include <string>

#include "appliance/base/file.h"
#include "appliance/base/file_lock.h"

namespace appliance {

// Holds the place of one server: nobody else listens on this path meanwhile. The lock's file stays.
struct Listener {
    FileLock lock;
    FileDescriptor socket;  // listening, non-blocking
};

// Takes the lock beside `path` (PATH.lock) and listens there; a socket that a killed server left is replaced. Anybody
// may connect: what a peer may do is decided by who it is. Throws StartError.
Listener Listen(const std::string& path);

}  // namespace appliance

#endif
