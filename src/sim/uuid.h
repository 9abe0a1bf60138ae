// Identifiers that count up from the same one in every simulation.
#pragma once

#include <array>
#include <cstdio>

#include "vrx/platform/uuid.h"

namespace vrx::sim {

class UuidSource final : public platform::UuidSource {
public:
    std::string makeUuid() override {
        std::array<char, 37> text;
        std::snprintf(text.data(), text.size(), "00000000-0000-4000-8000-%012x", ++made_);
        return text.data();
    }

private:
    unsigned made_ = 0;
};

}  // namespace vrx::sim
