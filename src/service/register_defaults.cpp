#include "service/register_defaults.h"

#include "platform/defaults_store.h"

namespace vrx {

void vrx_registerDefaults(platform::DefaultsStore& defaults) {
    // Durations in seconds.
    defaults.registerDefaults({
        {"CachedWarrantyValidityDuration", 86400},
        {"HighServerVersion", 3},
        {"LowServerVersion", 2},
        {"OneDayInterval", 86400},
        {"PostUpgradeOutreachDelay", 172800},
        {"ServerVersionURL", "https://configuration.orvane.example/library/ORVANE/asset/vrxV2.plist"},
        {"WarrantyURL", "https://coverage.orvane.example/api/v2/coverage/summary"},
    });
}

}  // namespace vrx
