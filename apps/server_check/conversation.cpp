#include "server_check/conversation.h"

#include <stdlib.h>

#include <filesystem>
#include <fstream>
#include <functional>
#include <mutex>
#include <stdexcept>
#include <system_error>
#include <utility>

#include "vrx/codec/codec.h"
#include "vrx/coverage/warranty_downloader.h"
#include "vrx/host/account/account_session.h"
#include "vrx/host/account/account_store.h"
#include "vrx/host/account/credentials.h"
#include "vrx/host/base/files.h"
#include "vrx/host/base/uuid.h"
#include "vrx/host/http/http.h"
#include "vrx/host/loop/main_loop.h"
#include "vrx/host/loop/process_lifecycle.h"
#include "vrx/host/loop/queues.h"
#include "vrx/host/profile/clock.h"
#include "vrx/host/profile/device_profile.h"
#include "vrx/platform/defaults_store.h"
#include "vrx/platform/log.h"
#include "vrx/platform/platform.h"
#include "vrx/platform/settings_keys.h"
#include "vrx/platform/url.h"
#include "vrx/platform/vendor.h"
#include "vrx/serverversion/server_version_utilities.h"
#include "vrx/service/register_defaults.h"

namespace vrx::server_check {

using platform::Dictionary;
using platform::HttpRequest;
using platform::HttpResponse;
using platform::Value;

namespace {

class FolderOfItsOwn {
public:
    FolderOfItsOwn() {
        std::string pattern = std::filesystem::canonical(std::filesystem::temp_directory_path()) / "vrx-check-XXXXXX";
        if (!mkdtemp(pattern.data())) throw std::system_error(errno, std::generic_category(), pattern);
        path_ = pattern;
    }
    ~FolderOfItsOwn() {
        std::error_code ignored;
        std::filesystem::remove_all(path_, ignored);
    }
    FolderOfItsOwn(const FolderOfItsOwn&) = delete;
    FolderOfItsOwn& operator=(const FolderOfItsOwn&) = delete;

    const std::string& path() const { return path_; }

private:
    std::string path_;
};

class SettingsInMemory final : public platform::DefaultsStore {
public:
    Value get(std::string_view key) const override {
        std::lock_guard lock(mutex_);
        for (const Dictionary* values : {&stored_, &registered_})
            if (const auto entry = values->find(key); entry != values->end()) return entry->second;
        return nullptr;
    }
    void set(std::string_view key, Value value) override {
        std::lock_guard lock(mutex_);
        if (value.isNull())
            stored_.erase(std::string(key));
        else
            stored_[std::string(key)] = std::move(value);
    }
    void update(std::string_view key, const std::function<Value(const Value&)>& change) override {
        set(key, change(get(key)));
    }
    void registerDefaults(const Dictionary& values) override {
        std::lock_guard lock(mutex_);
        for (const auto& [key, value] : values) registered_[key] = value;
    }
    Dictionary dictionaryRepresentation() const override {
        std::lock_guard lock(mutex_);
        Dictionary all = stored_;
        all.insert(registered_.begin(), registered_.end());
        return all;
    }

private:
    mutable std::mutex mutex_;
    Dictionary stored_, registered_;
};

// Keeps errors and drops everything else.
class Errors final : public platform::SystemLog {
public:
    bool isOn(platform::Level level) const override { return level == platform::Level::Error; }
    void write(const platform::LogEntry& entry) override {
        std::lock_guard lock(mutex_);
        texts_.push_back(entry.message());
    }
    std::vector<std::string> take() {
        std::lock_guard lock(mutex_);
        return std::exchange(texts_, {});
    }

private:
    std::mutex mutex_;
    std::vector<std::string> texts_;
};

// The host's sessions, which note what goes through them.
class NotedSessions final : public platform::HttpSessions {
public:
    NotedSessions(platform::HttpSessions& sessions, const platform::Clock& clock)
        : sessions_(sessions), clock_(clock) {}

