#include "vrx/host/profile/device_profile.h"

#include <algorithm>
#include <cerrno>
#include <set>

#include "vrx/codec/core/number_format.h"
#include "vrx/host/base/text.h"
#include "vrx/host/profile/toml_value.h"
#include "vrx/platform/log.h"

namespace vrx::host {

using platform::Date;
using platform::Error;
using platform::Level;
using platform::PairedWatch;
using platform::Result;

namespace {

// A mistake in the profile, thrown at its line.
struct ProfileError {
    toml::source_index line;
    std::string text;
};

// One table of the profile. Returns its entries by type, and reports in the end the keys that nobody asked for.
class Table {
public:
    using Unknown = std::function<void(toml::source_index line, const std::string& name)>;

    Table(const toml::table& table, std::string prefix, const Unknown& unknown)
        : table_(table), prefix_(std::move(prefix)), unknown_(unknown) {}

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
        if (!text || text->empty()) throw ProfileError{table_.source().begin.line, prefix_ + key + " is missing"};
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

    // A program and its arguments.
    std::vector<std::string> command(const char* key) {
        std::vector<std::string> words = strings(key);
        if (!words.empty() && !words[0].starts_with('/'))
            reject(key, *find(key), "a list that begins with an absolute path");
        return words;
    }

    bool isFalse(const char* key) {
        const toml::node* node = find(key);
        return node && node->is_boolean() && !**node->as_boolean();
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

    // Calls with the table under the key, if there is one, and reports its unknown keys.
    template <class F>
    void table(const char* key, F read) {
        const toml::node* node = find(key);
        if (!node) return;
        if (!node->is_table()) reject(key, *node, "a table");
        enter(*node->as_table(), prefix_ + key + ".", read);
    }

    template <class F>
    void tables(const char* key, F read) {
        const toml::node* node = find(key);
        if (!node) return;
        const toml::array* array = node->as_array();
        if (!array) reject(key, *node, "a list of tables, [[" + prefix_ + key + "]]");
        for (const toml::node& element : *array) {
            if (!element.is_table()) reject(key, element, "a list of tables");
            enter(*element.as_table(), prefix_ + key + ".", read);
        }
    }

    // Calls with every key and its node.
    template <class F>
    void each(F read) {
        for (const auto& [key, node] : table_) {
            known_.insert(std::string(key.str()));
            read(std::string(key.str()), node);
        }
    }

    [[noreturn]] void reject(const std::string& key, const toml::node& node, const std::string& wanted) const {
        throw ProfileError{node.source().begin.line, prefix_ + key + " must be " + wanted};
    }

    void reportUnknown() const {
        for (const auto& [key, node] : table_)
            if (!known_.contains(std::string(key.str()))) unknown_(key.source().begin.line, prefix_ + std::string(key));
    }

private:
    const toml::node* find(const char* key) {
        known_.insert(key);
        return table_.get(key);
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
    void enter(const toml::table& table, std::string prefix, F read) const {
        Table inner(table, std::move(prefix), unknown_);
        read(inner);
        inner.reportUnknown();
    }

    const toml::table& table_;
    const std::string prefix_;
    const Unknown& unknown_;
    std::set<std::string> known_;
};

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
    bundle.executables = table.strings("executables");
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
        table.table("authentication", [&](Table& authentication) {
            if (auto identifier = authentication.line("identifier")) account.authentication->identifier = *identifier;
            if (auto altDSID = authentication.line("alt_dsid")) account.authentication->altDSID = *altDSID;
        });
    }
    account.credentialHelper = table.command("credential_helper");
    account.storefront = table.line("storefront");
    account.storeAccountIdentifier = table.integer("store_account_identifier");
    account.clientInformation = table.line("client_information");
    account.deviceIdentifier = table.line("device_identifier");
    table.table("headers", [&](Table& headers) { account.headers = readHeaders(headers); });
    return account.identifier.empty() ? std::nullopt : std::optional(std::move(account));
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
        features.each([&](const std::string& domain, const toml::node& node) {
            if (!node.is_table()) features.reject(domain, node, "a table of flags, [features." + domain + "]");
            for (const auto& [flag, value] : *node.as_table()) {
                if (!value.is_boolean()) features.reject(domain + "." + std::string(flag), value, "true or false");
                content.featureFlags[domain][std::string(flag)] = **value.as_boolean();
            }
        });
    });
    root.tables("watches", [&](Table& watch) { content.watches.push_back(readWatch(watch)); });
    root.table("account", [&](Table& account) { content.account = readAccount(account); });
    root.table("http", [&](Table& http) {
        content.http.caFile = http.absolutePath("ca_file");
        content.http.namesApplications = http.boolean("source_application_header").value_or(false);
    });
    root.table("locale", [&](Table& locale) {
        if (std::optional<std::string> language = locale.string("language"))
            content.language = localeIdentifierFromPosix(*language);
        content.timeZone = locale.string("time_zone");
    });
    root.table("store", [&](Table& store) {
        content.storeLookupURL = store.string("lookup_url");
        content.purchaseHistoryURL = store.string("purchase_history_url");
    });
    root.table("applications", [&](Table& applications) {
        content.applicationFolders = applications.strings("folders");
        if (auto folder = applications.string("companion")) content.companionFolder = *folder;
    });
    root.tables("carriers", [&](Table& carrier) {
        const std::string slot = "slot " + std::to_string(content.carriers.size() + 1);
        content.carriers[carrier.string("service").value_or(slot)] = readCarrier(carrier);
    });
    root.table("network", [&](Table& network) { content.networkAvailable = network.boolean("available"); });
    root.table("activities", [&](Table& activities) {
        content.shouldDefer = activities.boolean("should_defer");
        content.minimumInterval = activities.duration("minimum_interval");
    });
    root.tables("bundles", [&](Table& bundle) { content.bundles.push_back(readBundle(bundle)); });
    return content;
}

