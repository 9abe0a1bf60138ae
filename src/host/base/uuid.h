// Identifiers from the kernel's random numbers. Any thread may ask.
#pragma once

#include "vrx/platform/uuid.h"

namespace vrx::host {

class UuidSource final : public platform::UuidSource {
public:
    std::string makeUuid() override;
};

}  // namespace vrx::host
