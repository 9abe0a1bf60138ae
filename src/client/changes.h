// The client library: told when something that an application shows may be other than before.
//
//     vrx::client::Changes changes([&](const vrx::client::Change& change) {
//         if (change.followUps) …                  // on the library's thread: hand it over to your own, and ask there
//     });
//
// It keeps one connection, on which the agent says that something has changed and nothing more; what it is has to be
// asked. When the connection ends, because the agent starts anew or is gone, it connects again by itself: after a
// second, and then after twice as long each time, up to a minute.
#pragma once

#include <functional>
#include <memory>
#include <optional>

#include "vrx/client/answer.h"
#include "vrx/platform/api.h"

namespace vrx::client {

struct Change {
    bool followUps = false;  // FollowUps::pending() may answer something else
    bool coverage = false;   // so may AgentConnection's operations: a record, a device or the language is another
    // Why there is no connection, once each time. When there is one, both of the above are true once: something may
    // have changed meanwhile.
    std::optional<Failure> failure{};
};

class VRX_CLIENT_API Changes final {
public:
    // Called on a thread of the library, one change after the other.
    using Handler = std::function<void(const Change& change)>;

    // Of the options, the connections do not matter; the time limit is that of connecting, ten seconds at most.
    explicit Changes(Handler handler, ConnectionOptions options = {});
    // No change is told after it has returned. It must not run within the handler.
    ~Changes();
    Changes(const Changes&) = delete;
    Changes& operator=(const Changes&) = delete;

private:
    class Listener;
    const std::unique_ptr<Listener> listener_;
};

}  // namespace vrx::client
