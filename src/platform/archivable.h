// What can be archived. See keyed_archiver.h.
#pragma once

#include <string_view>

#include "vrx/platform/api.h"

namespace vrx::platform {

class KeyedDecoder;
class KeyedEncoder;

// A class T that can also be decoded has
//     static constexpr std::string_view archiveClassName;
//     static std::shared_ptr<T> initWithCoder(KeyedDecoder&);   // null when the archive does not make one
class VRX_CLIENT_API Archivable {
public:
    virtual ~Archivable() = default;
    virtual std::string_view className() const = 0;
    virtual void encodeWithCoder(KeyedEncoder& coder) const = 0;
};

}  // namespace vrx::platform
