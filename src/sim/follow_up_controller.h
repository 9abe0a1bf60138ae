// The simulated follow-up service: items by client, in memory, where they survive a restart of the simulated process.
// Each request is written down and may be made to fail.
#pragma once

#include <map>
#include <memory>
#include <string>
#include <vector>

#include "vrx/platform/follow_up_controller.h"
#include "vrx/platform/vendor.h"

namespace vrx::sim {

class FollowUpControllers final : public platform::FollowUpControllers {
public:
    enum class Request { Post, Clear, List };

    std::unique_ptr<platform::FollowUpController> makeController(std::string clientIdentifier) override;
    std::string settingsAppBundleIdentifier() const override { return settingsApp; }

    std::string settingsApp = platform::vendorIdentifier(platform::settingsAppRemainder);

    // What is pending for a client, in the order of posting. A test may lay out what it likes.
    std::vector<platform::FollowUpItem>& pending(const std::string& clientIdentifier) {
        return pending_[clientIdentifier];
    }
    // As many requests of the kind fail from now on and change nothing; the error's text says "failed to post".
    void fail(Request request, int count = 1) { failures_[request] = count; }
    // Every request of every client, failed ones included: "list", "post IDENTIFIER", "clear IDENTIFIER IDENTIFIER".
    const std::vector<std::string>& asked() const { return asked_; }
    void forgetAsked() { asked_.clear(); }

private:
    class Controller;

    // Writes the request down and gives the failure that is scripted for it.
    platform::MaybeError begin(Request request, std::string text);

    std::map<std::string, std::vector<platform::FollowUpItem>> pending_;
    std::map<Request, int> failures_;
    std::vector<std::string> asked_;
};

}  // namespace vrx::sim
