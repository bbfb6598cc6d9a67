// Texts that a domain controller answers: UTF-8, and sometimes not.

#ifndef VORN_APPLIANCE_DOMAIN_DIRECTORY_UTF8_H
#define VORN_APPLIANCE_DOMAIN_DIRECTORY_UTF8_H

#include <string>
#include <string_view>

namespace appliance {

// True when the text is well-formed UTF-8 (no overlong form, no surrogate, nothing above U+10FFFF).
bool IsUtf8(std::string_view text);

// The text with every letter in lower case, also beyond ASCII; bytes that are no UTF-8 stay. Two texts that differ only
// in case have the same folded form.
std::string FoldCase(std::string_view text);

// A text to show: control characters (those of U+0080 to U+009F, too) become blanks, and bytes that are no UTF-8 become
// "?"; blanks at both ends are taken off.
std::string CleanText(std::string_view text);

// True when the text may stand in a list as the name of a user or group: not empty, at most 256 bytes, well-formed and
// without a control character.
bool IsListableName(std::string_view text);

}  // namespace appliance

#endif
