// The status that the join tool leaves behind: why the last join failed, as the web-API modules read it.

#ifndef VORN_APPLIANCE_DOMAIN_JOIN_JOIN_STATUS_H
#define VORN_APPLIANCE_DOMAIN_JOIN_JOIN_STATUS_H

#include <stdexcept>
#include <string>
#include <system_error>

namespace appliance {

// `key` names the step that failed, at most kStatusKeyLength bytes; `message` is one line of at most
// kStatusMessageLength bytes.
struct JoinStatus {
    std::string key;
    std::string message;
};
inline constexpr std::size_t kStatusKeyLength = 23;
inline constexpr std::size_t kStatusMessageLength = 511;

// A status as it may be stored: control bytes become blanks, both texts are cut to their lengths (never within a UTF-8
// character).
JoinStatus CleanStatus(const JoinStatus& status);

// Writes the status file (key, a tab, message; 0600), and reads it. ENOENT when there is none.
std::error_code WriteJoinStatus(const JoinStatus& status);
std::error_code ReadJoinStatus(JoinStatus& status);

// The texts that the classification of failures knows.
namespace status {
inline constexpr char kSystem[] = "Error System.";
inline constexpr char kKdc[] = "Invalid KDC ip.";
inline constexpr char kWorkgroup[] = "Invalid workgroup name.";
inline constexpr char kNoController[] = "Neither LDAP server nor PDC can be found.";
inline constexpr char kPort445[] = "445/tcp is unreachable for DC. Please check the network and firewall settings.";
inline constexpr char kWinbind[] = "Wbinfo fail. It might be domain name error.";
inline constexpr char kWrongPassword[] = "Preauthentication failed while getting initial credentials";
inline constexpr char kUnknownAccount[] = "Client not found in Kerberos database while getting initial credentials";
inline constexpr char kRevoked[] = "Clients credentials have been revoked while getting initial credentials";
inline constexpr char kDisabled[] = "The account was disabled.";
inline constexpr char kWrongNameOrPassword[] = "The username or password was not correct.";
inline constexpr char kExpired[] = "Password has expired while getting initial credentials";
inline constexpr char kNoRight[] = "ads_join_realm: Insufficient access";
inline constexpr char kUnableToJoin[] = "Unable to join domain";
inline constexpr char kNoConnection[] = "Could not connect to server";
inline constexpr char kNoWorkgroup[] = "Can't get domain workgroup.";
}  // namespace status

// Ends a job: thrown by the step that fails, with what the status file is to say.
class JoinError : public std::runtime_error {
public:
    explicit JoinError(const std::string& message, const std::string& why = {})
        : std::runtime_error(message), detail(why) {}

    // More about it for the list of steps and the log; may be empty.
    const std::string detail;
};

}  // namespace appliance

#endif