bool needsTrust(const ProfileContent& content) {
    return !content.bundles.empty() || content.http.caFile ||
           (content.account && !content.account->credentialHelper.empty());
}

// Reads the file. Reports each thing once, although a file that has just changed is read several times.
class ProfileReader {
public:
    explicit ProfileReader(std::string path) : path_(std::move(path)) {}

    // Without a file the content is empty. A file that cannot be understood leaves the last content in place.
    std::shared_ptr<const ProfileContent> operator()(const Result<FileContent>& file,
                                                     std::shared_ptr<const ProfileContent> last) {
        if (!last) {
            ProfileContent substitute;
            substitute.isSubstitute = true;
            last = std::make_shared<const ProfileContent>(substitute);
        }
        if (!file && file.error().code == ENOENT) return std::make_shared<const ProfileContent>();
        Result<ProfileReading> reading = file ? parseProfile(file->text(), path_) : file.error();
        if (!reading) {
            report(Level::Error, reading.error().text + "; the device profile is not taken over");
            return last;
        }
        auto [content, warnings] = std::move(reading).value();
        content.path = path_;
        content.wasOpenToOthers = findOpenToOthers(path_, file->status).has_value();
        if (const auto open = needsTrust(content) ? content.findOpenToOthers() : std::nullopt)
            warnings.push_back(open->path +
                               ": others can write it; the bundles, http.ca_file and account.credential_helper of " +
                               path_ + " are not believed");
        std::string text;
        for (const std::string& warning : warnings) text += (text.empty() ? "" : "; ") + warning;
        report(Level::Default, text);
        return std::make_shared<const ProfileContent>(std::move(content));
    }

private:
    void report(Level level, const std::string& text) {
        if (std::exchange(reported_, text) != text && !text.empty()) log(level, "%@", text);
    }

    std::string path_;
    std::string reported_;
};

}  // namespace

std::optional<OpenToOthers> ProfileContent::findOpenToOthers() const {
    if (path.empty()) return std::nullopt;
    std::optional<OpenToOthers> open = host::findOpenToOthers(path, Links::Followed);
    if (!open && wasOpenToOthers)
        open = {path, Error{platform::error_domain::profile, EPERM, path + " could be changed by others"}};
    return open;
}

Result<ProfileReading> parseProfile(std::string_view document, const std::string& path) {
    auto place = [&](toml::source_index line) { return path + ":" + std::to_string(line) + ": "; };
    ProfileReading reading;
    const Table::Unknown unknown = [&](toml::source_index line, const std::string& name) {
        reading.warnings.push_back(place(line) + "the key " + name + " is not known");
    };
    try {
        const toml::table root = toml::parse(document);
        Table table(root, "", unknown);
        reading.content = readContent(table);
        table.reportUnknown();
        return reading;
    } catch (const toml::parse_error& error) {
        return Error{platform::error_domain::profile, 0,
                     place(error.source().begin.line) + std::string(error.description())};
    } catch (const ProfileError& error) {
        return Error{platform::error_domain::profile, 0, place(error.line) + error.text};
    }
}

DeviceProfile::DeviceProfile(std::string path, std::string machineRoot)
    : path_(std::move(path)), machine_(machineRoot), content_(path_, ProfileReader(path_)) {}

std::vector<std::string> DeviceProfile::sources() const {
    std::vector<std::string> files = machine_.localeFiles();
    if (!path_.empty()) files.push_back(path_);
    return files;
}

std::optional<std::string> DeviceProfile::string(std::string_view key) const {
    const std::shared_ptr<const ProfileContent> content = this->content();
    if (key == "SerialNumber") return content->serialNumber ? content->serialNumber : machine_.serialNumber();
    if (key == "UserAssignedDeviceName") return content->name ? content->name : machine_.name();
    if (key == "ProductType") return content->productType ? content->productType : machine_.productType();
    if (key == "ProductVersion") return content->productVersion ? content->productVersion : machine_.productVersion();
    return std::nullopt;
}

bool DeviceProfile::isInternalInstall() const {
    return content()->isInternal;
}

std::optional<std::string> DeviceProfile::preferredContentSizeCategory() const {
    return content()->contentSizeCategory;
}

bool DeviceProfile::isEnabled(std::string_view domain, std::string_view flag) const {
    const std::shared_ptr<const ProfileContent> content = this->content();
    auto flags = content->featureFlags.find(std::string(domain));
    if (flags == content->featureFlags.end()) return false;
    auto entry = flags->second.find(std::string(flag));
    return entry != flags->second.end() && entry->second;
}

std::vector<PairedWatch> DeviceProfile::watches() const {
    return content()->watches;
}

std::string DeviceProfile::preferredLocaleIdentifier() const {
    const std::shared_ptr<const ProfileContent> content = this->content();
    return content->language ? *content->language : machine_.localeIdentifier();
}

std::string DeviceProfile::decimalText(std::uint64_t number) const {
    return codec::decimalText(number, preferredLocaleIdentifier());
}

}  // namespace vrx::host
