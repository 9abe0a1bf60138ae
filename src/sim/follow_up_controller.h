// The simulated follow-up service: items by client, in memory, where they survive a restart of the simulated process.
// Each request is recorded and may be made to fail.
#pragma once

#include <functional>
#include <map>
#include <memory>
#include <string>
#include <vector>

#include "vrx/platform/follow_up_controller.h"
#include "vrx/platform/vendor.h"
#include "vrx/sim/interference.h"

namespace vrx::sim {

class FollowUpControllers final : public platform::FollowUpControllers {
public:
    enum class Request { Post, Clear, List };

    explicit FollowUpControllers(const Interference& interference) : interference_(interference) {}

    std::unique_ptr<platform::FollowUpController> makeController(std::string clientIdentifier) override;
    std::string settingsAppBundleIdentifier() const override { return settingsApp; }

    std::string settingsApp = platform::vendorIdentifier(platform::settingsAppRemainder);

    // The items pending for a client, in the order of posting. A test may change them as it likes.
    std::vector<platform::FollowUpItem>& pending(const std::string& clientIdentifier) {
        return pending_[clientIdentifier];
    }
    // The next requests of the kind fail, so many of them, and change nothing; the error's text says "failed to post".
    void fail(Request request, int count = 1) { failures_[request] = count; }
    bool isFailing(Request request) const {
        const auto failure = failures_.find(request);
        return failure != failures_.end() && failure->second > 0;
    }
    // Called after each request that has changed what is pending.
    void setChangeObserver(std::function<void()> observer) { changeObserver_ = std::move(observer); }
    // Hears each request when it has been answered. The item is that of a post, the identifiers are those of a clear.
    struct Answered {
        Request request{};
        bool isDone = false;
        const platform::FollowUpItem* item = nullptr;
        const std::vector<std::string>* identifiers = nullptr;
    };
    std::function<void(const Answered& answered)> listener;
    // Every request of every client, failed ones included: "list", "post IDENTIFIER", "clear IDENTIFIER IDENTIFIER".
    const std::vector<std::string>& asked() const { return asked_; }
    void forgetAsked() { asked_.clear(); }

private:
    class Controller;

    // Records the request and returns the failure that is scripted for it.
    platform::MaybeError begin(Request request, std::string text);
    void changed() const {
        if (changeObserver_) changeObserver_();
    }
    void tell(const Answered& answered) const {
        if (listener) listener(answered);
    }

    const Interference& interference_;
    std::map<std::string, std::vector<platform::FollowUpItem>> pending_;
    std::map<Request, int> failures_;
    std::vector<std::string> asked_;
    std::function<void()> changeObserver_;
};

}  // namespace vrx::sim
