// Wipes confidential text before its memory is freed. Covers the host's own copies only, not those that a library or
// the agent makes.
#pragma once

#include <string.h>

#include <string>
#include <string_view>

#include "vrx/platform/value.h"

namespace vrx::host {

inline void wipe(std::string& text) {
    explicit_bzero(text.data(), text.size());
    text.clear();
}

// Bytes that are wiped when they are destroyed. Give them their full size before filling them: growing leaves a copy
// behind.
class Secret {
public:
    explicit Secret(platform::Data bytes = {}) : bytes_(std::move(bytes)) {}
    Secret(Secret&& other) noexcept : bytes_(std::move(other.bytes_)) {}
    Secret& operator=(Secret&& other) noexcept {
        bytes_.swap(other.bytes_);
        return *this;
    }
    ~Secret() {
        if (!bytes_.empty()) explicit_bzero(bytes_.data(), bytes_.size());
    }

    platform::Data& bytes() { return bytes_; }
    std::string_view text() const { return {reinterpret_cast<const char*>(bytes_.data()), bytes_.size()}; }

private:
    platform::Data bytes_;
};

}  // namespace vrx::host
