// How a check of a tool came out, from the least to what matters most. Any thread.
#pragma once

#include <cstdint>

namespace vrx::apps {

enum class Health : std::uint8_t { Skipped, Good, Note, Problem };

// As tables and documents have it.
constexpr const char* nameOf(Health health) {
    constexpr const char* names[] = {"skipped", "good", "note", "problem"};
    return names[static_cast<std::uint8_t>(health)];
}

}  // namespace vrx::apps
