// What the agent's tests on a simulated host share.
#pragma once

#include "support/values.h"
#include "vrx/sim/host.h"

namespace vrx {

// A property list, as a file or a server's answer holds it.
inline std::string propertyList(const Value& root,
                                platform::PropertyListFormat form = platform::PropertyListFormat::Xml) {
    const Data data = platform::Platform::current().propertyList().serialize(root, form).value();
    return {data.begin(), data.end()};
}

class OnSimulatedHost : public testing::Test {
protected:
    // The one reply to what is asked, which comes within the time.
    template <class T, class Ask>
    T replyOf(Ask ask, Duration time = Duration(120)) {
        std::optional<T> result;
        ask([this, &result, asked = host.clock.elapsed()](T reply) {
            EXPECT_FALSE(result) << "a second reply";
            timeToReply = host.clock.elapsed() - asked;
            result = std::move(reply);
        });
        host.runFor(time);
        EXPECT_TRUE(result) << "no reply";
        return result ? *std::move(result) : T();
    }

    sim::Host host;
    Duration timeToReply{};
};

}  // namespace vrx
