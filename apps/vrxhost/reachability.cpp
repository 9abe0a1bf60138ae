#include "vrxhost/reachability.h"

#include "vrx/host/http/http.h"
#include "vrx/host/loop/main_loop.h"
#include "vrx/host/loop/queues.h"
#include "vrx/platform/clock.h"
#include "vrx/platform/settings_keys.h"
#include "vrx/serverversion/server_version_utilities.h"

namespace vrx::apps {

using platform::HttpResponse;
using platform::Platform;

// Answers come on workers and are noted on the main loop, which ends with the last answer or the time limit. Sessions
// and queues stop before what their callbacks use.
Reachability askServers(AgentView& view, platform::Duration limit) {
    platform::Platform& platform = Platform::current();
    host::MainLoop loop;
    host::Queues queues(loop);
    host::HttpSessions sessions(queues.workers(platform::Priority::UserInitiated), platform.clock(), view.profile(),
                                {.timeout = limit + std::chrono::hours(1)});  // the limit below ends it sooner
    view.use(&queues, &sessions);
    view.errors().take();

    Reachability found;
    int open = 2;
    auto answered = [&](platform::Task note) {
        loop.post([&, note = std::move(note)]() mutable {
            note();
            if (--open == 0) loop.stop();
        });
    };
    VRXServerVersionUtilities::serverVersionSupported(
        [&](bool isSupported) { answered([&found, isSupported] { found.isServerVersionSupported = isSupported; }); });
    found.coverageUrl = platform.defaultsStore().string(platform::settings::warrantyURL).value_or("");
    platform::HttpRequest request;
    request.url = found.coverageUrl;
    sessions.makeUncached()->send(std::move(request), [&](HttpResponse response) {
        answered([&found, response = std::move(response)]() mutable { found.coverage = std::move(response); });
    });
    loop.postAfter(limit, [&loop] { loop.stop(); });
    loop.run();

    sessions.stop();
    queues.stop();
    view.use(nullptr, nullptr);
    found.serverVersionErrors = view.errors().take();
    found.serverVersions = platform.defaultsStore().get(serverVersionCacheKey);
    return found;
}

}  // namespace vrx::apps