    platform::HttpSession& shared() override { return shared_; }
    std::shared_ptr<platform::HttpSession> makeUncached() override {
        return std::make_shared<Noted>(*this, sessions_.makeUncached());
    }
    std::vector<Exchange> take() {
        std::lock_guard lock(mutex_);
        return std::exchange(exchanges_, {});
    }

private:
    class Noted final : public platform::HttpSession {
    public:
        Noted(NotedSessions& notes, std::shared_ptr<platform::HttpSession> session)
            : notes_(notes), owned_(std::move(session)) {}

        void send(HttpRequest request, platform::OnceCallback<HttpResponse> completion) override {
            platform::HttpSession& session = owned_ ? *owned_ : notes_.sessions_.shared();
            session.send(std::move(request),
                         [&notes = notes_, completion = std::move(completion)](HttpResponse response) mutable {
                             notes.note({response, notes.clock_.now()});
                             completion(std::move(response));
                         });
        }

    private:
        NotedSessions& notes_;
        const std::shared_ptr<platform::HttpSession> owned_;  // null: the shared one
    };
    void note(Exchange exchange) {
        std::lock_guard lock(mutex_);
        exchanges_.push_back(std::move(exchange));
    }

    platform::HttpSessions& sessions_;
    const platform::Clock& clock_;
    Noted shared_{*this, nullptr};
    std::mutex mutex_;
    std::vector<Exchange> exchanges_;
};

// A text as TOML has it.
std::string tomlText(std::string_view text) {
    std::string result = "\"";
    for (const char c : text) result.append(c == '"' || c == '\\' ? "\\" : "").append(1, c);
    return result + "\"";
}

// The account's profile, or one that is made up; above it, what options say.
std::vector<std::string> profileLayers(const CheckOptions& options, const std::string& home) {
    const std::string madeUp = home + "/account.toml", above = home + "/options.toml";
    std::ofstream(madeUp) << "[device]\nserial_number = " << tomlText(options.serialNumber)
                          << "\nproduct_type = 'Check'\nproduct_version = '" VRX_VERSION "'\n"
                          << "[account]\nidentifier = 'check@orvane.example'\nalt_dsid = '000000-00'\n"
                          << "[locale]\nlanguage = 'en_US'\n";
    std::ofstream file(above);
    if (options.caFile)
        file << "[http]\nca_file = " << tomlText(std::filesystem::absolute(*options.caFile).string()) << "\n";
    return {options.profile ? std::filesystem::absolute(*options.profile).string() : madeUp, above};
}

// What the agent has of its host, as far as it takes it to fetch a record. The parts are in the order of Host's.
class Surroundings {
public:
    explicit Surroundings(const CheckOptions& options)
        : profile_(profileLayers(options, home_.path())),
          accounts_(profile_, home_.path()),
          http_(queues_.workers(platform::Priority::UserInitiated), clock_, profile_) {
        platform_ = platform::Platform({.accountSession = &accountSession_,
                                        .accountStore = &accounts_,
                                        .clock = &clock_,
                                        .defaultsStore = &settings_,
                                        .deviceProperties = &profile_,
                                        .digest = &digest_,
                                        .featureFlags = &profile_,
                                        .files = &files_,
                                        .httpSessions = &noted_,
                                        .json = &json_,
                                        .locale = &profile_,
                                        .processLifecycle = &lifecycle_,
                                        .propertyList = &propertyList_,
                                        .queues = &queues_,
                                        .systemLog = &errors_,
                                        .uuidSource = &uuids_});
        vrx_registerDefaults(settings_);
        settings_.set(platform::settings::warrantyURL, options.url);
        if (options.serverVersionUrl)
            settings_.set(platform::settings::serverVersionURL, *options.serverVersionUrl);
        else  // the agent's own, as where no server tells any
            settings_.set("ServerVersionOverride", Dictionary{{std::string(platform::settings::lowServerVersion), 2},
                                                              {std::string(platform::settings::highServerVersion), 3}});
        storeToken(options);
    }
    ~Surroundings() { stop(); }
    Surroundings(const Surroundings&) = delete;
    Surroundings& operator=(const Surroundings&) = delete;

