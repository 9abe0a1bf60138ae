// The Marketplace's catalogue: its configuration, and the lookup of applications in it. Any thread may use it.
#pragma once

#include <cstdint>
#include <memory>
#include <optional>
#include <string>
#include <vector>

#include "vrx/platform/error.h"
#include "vrx/platform/task.h"

namespace vrx::platform {

// What a client of the store asks its configuration for.
struct StoreProfile {
    std::string name;
    std::string version;
    std::vector<std::string> bagKeys;
};

// The configuration of the store for a profile.
class StoreBag {
public:
    virtual ~StoreBag() = default;
};

struct StoreArtwork {
    std::optional<std::string> imageURL{};
};

struct StoreItem {
    std::optional<std::string> displayName{};
    std::optional<std::string> artistName{};
    std::vector<StoreArtwork> artwork{};
    std::optional<std::string> productPageURL{};
};

// How much a lookup returns about each item.
enum class StoreKeyProfile { Lockup };  // the compact one

class StoreLookup {
public:
    virtual ~StoreLookup() = default;
    using Completion = OnceCallback<Result<std::vector<StoreItem>>>;
    // Completes once, on a thread of the platform's choosing. The caller may release the lookup meanwhile.
    virtual void lookUp(const std::vector<std::string>& bundleIdentifiers,
                        const std::vector<std::string>& itemIdentifiers, Completion completion) = 0;
};

class Store {
public:
    virtual ~Store() = default;
    // The profile that a lookup needs in the configuration.
    virtual StoreProfile lookupProfile() const = 0;
    // Makes the profile's keys available in every bag that is opened for it from now on.
    virtual void registerBagKeys(const StoreProfile& profile) = 0;
    virtual std::shared_ptr<StoreBag> openBag(const std::string& profile, const std::string& version) = 0;
    virtual std::unique_ptr<StoreLookup> makeLookup(std::shared_ptr<StoreBag> bag, std::string callerName,
                                                    StoreKeyProfile keyProfile) = 0;
};

}  // namespace vrx::platform
