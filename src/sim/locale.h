// The user's language, set by the test. Numbers are grouped as in the United States, whatever the language.
#pragma once

#include "platform/locale.h"

namespace vrx::sim {

class Locale final : public platform::Locale {
public:
    std::string preferredLocaleIdentifier() const override { return identifier; }
    std::string decimalText(std::uint64_t number) const override {
        std::string text = std::to_string(number);
        for (std::size_t end = text.size(); end > 3; end -= 3) text.insert(end - 3, 1, ',');
        return text;
    }

    std::string identifier = "en_US";
};

}  // namespace vrx::sim
