#include "vrx/host/profile/profile_reader.h"

#include <unistd.h>

#include <algorithm>
#include <cctype>
#include <cerrno>
#include <functional>
#include <set>

#include "vrx/codec/time_zone.h"
#include "vrx/host/base/text.h"
#include "vrx/host/profile/bare_machine.h"
#include "vrx/platform/known_settings.h"

namespace vrx::host {

using platform::Date;
using platform::Error;
using platform::PairedWatch;
using platform::Result;

namespace {

// A mistake in the profile, thrown at its line.
struct ProfileError {
    toml::source_index line;
    std::string text;
};

// What a table's reader is told, and asks.
struct Surroundings {
    std::function<void(toml::source_index line, const std::string& text)> warn;
    std::function<bool(const ProfileFile& file)> areDefaultsBelieved;
    // Told of each key that is asked for; the node and its file are null where no file has it.
    std::function<void(const std::string& key, const toml::node* node, const ProfileFile* file)> note = nullptr;
};

// A table of one file.
struct TableOfFile {
    const toml::table* table;
    const ProfileFile* file;
};

// One table of the profile, as the files make it: the lowest layer first. Returns its entries by type, and reports in
// the end the keys that nobody asked for.
class Table {
public:
    Table(std::vector<TableOfFile> tables, std::string prefix, const Surroundings& surroundings)
        : tables_(std::move(tables)), prefix_(std::move(prefix)), surroundings_(surroundings) {}

    // Of the file that the key stands in; of none without the key.
    ProfileFile sourceOf(const char* key) const {
        const Found found = lookUp(key);
        return found.file ? *found.file : ProfileFile();
    }
    // Of a table that stands in one file, such as an element of an array.
    const ProfileFile& source() const { return *tables_.front().file; }
    bool has(const char* key) const { return lookUp(key).node != nullptr; }

    std::optional<std::string> string(const char* key) { return scalar<std::string>(key, "a string"); }
    std::optional<std::int64_t> integer(const char* key) { return scalar<std::int64_t>(key, "an integer"); }
    std::optional<bool> boolean(const char* key) { return scalar<bool>(key, "true or false"); }

    // A time in seconds.
    std::optional<platform::Duration> duration(const char* key) {
        const toml::node* node = find(key);
        if (!node) return std::nullopt;
        const std::optional<double> seconds = node->is_number() ? node->value<double>() : std::nullopt;
        if (!seconds || !(*seconds >= 0)) reject(key, *node, "a number of seconds");
        return platform::Duration(*seconds);
    }

    std::string requiredString(const char* key) {
        std::optional<std::string> text = string(key);
        if (!text || text->empty())
            throw ProfileError{tables_.front().table->source().begin.line, prefix_ + key + " is missing"};
        return *text;
    }

    // A string without control characters, which may stand in a header or on a line of its own. An empty one counts as
    // absent.
    std::optional<std::string> line(const char* key) {
        std::optional<std::string> text = string(key);
        if (text && !isOneLine(*text)) reject(key, *find(key), "without control characters");
        return text && text->empty() ? std::nullopt : text;
    }

    std::optional<std::string> absolutePath(const char* key) {
        std::optional<std::string> path = line(key);
        if (path && !path->starts_with('/')) reject(key, *find(key), "an absolute path");
        return path;
    }

    std::optional<std::string> applicationIdentifier(const char* key) {
        std::optional<std::string> identifier = string(key);
        if (identifier && !isApplicationIdentifier(*identifier))
            reject(key, *find(key), "the identifier of an application");
        return identifier;
    }

    std::vector<std::string> absolutePaths(const char* key) {
        std::vector<std::string> paths = strings(key);
        if (!std::ranges::all_of(paths, [](const std::string& path) { return path.starts_with('/'); }))
            reject(key, *find(key), "a list of absolute paths");
        return paths;
    }

    // A program and its arguments.
    std::vector<std::string> command(const char* key) {
        std::vector<std::string> words = strings(key);
        if (!words.empty() && !words[0].starts_with('/'))
            reject(key, *find(key), "a list that begins with an absolute path");
        return words;
    }

    bool isFalse(const char* key) {
        known_.insert(key);
        const toml::node* node = lookUp(key).node;
        return node && isFalse(*node) && find(key);
    }

