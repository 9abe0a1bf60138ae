#include "vrx/host/base/uuid.h"

#include <systemd/sd-id128.h>

#include <array>
#include <system_error>

namespace vrx::host {

std::string UuidSource::makeUuid() {
    sd_id128_t id{};
    // Fails only on a machine without random numbers.
    if (const int r = sd_id128_randomize(&id); r < 0) throw std::system_error(-r, std::generic_category(), "UUID");
    std::array<char, SD_ID128_UUID_STRING_MAX> text;
    return sd_id128_to_uuid_string(id, text.data());
}

}  // namespace vrx::host
