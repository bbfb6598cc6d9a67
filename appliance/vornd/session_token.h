// Tokens that open something: random, told once, kept as a hash.

#ifndef VORN_APPLIANCE_VORND_SESSION_TOKEN_H
#define VORN_APPLIANCE_VORND_SESSION_TOKEN_H

#include <array>
#include <cstddef>
#include <cstdint>
#include <optional>
#include <string>
#include <string_view>

namespace appliance {

inline constexpr std::size_t kTokenLength = 43;  // 32 bytes in base64url

// SHA-256. A token is random, so nothing slower is needed.
using TokenHash = std::array<std::uint8_t, 32>;

// 32 bytes of the kernel's randomness in base64url without padding. Throws std::runtime_error when there are none.
std::string NewToken();

// Has the text the form of a token?
bool IsToken(std::string_view text);

TokenHash HashOf(std::string_view token);

// Compares without telling by its time where the two differ.
bool IsSame(std::string_view first, std::string_view second);
bool IsSame(const TokenHash& first, const TokenHash& second);

// 64 hexadecimal digits in lower case, and back; nothing for another text.
std::string ToHex(const TokenHash& hash);
std::optional<TokenHash> HashFromHex(std::string_view text);

}  // namespace appliance

#endif
