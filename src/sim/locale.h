// The user's language. The test sets it.
#pragma once

#include "vrx/codec/core/number_format.h"
#include "vrx/platform/locale.h"

namespace vrx::sim {

class Locale final : public platform::Locale {
public:
    std::string preferredLocaleIdentifier() const override { return identifier; }
    std::string decimalText(std::uint64_t number) const override { return codec::decimalText(number, identifier); }

    std::string identifier = "en_US";
};

}  // namespace vrx::sim
