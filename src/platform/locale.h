// The user's language and the texts that depend on it. Any thread may ask; each call reads the present setting.
#pragma once

#include <cstdint>
#include <string>

namespace vrx::platform {

class Locale {
public:
    virtual ~Locale() = default;
    // The identifier of the preferred locale, such as "en_US": what cached records are stored with and compared to.
    virtual std::string preferredLocaleIdentifier() const = 0;
    // A whole number in the decimal style of that locale, with its grouping separators: 1,234.
    virtual std::string decimalText(std::uint64_t number) const = 0;
};

}  // namespace vrx::platform