    // A date, with or without a time. Without an offset it is in UTC.
    std::optional<Date> date(const char* key) {
        const toml::node* node = find(key);
        if (!node) return std::nullopt;
        toml::date_time time{{}, toml::time{}};
        if (const auto* dateTime = node->as_date_time())
            time = dateTime->get();
        else if (const auto* date = node->as_date())
            time.date = date->get();
        else
            reject(key, *node, "a date");
        using namespace std::chrono;
        const sys_days day = year(time.date.year) / time.date.month / time.date.day;
        const minutes offset(time.offset ? time.offset->minutes : 0);
        return Date(day + hours(time.time.hour) + minutes(time.time.minute) + seconds(time.time.second) +
                    platform::Duration(time.time.nanosecond / 1e9) - offset);
    }

    std::vector<std::string> strings(const char* key) {
        std::vector<std::string> result;
        const toml::node* node = find(key);
        if (!node) return result;
        const toml::array* array = node->as_array();
        if (!array) reject(key, *node, "a list of strings");
        for (const toml::node& element : *array) {
            if (!element.is_string()) reject(key, element, "a list of strings");
            result.push_back(**element.as_string());
        }
        return result;
    }

    enum class Falsehood { Refused, Allowed };

    // Calls with the table under the key, which may be empty, and reports its unknown keys. Where false is allowed, it
    // takes away the tables below it.
    template <class F>
    void table(const std::string& key, F read, Falsehood falsehood = Falsehood::Refused) {
        known_.insert(key);
        std::vector<TableOfFile> inner;
        for (const TableOfFile& outer : tables_) {
            const toml::node* node = outer.table->get(key);
            if (!node) continue;
            if (node->is_table())
                inner.push_back({node->as_table(), outer.file});
            else if (falsehood == Falsehood::Allowed && isFalse(*node))
                inner.clear();
            else
                reject(key, *node, "a table");
        }
        enter(std::move(inner), prefix_ + key + ".", read);
    }

    enum class Arrays { Replaced, AddedUp };

    template <class F>
    void tables(const char* key, Arrays arrays, F read) {
        known_.insert(key);
        std::vector<TableOfFile> elements;
        for (const TableOfFile& outer : tables_) {
            const toml::node* node = outer.table->get(key);
            if (!node) continue;
            const toml::array* array = node->as_array();
            if (!array) reject(key, *node, "a list of tables, [[" + prefix_ + key + "]]");
            if (arrays == Arrays::Replaced) elements.clear();
            if (array->empty()) note(key, {node, outer.file});
            for (const toml::node& element : *array) {
                if (!element.is_table()) reject(key, element, "a list of tables");
                elements.push_back({element.as_table(), outer.file});
            }
        }
        if (!has(key)) note(key, {});
        for (std::size_t i = 0; i < elements.size(); ++i)
            enter({elements[i]}, prefix_ + key + "[" + std::to_string(i) + "].", read);
    }

    std::set<std::string> keys() const {
        std::set<std::string> keys;
        for (const TableOfFile& one : tables_)
            for (const auto& [key, node] : *one.table) keys.emplace(key.str());
        return keys;
    }

    // Calls with every key and its node.
    template <class F>
    void each(F read) {
        for (const std::string& key : keys()) read(key, *find(key));
    }

    // Leaves out the tables of files whose defaults are not believed.
    void keepBelieved() {
        std::erase_if(tables_, [&](const TableOfFile& one) { return !surroundings_.areDefaultsBelieved(*one.file); });
    }

    [[noreturn]] void reject(const std::string& key, const toml::node& node, const std::string& wanted) const {
        throw ProfileError{node.source().begin.line, prefix_ + key + " must be " + wanted};
    }

    // For a value of the right type that means nothing.
    void warn(const std::string& key, const std::string& text) const {
        surroundings_.warn(lineOf(key), prefix_ + key + " " + text);
    }

    // Where the key stands, "PATH:LINE".
    std::string placeOf(const std::string& key) const {
        return lookUp(key).file->path + ":" + std::to_string(lineOf(key));
    }

    void reportUnknown() const {
        for (const TableOfFile& one : tables_)
            for (const auto& [key, node] : *one.table)
                if (!known_.contains(std::string(key.str())))
                    surroundings_.warn(key.source().begin.line,
                                       "the key " + prefix_ + std::string(key) + " is not known");
    }

private:
    struct Found {
        const toml::node* node = nullptr;
        const ProfileFile* file = nullptr;
    };

