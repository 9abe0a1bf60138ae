#include "vrx/client/local_platform.h"

#include <chrono>
#include <cstdlib>
#include <ctime>
#include <mutex>
#include <optional>
#include <string>

#include "vrx/codec/core/number_format.h"
#include "vrx/platform/clock.h"
#include "vrx/platform/defaults_store.h"
#include "vrx/platform/locale.h"
#include "vrx/platform/log.h"
#include "vrx/platform/platform.h"
#include "vrx/platform/settings_keys.h"

namespace vrx::client {

using platform::Dictionary;
using platform::Duration;
using platform::Platform;
using platform::Value;

namespace {

class SystemClock final : public platform::Clock {
    platform::Date now() const override { return std::chrono::system_clock::now(); }
    std::chrono::seconds timeZoneOffset() const override {
        const std::time_t now = std::time(nullptr);
        std::tm local{};
        localtime_r(&now, &local);
        return std::chrono::seconds(local.tm_gmtoff);
    }
};

// What setLocalSurroundings() has set. Never destroyed, as the platform.
struct SetSurroundings {
    std::mutex mutex;
    std::optional<std::string> locale;
    Duration day{86400};
};

SetSurroundings& setSurroundings() {
    static SetSurroundings& surroundings = *new SetSurroundings;
    return surroundings;
}

class LocalLocale final : public platform::Locale {
    std::string preferredLocaleIdentifier() const override {
        {
            std::lock_guard lock(setSurroundings().mutex);
            if (setSurroundings().locale) return *setSurroundings().locale;
        }
        for (const char* variable : {"LC_ALL", "LC_MESSAGES", "LANG"}) {
            const char* value = std::getenv(variable);
            if (!value || *value == '\0') continue;
            std::string identifier(value);  // such as de_DE.UTF-8 or de_DE@euro
            identifier.resize(std::min(identifier.find_first_of(".@"), identifier.size()));
            return identifier == "C" || identifier == "POSIX" ? "en_US" : identifier;
        }
        return "en_US";
    }
    std::string decimalText(std::uint64_t number) const override {
        return codec::decimalText(number, preferredLocaleIdentifier());
    }
};

// The one setting that records read. Nothing is stored.
class LocalDefaults final : public platform::DefaultsStore {
    Value get(std::string_view key) const override { return Value(dictionaryRepresentation())[key]; }
    void set(std::string_view, Value) override {}
    void update(std::string_view, const std::function<Value(const Value&)>&) override {}
    void registerDefaults(const Dictionary&) override {}
    Dictionary dictionaryRepresentation() const override {
        std::lock_guard lock(setSurroundings().mutex);
        return {{std::string(platform::settings::oneDayInterval), setSurroundings().day.count()}};
    }
};

class NoLog final : public platform::SystemLog {
    bool isOn(platform::Level) const override { return false; }
    void write(const platform::LogEntry&) override {}
};

struct LocalPlatform {
    SystemClock clock;
    LocalLocale locale;
    LocalDefaults defaults;
    NoLog log;
    Platform platform{{.clock = &clock, .defaultsStore = &defaults, .locale = &locale, .systemLog = &log}};
};

}  // namespace

void installPlatformIfNone() {
    static std::mutex mutex;
    std::lock_guard lock(mutex);
    if (Platform::hasCurrent()) return;
    // Never destroyed: records may still be read while the process ends.
    static LocalPlatform& local = *new LocalPlatform;
    Platform::setCurrent(&local.platform);
}

void setLocalSurroundings(const std::string& locale, platform::Duration day) {
    std::lock_guard lock(setSurroundings().mutex);
    setSurroundings().locale = locale;
    setSurroundings().day = day;
}

}  // namespace vrx::client
