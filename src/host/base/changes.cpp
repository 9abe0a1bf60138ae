#include "vrx/host/base/changes.h"

#include <algorithm>

namespace vrx::host {

Changes::Subscription Changes::subscribe(uid_t user, std::function<void(Kinds)> tell) {
    std::lock_guard lock(mutex_);
    const auto present =
        std::ranges::count_if(subscribers_, [&](const Subscriber& subscriber) { return subscriber.user == user; });
    if (static_cast<std::size_t>(present) >= mostOfOneUser) return nullptr;
    if (subscribers_.empty() && onDemand_) onDemand_(true);
    const auto place = subscribers_.insert(subscribers_.end(), {user, std::move(tell)});
    return {this, [place](Changes* changes) {
                std::lock_guard lock(changes->mutex_);
                changes->subscribers_.erase(place);
                if (changes->subscribers_.empty() && changes->onDemand_) changes->onDemand_(false);
            }};
}

void Changes::note(Kinds kinds) {
    std::lock_guard lock(mutex_);
    for (const Subscriber& subscriber : subscribers_) subscriber.tell(kinds);
}

bool Changes::isAnybodySubscribed() const {
    std::lock_guard lock(mutex_);
    return !subscribers_.empty();
}

}  // namespace vrx::host
