// Files of keys and values, with or without sections, as the file-sharing service reads its own.

#ifndef VORN_APPLIANCE_BASE_CONF_FILE_H
#define VORN_APPLIANCE_BASE_CONF_FILE_H

#include <sys/types.h>

#include <optional>
#include <string>
#include <string_view>
#include <system_error>
#include <utility>
#include <vector>

namespace appliance {

struct ConfLine;

// True when two names of keys or sections are the same to the file-sharing service: case and blanks don't count.
bool SameKey(std::string_view first, std::string_view second);
// Equal for names that are the same, and only for those: the name without blanks, its ASCII letters in lower case.
std::string KeyIdentity(std::string_view name);

// True when a key or a value may be written: no control byte in it. A key also holds more than blanks and no "=", and
// begins with none of "#;[". A value doesn't end in a backslash, which would go on in the next line.
bool IsWritableKey(std::string_view key);
bool IsWritableValue(std::string_view value);

// The text of a configuration file. Lines before any section header belong to the section "global", and so do those
// under [global]. Comments (# or ; in front; they end with their line), continuation lines (a backslash at the end, with
// blanks after it or not; the blanks where two lines meet become one) and duplicate keys (the last one counts) are
// understood. A section may stand in several places. What is no header, comment or key is left alone and not read; an
// include is a key like any other. Writing changes the lines of the key in question and keeps every other byte.
class ConfFile {
public:
    ConfFile() = default;
    explicit ConfFile(std::string text) : text_(std::move(text)) {}

    // Reads a file; a missing one is empty and no failure when `mayBeMissing` is set.
    static std::error_code Load(const std::string& path, ConfFile& file, bool mayBeMissing = true);

    // Writes the text in one step (ReplaceFile). `mode` is for a new file.
    std::error_code Save(const std::string& path, mode_t mode = 0644) const;

    const std::string& text() const {
        return text_;
    }

    // The value of a key, blanks at both ends taken off; nothing when the key is absent.
    std::optional<std::string> Get(std::string_view section, std::string_view key) const;

    // All keys of a section in the order of the file; a key that stands twice comes once, with its last value.
    std::vector<std::pair<std::string, std::string>> Section(std::string_view section) const;

    // The names of all sections in the order of the file.
    std::vector<std::string> Sections() const;

    // Sets a key: its last line is rewritten where it stands, with the file's own indentation; earlier duplicates go. A
    // new key stands at the end of its section, and a new section at the end of the file ("global": in front of the
    // first section). In a file without any section header a new key of "global" is a plain line "key=value".
    // False, with nothing changed, when section, key or value can't be written, or when the file ends in a backslash that
    // would swallow what comes behind it.
    bool Set(std::string_view section, std::string_view key, std::string_view value);

    // Gives a section these entries and no others, each as one line of the format, whose two %s take the key and the
    // value. They stand where the section's first key stood; comments and all other sections keep their bytes. False, with
    // nothing changed, when something can't be written (see Set), when a key comes twice, or when the format is not one of
    // a whole line "key=value", in whatever blanks or quotes.
    bool SetSection(std::string_view section, const std::vector<std::pair<std::string, std::string>>& entries,
                    std::string_view format);

    // Removes every line of a key; a missing key is no failure. True when something was removed.
    bool Remove(std::string_view section, std::string_view key);

private:
    // Adds a key that the section does not have.
    bool Add(const std::vector<ConfLine>& lines, std::string_view section, std::string_view key,
             std::string_view value);

    std::string text_;
};

}  // namespace appliance

#endif
