// What the tests share that change the machine. They run on one that is in a workgroup, and put back what they change.

#ifndef VORN_TESTS_CONTRACT_MACHINE_TEST_H
#define VORN_TESTS_CONTRACT_MACHINE_TEST_H

#include "contract_test.h"

namespace contract {

// Files that the module names itself, so they are where it looks for them on every appliance.
inline constexpr const char* kSettings = "/etc/vorninfo.conf";
inline constexpr const char* kSmbConf = "/usr/vorn/etc/smb.conf";
inline constexpr const char* kJoinStatus = "/var/log/winlock.state";

// The lock on the settings: how it is asked for, and how it is given back.
inline constexpr int kLock = 0x806;
inline constexpr int kUnlock = 0x800;

}  // namespace contract

#endif
