// Which protocol versions the coverage server and this agent share. The server publishes its versions in a small
// document on the configuration CDN. The agent's versions are in the defaults, where the last document is kept as well.
// Any thread may ask. An answer that needs the network comes on a worker, every other one before the call returns.
// A leading "_" is spelled so on purpose; "Names" in docs/architecture.md says why.
#pragma once

#include <cstdint>
#include <optional>
#include <set>
#include <string>
#include <string_view>

#include "vrx/platform/task.h"
#include "vrx/platform/value.h"

namespace vrx {

// Where the server's versions may come from. Any other value means Default.
using VRXServerLookupPolicy = std::int64_t;
inline constexpr VRXServerLookupPolicy VRXServerLookupPolicyDefault = 0;  // the cache, else the network
inline constexpr VRXServerLookupPolicy VRXServerLookupPolicyLocal = 1;    // the cache, never the network
inline constexpr VRXServerLookupPolicy VRXServerLookupPolicyRefresh = 2;  // the network, else the cache

// The defaults key of the last server document; removing it makes the next lookup start afresh.
inline constexpr std::string_view serverVersionCacheKey = "ServerVersionCache";

class VRXServerVersionUtilities {
public:
    // Numbers by their exact value: as doubles, large integers would not all be told apart.
    struct NumericOrder {
        bool operator()(const platform::Value& one, const platform::Value& other) const;
    };
    // At most two versions, the low and the high one; the versions between them are not members.
    using VersionSet = std::set<platform::Value, NumericOrder>;
    template <class T>
    using Completion = platform::OnceCallback<T>;

    VRXServerVersionUtilities() = delete;

    // Refreshes the server's versions, then answers whether any version is shared.
    static void serverVersionSupported(Completion<bool> completion);

    // Answers whether the client's high version is shared. "Featureset" is spelled so on purpose.
    static void isHighServerVersionFeaturesetEnabled(VRXServerLookupPolicy policy, Completion<bool> completion);
    static void isHighServerVersionFeaturesetEnabled(Completion<bool> completion);
    static bool isHighServerVersionFeaturesetEnabled();  // answers at once, from what is stored

    // The override of the web-flow URL; null when there is none.
    static platform::Value readWebURLOverride();

    // The versions that both sides share; null when the server's cannot be read.
    static void _supportedVersionsForClientAndServer(VRXServerLookupPolicy policy,
                                                     Completion<std::optional<VersionSet>> completion);
    // Completes with the dictionary of a property-list document, or with null when there is none. With shouldRetry, a
    // document that is not a dictionary is fetched once more, past all caches.
    static void _dictionaryFromURL(std::string url, bool shouldRetry, Completion<platform::Value> completion);
    // The stored version dictionary, or null when there is none. Anything else that is stored there is removed.
    static platform::Value _getValidServerVersionCache();
};

}  // namespace vrx
