// What rpcclient's "querydispinfo" prints of users and groups, and "enumalsgroups" of groups.

#ifndef VORN_APPLIANCE_DOMAIN_DIRECTORY_RPC_PARSER_H
#define VORN_APPLIANCE_DOMAIN_DIRECTORY_RPC_PARSER_H

#include <cstdint>
#include <optional>
#include <string>

namespace appliance {

struct RpcAccount {
    std::uint32_t rid = 0;
    std::string name;
    std::string display;
};

// Takes the lines one after the other. Throws DirectoryError when the program reports a failure, and when the numbers
// of the lines do not follow each other: then a line is missing, or a description with a line feed in it pretends to be
// one.
class RpcParser {
public:
    // The account that the line holds; nothing when it holds none.
    std::optional<RpcAccount> Take(const std::string& line);

    // Lines that hold an account whose parts can't be told apart.
    std::int64_t damaged() const {
        return damaged_;
    }

private:
    std::optional<RpcAccount> TakeAlias(const std::string& line);

    std::uint32_t index_ = 0;
    bool inAliases_ = false;
    std::int64_t damaged_ = 0;
};

}  // namespace appliance

#endif