    // Nothing is asked or answered from now on.
    void stop() {
        http_.stop();
        accounts_.stop();
        queues_.stop();
    }
    host::MainLoop& loop() { return loop_; }
    NotedSessions& sessions() { return noted_; }
    Errors& errors() { return errors_; }
    const SettingsInMemory& settings() const { return settings_; }

private:
    // Where a profile names a credential helper, that gets the token.
    void storeToken(const CheckOptions& options) {
        const auto account = accounts_.primaryCloudAccount();
        const auto signing = account ? accounts_.authenticationAccount(*account) : std::nullopt;
        if (!signing || (options.profile && !options.token)) return;
        const std::string token = options.token.value_or("development-token");
        if (!host::isToken(token)) throw std::runtime_error("the token holds more than visible ASCII characters");
        if (auto error = host::Credentials(home_.path())
                             .store(signing->identifier, platform::vendorIdentifier(".ks.supportapp.auth"), token))
            throw std::runtime_error(error->text);
    }

    FolderOfItsOwn home_;
    Errors errors_;
    codec::Digest digest_;
    codec::Json json_;
    codec::PropertyList propertyList_;
    platform::Platform platform_{{.digest = &digest_, .systemLog = &errors_}};
    platform::ScopedPlatform current_{platform_};
    host::MainLoop loop_;
    host::ProcessLifecycle lifecycle_{loop_};
    host::Queues queues_{loop_};
    host::Files files_{home_.path()};
    host::UuidSource uuids_;
    SettingsInMemory settings_;
    host::DeviceProfile profile_;
    host::AccountStore accounts_;
    host::AccountSession accountSession_{profile_};
    host::Clock clock_{profile_};
    host::HttpSessions http_;
    NotedSessions noted_{http_, clock_};
};

}  // namespace

// The versions are asked for alone, so that what is said of them can be told from what is said of the record; then the
// record is downloaded as far as it goes. Answers come on workers and are taken on the main loop.
void converse(const CheckOptions& options, const std::function<void(const Conversation&)>& use) {
    Surroundings surroundings(options);
    host::MainLoop& loop = surroundings.loop();
    Conversation conversation;
    bool hasEnded = false;
    auto takeRecord = [&](bool, std::shared_ptr<VRXWarranty> record) {
        loop.post([&, record = std::move(record)] {
            conversation.record = record;
            hasEnded = true;
            loop.stop();
        });
    };
    auto takeVersions = [&](bool isSupported) {
        loop.post([&, isSupported] {
            conversation.isServerVersionSupported = isSupported;
            conversation.versionErrors = surroundings.errors().take();
            conversation.versionExchanges = surroundings.sessions().take();
            conversation.isHighVersionShared = VRXServerVersionUtilities::isHighServerVersionFeaturesetEnabled();
            surroundings.errors().take();
            platform::Platform::current().queues().workers(platform::Priority::UserInitiated).post([&] {
                VRXWarrantyDownloader::initWithCallingProcessBundleID("com.orvane.vrxagent.check")
                    ->_downloadWarrantyForSerialNumber(options.serialNumber, takeRecord);
            });
        });
    };
    loop.post([&] { VRXServerVersionUtilities::serverVersionSupported(takeVersions); });
    loop.postAfter(platform::Duration(options.seconds), [&] {
        conversation.isTimedOut = true;
        loop.stop();
    });
    loop.run();
    conversation.isStopped = !hasEnded && !conversation.isTimedOut;
    conversation.isTimedOut &= !hasEnded;
    surroundings.stop();

    auto& exchanges =
        conversation.isServerVersionSupported ? conversation.coverageExchanges : conversation.versionExchanges;
    exchanges = surroundings.sessions().take();
    (conversation.isServerVersionSupported ? conversation.coverageErrors : conversation.versionErrors) =
        surroundings.errors().take();
    conversation.versions = surroundings.settings().get(serverVersionCacheKey);
    if (conversation.record) conversation.keptRecord = VRXWarranty::cachedWarrantyForSerialNumber(options.serialNumber);
    use(conversation);
}

}  // namespace vrx::server_check
