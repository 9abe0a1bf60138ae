// Forward declarations of the types that protocols name.
#pragma once

#include <cstdint>
#include <memory>
#include <vector>

namespace vrx {

class VRXDevice;
class VRXDeviceInfo;
class VRXWarranty;

using DeviceList = std::vector<std::shared_ptr<VRXDevice>>;
using DeviceInfoList = std::vector<std::shared_ptr<VRXDeviceInfo>>;

// Which coverage record a caller wants. Any other value means CachedOnly.
using VRXWarrantyLookupPolicy = std::uint64_t;
inline constexpr VRXWarrantyLookupPolicy VRXWarrantyLookupPolicyDefault = 0;  // cached while fresh, else downloaded
inline constexpr VRXWarrantyLookupPolicy VRXWarrantyLookupPolicyCachedOnly =
    1;  // cached, whatever its age; never downloaded
inline constexpr VRXWarrantyLookupPolicy VRXWarrantyLookupPolicyRefresh = 2;  // downloaded, never cached

}  // namespace vrx
