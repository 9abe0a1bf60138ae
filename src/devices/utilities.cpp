#include "devices/utilities.h"

#include "platform/device_properties.h"
#include "platform/platform.h"

namespace vrx {

bool VRXUtilities::isInternal() {
    return platform::Platform::current().deviceProperties().isInternalInstall();
}

}  // namespace vrx
