// vrxhost: looks into the agent's home beside the agent, and changes its settings, for testers. It makes no home and no
// database of its own.
#include <filesystem>

#include "codec/codec.h"
#include "codec/iso_date.h"
#include "codec/json.h"
#include "command_line.h"
#include "coverage/cache_metadata.h"
#include "coverage/warranty.h"
#include "host/database.h"
#include "host/defaults_store.h"
#include "host/device_profile.h"
#include "host/files.h"
#include "host/system_log.h"
#include "platform/platform.h"
#include "platform/text.h"
#include "service/register_defaults.h"
#include "wire/locations.h"

namespace vrx::apps {
namespace {

using platform::Data;
using platform::Dictionary;
using platform::MaybeError;
using platform::Result;
using platform::Value;

// What is in an agent's home, and the platform that the agent's own classes read it through.
class Home {
public:
    explicit Home(const std::string& path) : files_(path), database_(databasePath(path)) {
        vrx_registerDefaults(defaults_);
    }

    static std::string databasePath(const std::string& home) { return home + "/host.db"; }

    MaybeError open() { return database_.open(); }
    platform::DefaultsStore& defaults() { return defaults_; }
    // Without the registered values.
    const platform::DefaultsStore& stored() const { return stored_; }
    const platform::Files& files() const { return files_; }

private:
    host::SystemLog log_;
    codec::Digest digest_;
    codec::PropertyList propertyList_;
    host::Files files_;
    host::Database database_;
    host::DefaultsStore stored_{database_};
    host::DefaultsStore defaults_{database_};
    platform::Platform platform_{{.defaultsStore = &defaults_,
                                  .digest = &digest_,
                                  .files = &files_,
                                  .propertyList = &propertyList_,
                                  .systemLog = &log_}};
    platform::ScopedPlatform current_{platform_};
};

Outcome notReachable(std::string problem) {
    return failed(ExitCode::NotReachable, std::move(problem),
                  "An agent makes it at its first start; name the agent's home with --home.");
}

// Settings.

const char* typeName(const Value& value) {
    switch (value.type()) {
        case Value::Type::Null: return "nothing";
        case Value::Type::Bool: return "boolean";
        case Value::Type::Integer: return "integer";
        case Value::Type::Double: return "float";
        case Value::Type::Date: return "date";
        case Value::Type::String: return "string";
        case Value::Type::Data: return "data";
        case Value::Type::Array: return "array";
        case Value::Type::Dictionary: return "dictionary";
    }
    return "";
}

Dictionary settingDocument(const std::string& key, const Value& value, bool isRegistered) {
    return {{"key", key}, {"value", value}, {"type", typeName(value)}, {"registered", isRegistered}};
}

constexpr const char* registeredMark = "registered";

Outcome listDefaults(Home& home) {
    platform::Array documents;
    std::vector<std::vector<std::string>> rows{{"KEY", "TYPE", "FROM", "VALUE"}};
    for (const auto& [key, value] : home.defaults().dictionaryRepresentation()) {
        const bool isRegistered = home.stored().get(key).isNull();
        documents.emplace_back(settingDocument(key, value, isRegistered));
        rows.push_back({key, typeName(value), isRegistered ? registeredMark : "stored", printableValue(value)});
    }
    return {.document = {{"defaults", documents}}, .text = table(rows)};
}

Outcome readDefault(Home& home, const std::string& key) {
    const Value value = home.defaults().get(key);
    if (value.isNull())
        return failed(ExitCode::NoAnswer, "nothing is stored or registered under " + key, "See vrxhost defaults list.");
    const bool isRegistered = home.stored().get(key).isNull();
    return {.document = settingDocument(key, value, isRegistered),
            .text = printableValue(value) + (isRegistered ? std::string("  (") + registeredMark + ")\n" : "\n")};
}

// The store only logs that it could not write.
Outcome storeDefault(Home& home, const std::string& key, const Value& value) {
    home.defaults().set(key, value);
    if (home.stored().get(key) == value) return {.document = {{"key", key}, {"value", value}}};
    Outcome outcome = failed(ExitCode::NoAnswer, "the database could not be written", "The line above says why.");
    outcome.kind = "not-written";
    return outcome;
}

Outcome deleteDefault(Home& home, const std::string& key) {
    const bool wasStored = !home.stored().get(key).isNull();
    Outcome outcome = storeDefault(home, key, nullptr);
    if (outcome.code != ExitCode::Done) return outcome;
    return {.document = {{"key", key}, {"deleted", wasStored}},
            .text = wasStored ? "" : "Nothing was stored under " + printable(key) + ".\n"};
}

// The cache.

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

Outcome showCache(Home& home, const std::string& serialNumber, const std::string& profile) {
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
    if (file.state == CacheFile::State::Damaged) {
        outcome = failed(ExitCode::NoAnswer, file.problem, "The agent takes it for absent; a download replaces it.");
        outcome.kind = "damaged";
    }
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
    if (const platform::Dictionary* content = file.content.asDictionary())
        for (const auto& [key, value] : *content)
            outcome.text += "  " + printable(key) + " = " + printableValue(value) + "\n";
    return outcome;
}

// The options.

struct Options {
    wire::LocationOverrides places;
    std::string key;
    Value value;
    std::string serialNumber;
};

CLI::Option* addKey(CLI::App* verb, Options& options) {
    return verb->add_option("KEY", options.key, "The setting's name")->required();
}

// One of a JSON value and the typed options.
void addValue(CLI::App* verb, Options& options) {
    CLI::Option_group* group = verb->add_option_group("value", "The value, in one of these forms");
    auto add = [&]<class T>(const char* name, const char* type, const char* help, std::type_identity<T>) {
        group
            ->add_option_function<T>(
                name, [&options](const T& value) { options.value = value; }, help)
            ->type_name(type);
    };
    auto json = [&options](const std::string& text) {
        Result<Value> value = codec::parseJson(text);
        if (!value)
            throw CLI::ValidationError("VALUE",
                                       "no JSON value, " + value.error().text + "; a text is given with --string");
        if (value->isNull()) throw CLI::ValidationError("VALUE", "null cannot be stored; use defaults delete");
        options.value = *value;
    };
    group->add_option_function<std::string>("VALUE", json, "A JSON value")->type_name("JSON");
    add("--string", "TEXT", "A text", std::type_identity<std::string>());
    add("--int", "N", "A whole number", std::type_identity<std::int64_t>());
    add("--float", "X", "A number", std::type_identity<double>());
    add("--bool", "true|false", "A boolean", std::type_identity<bool>());
    auto date = [&options](const std::string& text) {
        const auto value = codec::dateFromIsoText(text);
        if (!value) throw CLI::ValidationError("--date", "'" + text + "' is no date such as 2026-01-31T12:00:00Z");
        options.value = *value;
    };
    group->add_option_function<std::string>("--date", date, "A date in UTC: 2026-01-31T12:00:00Z")->type_name("DATE");
    group->require_option(1);
}

int run(int argc, const char* const* argv) {
    CommandLine line("vrxhost", "Looks into the home of a coverage agent, and changes its settings, for testers.");
    Options options;
    line.app().add_option("--home", options.places.home, "The agent's home")->type_name("PATH");

    // Within the home, which must be there.
    auto inHome = [&options](auto verb) {
        return [&options, verb]() -> Outcome {
            const std::string path = absolutePath(wire::findLocations(options.places).home.path);
            const std::string database = Home::databasePath(path);
            std::error_code error;
            if (!std::filesystem::exists(database, error))
                return notReachable("there is no agent's database " + database);
            Home home(path);
            if (MaybeError problem = home.open()) return notReachable(problem->text);
            return verb(home);
        };
    };

    CLI::App* defaults = line.addGroup("defaults", "The agent's settings");
    line.add("list", "Lists all settings, stored and registered", inHome(listDefaults), defaults);
    addKey(line.add("read", "Shows a setting", inHome([&](Home& home) { return readDefault(home, options.key); }),
                    defaults),
           options);
    CLI::App* write =
        line.add("write", "Stores a setting",
                 inHome([&](Home& home) { return storeDefault(home, options.key, options.value); }), defaults);
    addKey(write, options);
    addValue(write, options);
    addKey(line.add("delete", "Removes a stored setting; a registered value holds again",
                    inHome([&](Home& home) { return deleteDefault(home, options.key); }), defaults),
           options);

    CLI::App* cache =
        line.add("cache", "Shows what is cached for a serial number", inHome([&](Home& home) {
                     return showCache(home, options.serialNumber, wire::findLocations(options.places).profile.path);
                 }));
    cache->add_option("SERIAL", options.serialNumber, "The serial number")->required();
    cache->add_option("--device", options.places.profile, "The agent's device profile, for the language")
        ->type_name("PATH");
    return line.run(argc, argv);
}

}  // namespace
}  // namespace vrx::apps

int main(int argc, char** argv) {
    return vrx::apps::run(argc, argv);
}
