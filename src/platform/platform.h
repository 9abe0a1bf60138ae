// The facilities of the host, one accessor each. The current platform is set once, first thing in a program, or by a
// ScopedPlatform in a test or simulation; it is the program's only global.
#pragma once

namespace vrx::platform {

class AccountSession;
class AccountStore;
class BackgroundActivities;
class BundleLookup;
class Clock;
class DefaultsStore;
class DeviceProperties;
class Digest;
class FeatureFlags;
class Files;
class FollowUpControllers;
class HttpSessions;
class InstalledApps;
class Json;
class Locale;
class LocalizedStrings;
class NotificationCenter;
class PairedDeviceRegistry;
class ProcessLifecycle;
class PropertyList;
class PurchaseHistory;
class Queues;
class ServiceListenerFactory;
class Store;
class SystemLog;
class TelephonyNetworkInfo;
class UuidSource;

class Platform {
public:
    // A platform need not have all of them: a client that only reads records needs few.
    struct Facilities {
        AccountSession* accountSession = nullptr;
        AccountStore* accountStore = nullptr;
        BackgroundActivities* backgroundActivities = nullptr;
        BundleLookup* bundleLookup = nullptr;
        Clock* clock = nullptr;
        DefaultsStore* defaultsStore = nullptr;
        DeviceProperties* deviceProperties = nullptr;
        Digest* digest = nullptr;
        FeatureFlags* featureFlags = nullptr;
        Files* files = nullptr;
        FollowUpControllers* followUpControllers = nullptr;
        HttpSessions* httpSessions = nullptr;
        InstalledApps* installedApps = nullptr;
        Json* json = nullptr;
        Locale* locale = nullptr;
        LocalizedStrings* localizedStrings = nullptr;
        NotificationCenter* notificationCenter = nullptr;
        PairedDeviceRegistry* pairedDeviceRegistry = nullptr;
        ProcessLifecycle* processLifecycle = nullptr;
        PropertyList* propertyList = nullptr;
        PurchaseHistory* purchaseHistory = nullptr;
        Queues* queues = nullptr;
        ServiceListenerFactory* serviceListenerFactory = nullptr;
        Store* store = nullptr;
        SystemLog* systemLog = nullptr;
        TelephonyNetworkInfo* telephonyNetworkInfo = nullptr;
        UuidSource* uuidSource = nullptr;
    };

    // The facilities are not owned and must outlive the platform.
    explicit Platform(const Facilities& facilities) : facilities_(facilities) {}

    // Ends the program when no platform is set.
    static Platform& current();
    static bool hasCurrent();
    // Called when a program starts; null removes the platform again.
    static void setCurrent(Platform* platform);

    // Each accessor ends the program when the platform lacks the facility.
    AccountSession& accountSession() const { return need(facilities_.accountSession, "AccountSession"); }
    AccountStore& accountStore() const { return need(facilities_.accountStore, "AccountStore"); }
    BackgroundActivities& backgroundActivities() const {
        return need(facilities_.backgroundActivities, "BackgroundActivities");
    }
    BundleLookup& bundleLookup() const { return need(facilities_.bundleLookup, "BundleLookup"); }
    Clock& clock() const { return need(facilities_.clock, "Clock"); }
    DefaultsStore& defaultsStore() const { return need(facilities_.defaultsStore, "DefaultsStore"); }
    DeviceProperties& deviceProperties() const { return need(facilities_.deviceProperties, "DeviceProperties"); }
    Digest& digest() const { return need(facilities_.digest, "Digest"); }
    FeatureFlags& featureFlags() const { return need(facilities_.featureFlags, "FeatureFlags"); }
    Files& files() const { return need(facilities_.files, "Files"); }
    FollowUpControllers& followUpControllers() const {
        return need(facilities_.followUpControllers, "FollowUpControllers");
    }
    HttpSessions& httpSessions() const { return need(facilities_.httpSessions, "HttpSessions"); }
    InstalledApps& installedApps() const { return need(facilities_.installedApps, "InstalledApps"); }
    Json& json() const { return need(facilities_.json, "Json"); }
    Locale& locale() const { return need(facilities_.locale, "Locale"); }
    LocalizedStrings& localizedStrings() const { return need(facilities_.localizedStrings, "LocalizedStrings"); }
    NotificationCenter& notificationCenter() const {
        return need(facilities_.notificationCenter, "NotificationCenter");
    }
    PairedDeviceRegistry& pairedDeviceRegistry() const {
        return need(facilities_.pairedDeviceRegistry, "PairedDeviceRegistry");
    }
    ProcessLifecycle& processLifecycle() const { return need(facilities_.processLifecycle, "ProcessLifecycle"); }
    PropertyList& propertyList() const { return need(facilities_.propertyList, "PropertyList"); }
    PurchaseHistory& purchaseHistory() const { return need(facilities_.purchaseHistory, "PurchaseHistory"); }
    Queues& queues() const { return need(facilities_.queues, "Queues"); }
    ServiceListenerFactory& serviceListenerFactory() const {
        return need(facilities_.serviceListenerFactory, "ServiceListenerFactory");
    }
    Store& store() const { return need(facilities_.store, "Store"); }
    SystemLog& systemLog() const { return need(facilities_.systemLog, "SystemLog"); }
    TelephonyNetworkInfo& telephonyNetworkInfo() const {
        return need(facilities_.telephonyNetworkInfo, "TelephonyNetworkInfo");
    }
    UuidSource& uuidSource() const { return need(facilities_.uuidSource, "UuidSource"); }

private:
    [[noreturn]] static void missing(const char* facility);
    template <class T>
    static T& need(T* facility, const char* name) {
        if (!facility) missing(name);
        return *facility;
    }

    Facilities facilities_;
};

// Makes a platform the current one for as long as this object lives, then restores the one before. No other thread may
// use the current platform at these two moments.
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
