#include "appliance/domain/directory/rpc_parser.h"

#include <charconv>
#include <string_view>

#include "appliance/base/text.h"
#include "appliance/domain/directory/utf8.h"
#include "appliance/domain/directory/worker.h"

namespace appliance {

namespace {

// Takes `head` off the front of `text`; false when the text begins with something else.
bool Skip(std::string_view& text, std::string_view head) {
    if (!StartsWith(text, head)) {
        return false;
    }
    text.remove_prefix(head.size());
    return true;
}

bool SkipHex(std::string_view& text, std::uint32_t& number) {
    if (!Skip(text, "0x")) {
        return false;
    }
    const auto [end, error] = std::from_chars(text.data(), text.data() + text.size(), number, 16);
    text.remove_prefix(static_cast<std::size_t>(end - text.data()));
    return error == std::errc();
}

}  // namespace

// "group:[DnsAdmins] rid:[0x44d]"
std::optional<RpcAccount> RpcParser::TakeAlias(const std::string& line) {
    constexpr std::string_view kHead = "group:[";
    constexpr std::string_view kMiddle = "] rid:[";
    inAliases_ = true;
    const std::size_t middle = line.rfind(kMiddle);
    RpcAccount account;
    if (middle == std::string::npos || middle < kHead.size()) {
        ++damaged_;
        return std::nullopt;
    }
    std::string_view rest = std::string_view(line).substr(middle + kMiddle.size());
    if (!SkipHex(rest, account.rid) || rest != "]") {
        ++damaged_;
        return std::nullopt;
    }
    account.name = line.substr(kHead.size(), middle - kHead.size());
    return account;
}

// Users:  "index: 0x1 RID: 0x1f4 acb: 0x00000010 Account: alice\tName: Alice\tDesc: text"
// Groups: "index: 0x1 RID: 0x201 acb: 0x00000007 Account: Domain Users\tDesc: text"
std::optional<RpcAccount> RpcParser::Take(const std::string& line) {
    std::string_view rest = line;
    if (StartsWith(rest, "result was NT_STATUS_") || StartsWith(rest, "Cannot connect to server")) {
        throw DirectoryError(ErrorCode::Refused, CleanText(line));
    }
    if (StartsWith(rest, "group:[")) {
        return TakeAlias(line);
    }
    if (!Skip(rest, "index: ")) {
        return std::nullopt;
    }
    if (inAliases_) {
        throw DirectoryError(ErrorCode::BadData, "the list goes on after its end");
    }
    std::uint32_t index = 0;
    if (!SkipHex(rest, index) || index != index_ + 1) {
        throw DirectoryError(ErrorCode::BadData, "the list has a gap after line " + std::to_string(index_));
    }
    index_ = index;
    RpcAccount account;
    std::uint32_t flags = 0;
    if (!Skip(rest, " RID: ") || !SkipHex(rest, account.rid) || !Skip(rest, " acb: ") || !SkipHex(rest, flags) ||
        !Skip(rest, " Account: ")) {
        ++damaged_;
        return std::nullopt;
    }
    const std::size_t name = rest.find('\t');
    if (name == std::string_view::npos) {
        ++damaged_;  // a line feed stands in the name
        return std::nullopt;
    }
    account.name = std::string(rest.substr(0, name));
    rest.remove_prefix(name + 1);
    if (Skip(rest, "Name: ")) {
        // What follows a tab is the description, unless the display name itself holds one: then its rest is not shown.
        account.display = CleanText(rest.substr(0, rest.find('\t')));
    } else if (!StartsWith(rest, "Desc:")) {
        ++damaged_;
        return std::nullopt;
    }
    return account;
}

}  // namespace appliance
