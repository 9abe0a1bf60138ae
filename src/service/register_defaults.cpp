#include "vrx/service/register_defaults.h"

#include "vrx/platform/defaults_store.h"
#include "vrx/platform/settings_keys.h"

namespace vrx {

namespace settings = platform::settings;

void vrx_registerDefaults(platform::DefaultsStore& defaults) {
    defaults.registerDefaults({
        {std::string(settings::cachedWarrantyValidityDuration), 86400},
        {std::string(settings::highServerVersion), 3},
        {std::string(settings::lowServerVersion), 2},
        {std::string(settings::oneDayInterval), 86400},
        {std::string(settings::postUpgradeOutreachDelay), 172800},
        {std::string(settings::serverVersionURL),
         "https://configuration.orvane.example/library/ORVANE/asset/vrxV2.plist"},
        {std::string(settings::warrantyURL), "https://coverage.orvane.example/api/v2/coverage/summary"},
    });
}

}  // namespace vrx
