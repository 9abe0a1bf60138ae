// vrxhost cache: the cached record of a serial number, and whether it is valid.
#include <filesystem>

#include "vrx/codec/property_list.h"
#include "vrx/coverage/cache_metadata.h"
#include "vrx/coverage/records/warranty.h"
#include "vrx/host/profile/device_profile.h"
#include "vrx/platform/text.h"
#include "vrxhost/home.h"
#include "vrxhost/verbs.h"

namespace vrx::apps {

using platform::Data;
using platform::Dictionary;
using platform::Result;
using platform::Value;

namespace {

struct CacheFile {
    enum class State { Present, Missing, Damaged };
    State state = State::Present;
    Value content{};
    std::string problem{};  // unless it is present
};

CacheFile readCacheFile(Home& home, const std::string& path) {
    using enum CacheFile::State;
    const Result<Data> bytes = home.files().read(path);
    std::error_code ignored;
    if (!bytes && !std::filesystem::exists(path, ignored))
        return {.state = Missing, .problem = "there is no cache file"};
    if (!bytes) return {.state = Damaged, .problem = "the cache file cannot be read: " + bytes.error().text};
    const Result<Value> root = codec::parsePropertyList(*bytes);
    if (!root) return {.state = Damaged, .problem = "the cache file is damaged: " + root.error().text};
    if (!root->asDictionary())
        return {.state = Damaged, .problem = "the cache file is damaged: it holds no dictionary"};
    return {.content = *root};
}

// Compares the record's language and version with the present ones, as the agent does before it uses the record.
Outcome showCache(Home& home, const std::string& serialNumber, const std::vector<std::string>& profile) {
    const std::string path =
        platform::filled(VRXWarranty::_warrantyPathForSerialNumberFormat(), {platform::sha256Hash(serialNumber)});
    auto metadata = [&](std::string_view key) { return home.defaults().get(cacheMetadataKey(serialNumber, key)); };
    const Value stored = metadata(cachedWarrantyLastUpdatedDateKey);
    const Value locale = metadata(cachedWarrantyLocaleKey);
    const Value version = metadata(cachedWarrantyVersionKey);
    const std::string systemLocale = host::DeviceProfile(profile).preferredLocaleIdentifier();
    const CacheFile file = readCacheFile(home, path);

    Outcome outcome;
    if (file.state == CacheFile::State::Missing)
        outcome = failed(ExitCode::NoAnswer, file.problem + " for this serial number",
                         "A download makes it: vrxctl info SERIAL --policy refresh.");
    if (file.state == CacheFile::State::Damaged)
        outcome = failed(ExitCode::NoAnswer, file.problem, "The agent takes it for absent; a download replaces it.",
                         "damaged");
    outcome.document = {{"path", path},
                        {"lastUpdated", stored},
                        {"locale", locale},
                        {"systemLocale", systemLocale},
                        {"cacheVersion", version},
                        {"currentCacheVersion", currentCacheVersion},
                        {"coverage", file.content}};
    auto compared = [](const Value& value, std::string_view wanted, const std::string& whose) {
        const std::string text = value.isNull() ? "unknown" : printableValue(value);
        const bool isWanted = value.asString() && *value.asString() == wanted;
        return text + (isWanted ? "" : " (" + whose + " is " + printable(wanted) + ": not valid)");
    };
    outcome.text = "File         " + printable(path) + "\n" + "Stored       " +
                   (stored.isNull() ? "unknown" : printableValue(stored)) + "\n" + "Locale       " +
                   compared(locale, systemLocale, "the system's") + "\n" + "Version      " +
                   compared(version, currentCacheVersion, "the present one") + "\n";
    if (const Dictionary* content = file.content.asDictionary())
        for (const auto& [key, value] : *content)
            outcome.text += "  " + printable(key) + " = " + printableValue(value) + "\n";
    return outcome;
}

}  // namespace

void addCacheVerb(CommandLine& line, const wire::LocationOverrides& places) {
    struct Options {
        std::string serialNumber;
        std::optional<std::string> profile;
    };
    auto options = std::make_shared<Options>();
    CLI::App* verb = line.add("cache", "Shows what is cached for a serial number",
                              inHome(places, Access::ReadOnly, [options](Home& home) {
                                  return showCache(home, options->serialNumber, home.profileLayers(options->profile));
                              }));
    verb->add_option("SERIAL", options->serialNumber, "The serial number")->required();
    verb->add_option("--device", options->profile, "The agent's device profile, for the language")->type_name("PATH");
}

}  // namespace vrx::apps
