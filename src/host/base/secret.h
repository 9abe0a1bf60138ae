// Keeping what is confidential from lying about in memory that has been given back. It reaches as far as the host's own
// copies do: what a library or the agent copies from them is theirs.
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

// Bytes that are wiped when they go. Whoever fills them reserves what they need first: growing leaves a copy behind.
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
