// A text that must not stay in memory: passwords, machine accounts' keys.

#ifndef VORN_APPLIANCE_BASE_SECRET_H
#define VORN_APPLIANCE_BASE_SECRET_H

#include <cstddef>
#include <cstring>
#include <initializer_list>
#include <memory>
#include <string_view>

namespace appliance {

// Owns a copy of a text and wipes it when it ends. It moves and is never copied, printed or compared.
class Secret {
public:
    Secret() = default;
    explicit Secret(std::string_view text) : size_(text.size()), text_(new char[text.size() + 1]) {
        std::memcpy(text_.get(), text.data(), size_);
        text_[size_] = '\0';
    }
    // The parts one behind the other, with no other copy on the way.
    static Secret Joined(std::initializer_list<std::string_view> parts) {
        Secret joined;
        for (const std::string_view part : parts) {
            joined.size_ += part.size();
        }
        joined.text_.reset(new char[joined.size_ + 1]);
        std::size_t place = 0;
        for (const std::string_view part : parts) {
            part.copy(&joined.text_[place], part.size());
            place += part.size();
        }
        joined.text_[place] = '\0';
        return joined;
    }
    ~Secret() {
        Wipe();
    }
    Secret(Secret&& other) noexcept : size_(other.size_), text_(std::move(other.text_)) {
        other.size_ = 0;
    }
    Secret& operator=(Secret&& other) noexcept {
        if (this != &other) {
            Wipe();
            size_ = other.size_;
            text_ = std::move(other.text_);
            other.size_ = 0;
        }
        return *this;
    }
    Secret(const Secret&) = delete;
    Secret& operator=(const Secret&) = delete;

    const char* c_str() const {
        return text_ ? text_.get() : "";
    }
    std::string_view view() const {
        return {c_str(), size_};
    }
    bool empty() const {
        return size_ == 0;
    }

private:
    void Wipe() {
        if (text_) {
            explicit_bzero(text_.get(), size_);
        }
    }

    std::size_t size_ = 0;
    std::unique_ptr<char[]> text_;
};

}  // namespace appliance

#endif
