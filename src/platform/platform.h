// The facilities of the host, one accessor each. The current platform is set once, first thing in a program, or by a
// ScopedPlatform in a test or simulation; it is the program's only global.
#pragma once

namespace vrx::platform {

class AccountStore;
class BundleLookup;
class Clock;
class DefaultsStore;
class DeviceProperties;
class Digest;
class FeatureFlags;
class Files;
class HttpSessions;
class Json;
class Locale;
class PairedDeviceRegistry;
class PropertyList;
class Queues;
class ServiceListenerFactory;
class SystemLog;

class Platform {
public:
    // A platform need not have all of them: a client that only reads records does without most.
    struct Facilities {
        AccountStore* accountStore = nullptr;
        BundleLookup* bundleLookup = nullptr;
        Clock* clock = nullptr;
        DefaultsStore* defaultsStore = nullptr;
        DeviceProperties* deviceProperties = nullptr;
        Digest* digest = nullptr;
        FeatureFlags* featureFlags = nullptr;
        Files* files = nullptr;
        HttpSessions* httpSessions = nullptr;
        Json* json = nullptr;
        Locale* locale = nullptr;
        PairedDeviceRegistry* pairedDeviceRegistry = nullptr;
        PropertyList* propertyList = nullptr;
        Queues* queues = nullptr;
        ServiceListenerFactory* serviceListenerFactory = nullptr;
        SystemLog* systemLog = nullptr;
    };

    // The facilities are not owned and must outlive the platform.
    explicit Platform(const Facilities& facilities) : facilities_(facilities) {}

    // Ends the program when none is set.
    static Platform& current();
    static bool hasCurrent();
    // For a program's start; null takes it away again.
    static void setCurrent(Platform* platform);

    // Each ends the program when the platform does not have the facility.
    AccountStore& accountStore() const { return need(facilities_.accountStore, "AccountStore"); }
    BundleLookup& bundleLookup() const { return need(facilities_.bundleLookup, "BundleLookup"); }
    Clock& clock() const { return need(facilities_.clock, "Clock"); }
    DefaultsStore& defaultsStore() const { return need(facilities_.defaultsStore, "DefaultsStore"); }
    DeviceProperties& deviceProperties() const { return need(facilities_.deviceProperties, "DeviceProperties"); }
    Digest& digest() const { return need(facilities_.digest, "Digest"); }
    FeatureFlags& featureFlags() const { return need(facilities_.featureFlags, "FeatureFlags"); }
    Files& files() const { return need(facilities_.files, "Files"); }
    HttpSessions& httpSessions() const { return need(facilities_.httpSessions, "HttpSessions"); }
    Json& json() const { return need(facilities_.json, "Json"); }
    Locale& locale() const { return need(facilities_.locale, "Locale"); }
    PairedDeviceRegistry& pairedDeviceRegistry() const {
        return need(facilities_.pairedDeviceRegistry, "PairedDeviceRegistry");
    }
    PropertyList& propertyList() const { return need(facilities_.propertyList, "PropertyList"); }
    Queues& queues() const { return need(facilities_.queues, "Queues"); }
    ServiceListenerFactory& serviceListenerFactory() const {
        return need(facilities_.serviceListenerFactory, "ServiceListenerFactory");
    }
    SystemLog& systemLog() const { return need(facilities_.systemLog, "SystemLog"); }

private:
    [[noreturn]] static void missing(const char* facility);
    template <class T>
    static T& need(T* facility, const char* name) {
        if (!facility) missing(name);
        return *facility;
    }

    Facilities facilities_;
};

// Makes a platform the current one while it is alive, and then the one before again. Not while other threads use the
// current one.
class ScopedPlatform {
public:
    explicit ScopedPlatform(Platform& platform);
    ~ScopedPlatform();
    ScopedPlatform(const ScopedPlatform&) = delete;
    ScopedPlatform& operator=(const ScopedPlatform&) = delete;

private:
    Platform* previous_;
};

}  // namespace vrx::platform
