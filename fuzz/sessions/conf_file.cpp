#include <algorithm>
#include <cstdlib>
#include <filesystem>
#include <string>

#include "fuzz/sessions/targets.h"
#include "tests/appliance/core/conf_rules.h"

namespace fuzz {

namespace {

// In memory where that is possible; gone at the end.
class Folder {
public:
    Folder() {
        const char* shared = "/dev/shm";
        const std::filesystem::path place =
            std::filesystem::is_directory(shared) ? shared : std::filesystem::temp_directory_path();
        path_ = place / "vorn-fuzz-XXXXXX";
        if (mkdtemp(path_.data()) == nullptr) {
            std::abort();
        }
    }
    ~Folder() {
        std::error_code ignored;
        std::filesystem::remove_all(path_, ignored);
    }
    Folder(const Folder&) = delete;
    Folder& operator=(const Folder&) = delete;
    const std::string& path() const {
        return path_;
    }

private:
    std::string path_;
};

std::string TakeWord(std::string_view& input) {
    const std::string_view word = input.substr(0, input.find('\0'));
    input.remove_prefix(std::min(word.size() + 1, input.size()));
    return std::string(word);
}

}  // namespace

void RunConfFile(std::string_view input) {
    static const Folder folder;
    if (input.empty()) {
        return;
    }
    conf_rules::Words words;
    words.size = 1 + static_cast<unsigned char>(input.front());
    input.remove_prefix(1);
    words.key = TakeWord(input);
    words.section = TakeWord(input);
    words.value = TakeWord(input);
    words.text = input;
    const std::string broken = conf_rules::Broken(folder.path(), words);
    if (!broken.empty()) {
        throw ServerRuleBroken(broken);
    }
}

}  // namespace fuzz
