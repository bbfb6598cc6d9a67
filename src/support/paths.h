// The files of the appliance that the module reads, writes or removes.

#ifndef VORN_SRC_SUPPORT_PATHS_H
#define VORN_SRC_SUPPORT_PATHS_H

constexpr const char* kSmbConf = "/usr/vorn/etc/smb.conf";            // file-sharing service: main configuration
constexpr const char* kSmbInfoConf = "/usr/vorn/etc/smbinfo.conf";    // file-sharing service: domain information
constexpr const char* kSystemSettings = "/etc/vorninfo.conf";         // settings of the whole appliance
constexpr const char* kJoinStatus = "/var/log/winlock.state";         // what the join tool has to say
constexpr const char* kDnsQuery = "/usr/vorn/etc/private/dns_query";  // output of the DNS name check
constexpr const char* kUpdatingMarker = "/tmp/domain_updating";       // there while a refresh runs
constexpr const char* kUserFetchPid = "/tmp/domain_user.pid";         // the platform's own fetch of users
constexpr const char* kGroupFetchPid = "/tmp/domain_group.pid";       // the platform's own fetch of groups

constexpr const char* kGlobalSection = "global";

#endif
