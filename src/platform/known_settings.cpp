#include "vrx/platform/known_settings.h"

#include <algorithm>
#include <string>

#include "vrx/platform/settings_keys.h"

namespace vrx::platform {

namespace {

using Type = SettingType;
using enum KnownSetting::Purpose;

constexpr KnownSetting all[] = {
    {settings::cachedWarrantyValidityDuration, Type::Number, Configuration},
    {settings::highServerVersion, Type::Number, Configuration},
    {settings::lowServerVersion, Type::Number, Configuration},
    {settings::oneDayInterval, Type::Number, Configuration},
    {settings::postUpgradeOutreachDelay, Type::Number, Configuration},
    {settings::serverVersionURL, Type::Text, Configuration},
    {settings::warrantyURL, Type::Text, Configuration},
    {"storefrontLocale", Type::Text, Configuration},

    {"AppSupportAvailability", Type::Flag, Test},
    {"PairedBluetoothDevicesSerialNumbers", Type::Dictionary, Test},
    {settings::pairedWatchesSerialNumbers, Type::Dictionary, Test},
    {"SERIAL.activationInterval", Type::Number, Test, "SERIAL"},
    {"SerialNumber", Type::Text, Test},
    {"ServerVersionOverride", Type::Dictionary, Test},
    {"WebFlowURL", Type::Text, Test},

    {"ACTIVITY.TargetDate", Type::Date, State, "ACTIVITY"},
    {settings::defaultDeviceActivationDate, Type::Date, State},
    {"FollowupDismissedSerialNumberHashes", Type::List, State},
    {"FollowupPostedSerialNumberHashes", Type::List, State},
    {"HASH_CachedWarrantyLastUpdatedDate", Type::Date, State, "HASH"},
    {"HASH_CachedWarrantyLocale", Type::Text, State, "HASH"},
    {"HASH_CachedWarrantyVersion", Type::Text, State, "HASH"},
    {"PostUpgradeActivityCompleted", Type::Flag, State},
    {"ServerVersionCache", Type::Dictionary, State},
    {"VRXMigrationVersion", Type::Number, State},
    // Of the older single-device layout.
    {"CachedWarrantyLastUpdatedDate", Type::Date, State},
    {"CachedWarrantyLocale", Type::Text, State},
    {"CachedWarrantyVersion", Type::Text, State},
};

bool isNamed(const KnownSetting& setting, std::string_view key) {
    const std::string_view end = setting.name.substr(setting.placeholder.size());
    return setting.placeholder.empty() ? key == end : key.size() > end.size() && key.ends_with(end);
}

}  // namespace

std::span<const KnownSetting> knownSettings() {
    return all;
}

const KnownSetting* findSetting(std::string_view key) {
    const auto* found = std::ranges::find_if(all, [&](const KnownSetting& setting) { return isNamed(setting, key); });
    return found == std::end(all) ? nullptr : found;
}

std::string_view describe(SettingType type) {
    switch (type) {
        case Type::Text: return "a string";
        case Type::Number: return "a number";
        case Type::Flag: return "true or false";
        case Type::Date: return "a date";
        case Type::List: return "a list";
        case Type::Dictionary: return "a dictionary";
    }
    return "";
}

bool isOfType(const Value& value, SettingType type) {
    switch (value.type()) {
        case Value::Type::Bool: return type == Type::Flag;
        case Value::Type::Integer:
        case Value::Type::Double: return type == Type::Number;
        case Value::Type::Date: return type == Type::Date;
        case Value::Type::String: return type == Type::Text;
        case Value::Type::Array: return type == Type::List;
        case Value::Type::Dictionary: return type == Type::Dictionary;
        case Value::Type::Data:
        case Value::Type::Null: return false;
    }
    return false;
}

bool isReadAs(const Value& value, SettingType type) {
    if (type != Type::Number && type != Type::Flag) return isOfType(value, type);
    if (const std::string* text = value.asString())
        return type == Type::Flag || text->find_first_of("0123456789") < std::min<std::size_t>(2, text->size());
    return isOfType(value, Type::Number) || isOfType(value, Type::Flag);
}

}  // namespace vrx::platform
