// Appliances that scenarios begin with.

#ifndef VORN_TESTS_FAULTS_APPLIANCES_H
#define VORN_TESTS_FAULTS_APPLIANCES_H

#include <json/value.h>

#include <string>
#include <vector>

#include "tests/double/state.h"

namespace sweep {

constexpr const char* kSmbConf = "/usr/vorn/etc/smb.conf";
constexpr const char* kSmbInfo = "/usr/vorn/etc/smbinfo.conf";
constexpr const char* kSettings = "/etc/vorninfo.conf";
constexpr const char* kJoinStatus = "/var/log/winlock.state";
constexpr const char* kMarker = "/tmp/domain_updating";
constexpr const char* kUserPid = "/tmp/domain_user.pid";
constexpr const char* kGroupPid = "/tmp/domain_group.pid";

// A JSON text as a value. Throws std::invalid_argument when it is none.
Json::Value FromJson(const std::string& text);

// In the workgroup "WORKGROUP", with DNS servers, a domain-information file and a join tool that says "Invalid KDC ip.".
fake::State Workgroup();

// A member of the Active Directory domain "LAB" with all advanced options and two trusted domains.
fake::State Member();

// A part of the calls' arguments: a text in quotation marks.
std::string Quoted(const std::string& text);

// A file's section "global".
fake::Section& Global(fake::State& state, const std::string& path);
const std::string* FindGlobal(const fake::State& state, const std::string& path, const std::string& key);

}  // namespace sweep

#endif