    static bool isFalse(const toml::node& node) { return node.is_boolean() && !**node.as_boolean(); }

    Found lookUp(std::string_view key) const {
        Found found;
        for (const TableOfFile& one : tables_)
            if (const toml::node* node = one.table->get(key)) found = {node, one.file};
        return found;
    }

    void note(const std::string& key, const Found& found) const {
        if (surroundings_.note) surroundings_.note(prefix_ + key, found.node, found.file);
    }

    toml::source_index lineOf(const std::string& key) const { return lookUp(key).node->source().begin.line; }

    const toml::node* find(const std::string& key) {
        known_.insert(key);
        const Found found = lookUp(key);
        note(key, found);
        return found.node;
    }

    template <class T>
    std::optional<T> scalar(const char* key, const char* wanted) {
        const toml::node* node = find(key);
        if (!node) return std::nullopt;
        const auto* value = node->as<T>();
        if (!value) reject(key, *node, wanted);
        return value->get();
    }

    template <class F>
    void enter(std::vector<TableOfFile> tables, std::string prefix, F read) const {
        Table inner(std::move(tables), std::move(prefix), surroundings_);
        read(inner);
        inner.reportUnknown();
    }

    std::vector<TableOfFile> tables_;
    const std::string prefix_;
    const Surroundings& surroundings_;
    std::set<std::string> known_;
};

// Whether it is made as identifiers are: a language of two or three letters, then parts of up to eight.
bool isLocaleIdentifier(const std::string& identifier) {
    const std::size_t language = identifier.find_first_of("_-");
    if (const std::size_t size = std::min(language, identifier.size()); size < 2 || size > 3) return false;
    std::size_t partSize = 0;
    for (char character : identifier) {
        const bool isSeparator = character == '_' || character == '-';
        if (!isSeparator && !isalnum(static_cast<unsigned char>(character))) return false;
        if (isSeparator ? partSize == 0 : ++partSize > 8) return false;
        if (isSeparator) partSize = 0;
    }
    return partSize > 0;
}

// Asks the library, which is large, only about zones that the system does not have.
bool isTimeZone(const std::string& name) {
    return access(("/usr/share/zoneinfo/" + name).c_str(), F_OK) == 0 ||
           codec::timeZoneOffset(name, std::chrono::system_clock::now());
}

void readLocale(Table& locale, ProfileContent& content) {
    if (std::optional<std::string> language = locale.string("language")) {
        content.language = localeIdentifierFromPosix(*language);
        if (content.language && !isLocaleIdentifier(*content.language)) locale.warn("language", "is not a language");
    }
    content.timeZone = locale.string("time_zone");
    if (content.timeZone && !isTimeZone(*content.timeZone)) locale.warn("time_zone", "is not the name of a time zone");
}

PairedWatch readWatch(Table& table) {
    PairedWatch watch;
    watch.name = table.string("name");
    watch.localizedModelName = table.string("model_name");
    watch.serialNumber = table.string("serial_number");
    watch.pairedDate = table.date("paired_date");
    watch.isPaired = table.boolean("paired").value_or(true);
    watch.isArchived = table.boolean("archived").value_or(false);
    return watch;
}

platform::Carrier readCarrier(Table& table) {
    return {.mobileCountryCode = table.string("mcc"), .mobileNetworkCode = table.string("mnc")};
}

bool isEntitlementValue(const toml::node& node) {
    const auto isString = [](const toml::node& element) { return element.is_string(); };
    const toml::array* list = node.as_array();
    return node.is_boolean() || node.is_number() || node.is_string() ||
           (list && std::all_of(list->begin(), list->end(), isString));
}

ProfileBundle readBundle(Table& table) {
    ProfileBundle bundle;
    bundle.source = table.source();
    bundle.executables = table.strings("executables");
    bundle.flatpak = table.applicationIdentifier("flatpak");
    bundle.identifier = table.requiredString("identifier");
    bundle.name = table.string("name");
    bundle.vendor = table.string("vendor");
    bundle.group = table.string("group");
    table.table("entitlements", [&](Table& entitlements) {
        entitlements.each([&](const std::string& name, const toml::node& node) {
            if (!isEntitlementValue(node))
                entitlements.reject(name, node, "a boolean, number, string or list of strings");
            bundle.entitlements[name] = valueOf(node);
        });
    });
    return bundle;
}

platform::HttpHeaders readHeaders(Table& table) {
    platform::HttpHeaders headers;
    table.each([&](const std::string& name, const toml::node& node) {
        const auto* value = node.as_string();
        if (!isHeaderName(name) || !value || !isOneLine(value->get()))
            table.reject(name, node, "a header's name, and its value a string without control characters");
        headers[name] = value->get();
    });
    return headers;
}

// Nothing without an identifier: nobody is signed in then.
std::optional<ProfileAccount> readAccount(Table& table) {
    ProfileAccount account;
    account.identifier = table.line("identifier").value_or("");
    account.altDSID = table.line("alt_dsid");
    if (!table.isFalse("authentication")) {
        account.authentication = {account.identifier, account.altDSID};
        const auto read = [&](Table& authentication) {
            if (auto identifier = authentication.line("identifier")) account.authentication->identifier = *identifier;
            if (auto altDSID = authentication.line("alt_dsid")) account.authentication->altDSID = *altDSID;
        };
        table.table("authentication", read, Table::Falsehood::Allowed);
    }
    account.credentialHelper = table.command("credential_helper");
    account.credentialHelperSource = table.sourceOf("credential_helper");
    account.storefront = table.line("storefront");
    account.storeAccountIdentifier = table.integer("store_account_identifier");
    account.clientInformation = table.line("client_information");
    account.deviceIdentifier = table.line("device_identifier");
    if (table.has("headers")) table.table("headers", [&](Table& headers) { account.headers = readHeaders(headers); });
    return account.identifier.empty() ? std::nullopt : std::optional(std::move(account));
}

// A setting that is the agent's own state would outlive its removal from the profile.
void readDefaults(Table& defaults, ProfileContent& content) {
    defaults.keepBelieved();
    defaults.each([&](const std::string& key, const toml::node& node) {
        const platform::KnownSetting* setting = platform::findSetting(key);
        if (!setting) return defaults.warn(key, "is not known");
        if (setting->purpose == platform::KnownSetting::Purpose::State)
            return defaults.warn(key, "is refused: the agent writes it for itself");
        platform::Value value = valueOf(node);
        if (!platform::isOfType(value, setting->type))
            defaults.reject(key, node, std::string(platform::describe(setting->type)));
        content.defaults[key] = std::move(value);
        content.defaultSources[key] = defaults.placeOf(key);
    });
}

ProfileContent readContent(Table& root) {
    ProfileContent content;
    root.table("device", [&](Table& device) {
        content.serialNumber = device.string("serial_number");
        content.name = device.string("name");
        content.productType = device.line("product_type");
        content.productVersion = device.line("product_version");
        content.isInternal = device.boolean("internal").value_or(false);
        content.contentSizeCategory = device.string("content_size");
    });
    root.table("features", [&](Table& features) {
        for (const std::string& domain : features.keys())
            features.table(domain, [&](Table& flags) {
                flags.each([&](const std::string& flag, const toml::node& node) {
                    if (!node.is_boolean()) flags.reject(flag, node, "true or false");
                    content.featureFlags[domain][flag] = **node.as_boolean();
                });
            });
    });
    content.hasWatches = root.has("watches");
    root.tables("watches", Table::Arrays::Replaced, [&](Table& watch) { content.watches.push_back(readWatch(watch)); });
    root.table("account", [&](Table& account) { content.account = readAccount(account); });
    root.table("http", [&](Table& http) {
        content.http.caFile = http.absolutePath("ca_file");
        content.http.caFileSource = http.sourceOf("ca_file");
        content.http.namesApplications = http.boolean("source_application_header").value_or(false);
    });
    root.table("locale", [&](Table& locale) { readLocale(locale, content); });
    root.table("store", [&](Table& store) {
        content.storeLookupURL = store.string("lookup_url");
        content.purchaseHistoryURL = store.string("purchase_history_url");
    });
    root.table("applications", [&](Table& applications) {
        content.applicationFolders = applications.absolutePaths("folders");
        if (auto folder = applications.absolutePath("companion")) content.companionFolder = *folder;
    });
    content.hasCarriers = root.has("carriers");
    root.tables("carriers", Table::Arrays::Replaced, [&](Table& carrier) {
        const std::string slot = "slot " + std::to_string(content.carriers.size() + 1);
        content.carriers[carrier.string("service").value_or(slot)] = readCarrier(carrier);
    });
    root.table("machine", [&](Table& machine) {
        content.usesSystemBus = machine.boolean("system_bus").value_or(content.usesSystemBus);
    });
    root.table("network", [&](Table& network) { content.networkAvailable = network.boolean("available"); });
    root.table("activities", [&](Table& activities) {
        content.shouldDefer = activities.boolean("should_defer");
        content.minimumInterval = activities.duration("minimum_interval");
    });
    root.table("defaults", [&](Table& defaults) { readDefaults(defaults, content); });
    root.tables("bundles", Table::Arrays::AddedUp,
                [&](Table& bundle) { content.bundles.push_back(readBundle(bundle)); });
    return content;
}

bool needsTrust(const ProfileContent& content) {
    return !content.bundles.empty() || !content.defaults.empty() || content.http.caFile ||
           (content.account && !content.account->credentialHelper.empty());
}

// Each file is without a mistake, and so are they together: a value is of the same type in all of them.
ProfileContent readTogether(const std::vector<std::shared_ptr<const ProfileDocument>>& documents,
                            decltype(Surroundings::note) note) {
    std::vector<TableOfFile> tables;
    tables.reserve(documents.size());
    for (const auto& document : documents) tables.push_back({&document->root, &document->file});
    const Surroundings surroundings{.warn = [](toml::source_index, const std::string&) {},
                                    .areDefaultsBelieved = [](const ProfileFile& file) { return file.isTrusted(); },
                                    .note = std::move(note)};
    Table table(std::move(tables), "", surroundings);
    return readContent(table);
}

}  // namespace

std::optional<OpenToOthers> ProfileFile::findOpenToOthers() const {
    if (path.empty()) return std::nullopt;
    std::optional<OpenToOthers> open = host::findOpenToOthers(path, Links::Followed);
    if (!open && wasOpenToOthers)
        open = {path, Error{platform::error_domain::profile, EPERM, path + " could be changed by others"}};
    return open;
}

Result<ProfileReading> parseProfile(std::string_view text, const std::string& path) {
    const auto place = [&](toml::source_index line) { return path + ":" + std::to_string(line) + ": "; };
    Result<toml::table> root = parseToml(text, path, {platform::error_domain::profile, 0, ""});
    if (!root) return root.error();
    ProfileReading reading{std::make_shared<ProfileDocument>()};
    reading.document->file.path = path;
    reading.document->root = std::move(root).value();
    const Surroundings surroundings{
        .warn = [&](toml::source_index line,
                    const std::string& warning) { reading.warnings.push_back(place(line) + warning); },
        .areDefaultsBelieved = [](const ProfileFile&) { return true; }};
    try {
        Table table({{&reading.document->root, &reading.document->file}}, "", surroundings);
        reading.needsTrust = needsTrust(readContent(table));
        table.reportUnknown();
        return reading;
    } catch (const ProfileError& error) {
        return Error{platform::error_domain::profile, 0, place(error.line) + error.text};
    }
}

ProfileContent mergedContent(const std::vector<std::shared_ptr<const ProfileDocument>>& documents) {
    ProfileContent content = readTogether(documents, nullptr);
    content.isSubstitute = std::ranges::any_of(documents, [](const auto& document) { return document->isSubstitute; });
    return content;
}

std::vector<ProfileKey> mergedKeys(const std::vector<std::shared_ptr<const ProfileDocument>>& documents) {
    std::vector<ProfileKey> keys;
    readTogether(documents, [&](const std::string& key, const toml::node* node, const ProfileFile* file) {
        const bool needsTrust = key == "http.ca_file" || key == "account.credential_helper" ||
                                key.starts_with("bundles[") || key.starts_with("defaults.");
        if (node)
            keys.push_back(
                {key, valueOf(*node), *file, file->path + ":" + std::to_string(node->source().begin.line), needsTrust});
        else if (key.find('[') == key.npos)
            keys.push_back({key, nullptr});
    });
    return keys;
}

}  // namespace vrx::host
