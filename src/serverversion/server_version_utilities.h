// Which protocol versions the coverage server and this agent share. The server's stand in a small document on the
// configuration CDN, the client's in the defaults; the last document is kept in the defaults. Any thread may ask; what
// needs the network is answered on a worker, everything else before the call returns.
#pragma once

#include <cstdint>
#include <optional>
#include <set>
#include <string>
#include <string_view>

#include "vrx/platform/task.h"
#include "vrx/platform/value.h"

namespace vrx {

// Where the server's versions may come from. Any other value is as Default.
using VRXServerLookupPolicy = std::int64_t;
inline constexpr VRXServerLookupPolicy VRXServerLookupPolicyDefault = 0;  // the cache, else the network
inline constexpr VRXServerLookupPolicy VRXServerLookupPolicyLocal = 1;    // the cache, never the network
inline constexpr VRXServerLookupPolicy VRXServerLookupPolicyRefresh = 2;  // the network, else the cache

// The defaults key of the last server document; removing it makes the next lookup start afresh.
inline constexpr std::string_view serverVersionCacheKey = "ServerVersionCache";

class VRXServerVersionUtilities {
public:
    // At most two versions, the low and the high one; those between them are no members.
    using VersionSet = std::set<double>;
    template <class T>
    using Completion = platform::OnceCallback<T>;

    VRXServerVersionUtilities() = delete;

    // Refreshes the server's versions, then: is any version shared?
    static void serverVersionSupported(Completion<bool> completion);

    // Is the client's high version shared?
    static void isHighServerVersionFeaturesetEnabled(VRXServerLookupPolicy policy, Completion<bool> completion);
    static void isHighServerVersionFeaturesetEnabled(Completion<bool> completion);
    static bool isHighServerVersionFeaturesetEnabled();  // answers at once, from what is stored

    // The override of the web-flow URL; null when there is none.
    static platform::Value readWebURLOverride();

    // The versions that both sides share; nothing when the server's cannot be read.
    static void _supportedVersionsForClientAndServer(VRXServerLookupPolicy policy,
                                                     Completion<std::optional<VersionSet>> completion);
    // The dictionary of a property-list document, null when it cannot be had. A document that is no dictionary is, with
    // shouldRetry, fetched once more past all caches.
    static void _dictionaryFromURL(std::string url, bool shouldRetry, Completion<platform::Value> completion);
    // The stored version dictionary, null when there is none; anything else stored there is removed.
    static platform::Value _getValidServerVersionCache();
};

}  // namespace vrx
