// Small helpers for texts.

#ifndef VORN_APPLIANCE_BASE_TEXT_H
#define VORN_APPLIANCE_BASE_TEXT_H

#include <cstddef>
#include <string>
#include <string_view>
#include <vector>

namespace appliance {

// Pieces between the separators, empty ones included; an empty text has none.
std::vector<std::string> Split(std::string_view text, std::string_view separator);
// Lines without their ends ("\n" or "\r\n").
std::vector<std::string> Lines(std::string_view text);
// Blanks (space, tab, CR, LF) taken off both ends.
std::string Trim(std::string_view text);
// ASCII only, whatever the locale.
std::string Upper(std::string_view text);
std::string Lower(std::string_view text);
bool EqualIgnoringCase(std::string_view first, std::string_view second);
bool StartsWith(std::string_view text, std::string_view beginning);
bool Contains(std::string_view text, std::string_view part);
// True when the text holds a byte below 0x20, or 0x7F.
bool HasControlBytes(std::string_view text);

// Is this a DNS name (labels of letters, digits, "-" and "_", each 1 to 63 bytes and not beginning with "-"; at most 253
// bytes, no dot at the end), a NetBIOS name (1 to 15 bytes, none of \/:*?"<>|, no control byte, neither "." nor "-" in
// front, no blank at either end), a name of an account that may stand in an argument (no control byte, 1 to 256 bytes,
// not beginning with "-")?
bool IsDnsName(std::string_view text);
bool IsNetbiosName(std::string_view text);
bool IsAccountName(std::string_view text);

// Copies into a buffer as the platform's conventions say: cut to size - 1 bytes and NUL-terminated. False when the
// buffer is null or has no room for the NUL.
bool CopyToBuffer(std::string_view text, char* buffer, int size);

}  // namespace appliance

#endif
