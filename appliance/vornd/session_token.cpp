#include "appliance/vornd/session_token.h"

#include <openssl/crypto.h>
#include <openssl/evp.h>
#include <sys/random.h>

#include <algorithm>
#include <cerrno>
#include <cstring>
#include <stdexcept>

namespace appliance {
namespace {

constexpr std::string_view kDigits = "0123456789abcdef";
constexpr std::string_view kLetters = "ABCDEFGHIJKLMNOPQRSTUVWXYZabcdefghijklmnopqrstuvwxyz0123456789-_";
constexpr unsigned kBitsPerLetter = 6;
constexpr unsigned kLetterMask = 63;
constexpr unsigned kBitsPerByte = 8;

using RandomBytes = std::array<std::uint8_t, 32>;

void Fill(RandomBytes& bytes) {
    // A request of this size is answered whole.
    while (getrandom(bytes.data(), bytes.size(), 0) != static_cast<ssize_t>(bytes.size())) {
        if (errno != EINTR) {
            throw std::runtime_error(std::string("no random bytes: ") + std::strerror(errno));
        }
    }
}

std::string ToBase64Url(const RandomBytes& bytes) {
    std::string text;
    unsigned bits = 0;
    unsigned count = 0;
    for (const std::uint8_t byte : bytes) {
        bits = (bits << kBitsPerByte | byte) & 0xFFFFU;
        for (count += kBitsPerByte; count >= kBitsPerLetter; count -= kBitsPerLetter) {
            text += kLetters[bits >> (count - kBitsPerLetter) & kLetterMask];
        }
    }
    return count == 0 ? text : text + kLetters[bits << (kBitsPerLetter - count) & kLetterMask];
}

}  // namespace

std::string NewToken() {
    RandomBytes bytes{};
    Fill(bytes);
    std::string token = ToBase64Url(bytes);
    explicit_bzero(bytes.data(), bytes.size());
    return token;
}

bool IsToken(std::string_view text) {
    return text.size() == kTokenLength && text.find_first_not_of(kLetters) == std::string_view::npos;
}

TokenHash HashOf(std::string_view token) {
    TokenHash hash{};
    unsigned size = 0;
    if (EVP_Digest(token.data(), token.size(), hash.data(), &size, EVP_sha256(), nullptr) != 1 || size != hash.size()) {
        throw std::runtime_error("a token can't be hashed");
    }
    return hash;
}

bool IsSame(std::string_view first, std::string_view second) {
    return first.size() == second.size() && CRYPTO_memcmp(first.data(), second.data(), first.size()) == 0;
}

bool IsSame(const TokenHash& first, const TokenHash& second) {
    return CRYPTO_memcmp(first.data(), second.data(), first.size()) == 0;
}

std::string ToHex(const TokenHash& hash) {
    std::string text;
    for (const std::uint8_t byte : hash) {
        text += kDigits[byte >> 4U];
        text += kDigits[byte & 15U];
    }
    return text;
}

std::optional<TokenHash> HashFromHex(std::string_view text) {
    TokenHash hash{};
    if (text.size() != 2 * hash.size() || text.find_first_not_of(kDigits) != std::string_view::npos) {
        return std::nullopt;
    }
    for (std::size_t index = 0; index < hash.size(); ++index) {
        hash[index] =
            static_cast<std::uint8_t>(kDigits.find(text[2 * index]) << 4U | kDigits.find(text[2 * index + 1]));
    }
    return hash;
}

}  // namespace appliance
