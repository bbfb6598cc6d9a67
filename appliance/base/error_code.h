// What the platform's operations leave as the calling thread's last error.

#ifndef VORN_APPLIANCE_BASE_ERROR_CODE_H
#define VORN_APPLIANCE_BASE_ERROR_CODE_H

namespace appliance {

// The numbers are the platform's own and stay as they are: they stand in logs.
enum class ErrorCode : int {
    OutOfMemory = 0x0100,
    NotFound = 0x0200,       // a file, a key, a record, a domain
    FileRead = 0x0300,       // unreadable or broken
    FileWrite = 0x0400,      // full, read-only, forbidden
    FileLock = 0x0500,       // held by another beyond the wait
    CommandFailed = 0x0600,  // a program that ended badly or could not be started
    TimedOut = 0x0700,
    Database = 0x0800,
    NotMember = 0x0900,    // needs a membership, and there is none
    Unreachable = 0x0A00,  // no domain controller answers
    Refused = 0x0B00,      // a domain controller said no
    BadData = 0x0C00,      // control bytes, or an answer that can't be right
    BadArgument = 0x0D00,
    Internal = 0x0E00,
};

}  // namespace appliance

#endif
