#include "vrx/devices/utilities.h"

#include "vrx/platform/device_properties.h"
#include "vrx/platform/platform.h"

namespace vrx {

bool VRXUtilities::isInternal() {
    return platform::Platform::current().deviceProperties().isInternalInstall();
}

}  // namespace vrx
