#include "vrx/host/ipc/request_line.h"

#include <algorithm>

namespace vrx::host {

bool RequestLine::State::doOthersWait(uid_t user) const {
    return std::ranges::any_of(line, [user](const Waiter* waiter) { return waiter->user != user; });
}

bool RequestLine::State::isAdmissible(const Waiter& waiter) const {
    if (requests >= limits.requests || (unsentBytes >= limits.unsentBytes && waiter.hasUnsent)) return false;
    const auto ofUser = requestsByUser.find(waiter.user);
    return ofUser == requestsByUser.end() || ofUser->second < limits.requestsPerUser || !doOthersWait(waiter.user);
}

// There are no more of them than connections.
void RequestLine::State::wakeAll() const {
    for (const Waiter* waiter : line) waiter->wake();
}

RequestLine::Place RequestLine::take(Waiter& waiter, bool hasUnsent) {
    const std::lock_guard lock(state_->mutex);
    waiter.hasUnsent = hasUnsent;
    auto& line = state_->line;
    const auto own = std::ranges::find(line, &waiter);
    const bool isFirst =
        std::none_of(line.begin(), own, [this](const Waiter* other) { return state_->isAdmissible(*other); });
    if (!isFirst || !state_->isAdmissible(waiter)) {
        if (own == line.end()) line.push_back(&waiter);
        return nullptr;
    }
    if (own != line.end()) line.erase(own);
    Place place(state_.get(), [state = state_, user = waiter.user](void*) {
        const std::lock_guard lock(state->mutex);
        --state->requests;
        const auto ofUser = state->requestsByUser.find(user);
        if (--ofUser->second == 0) state->requestsByUser.erase(ofUser);
        state->wakeAll();
    });
    ++state_->requests;
    ++state_->requestsByUser[waiter.user];
    state_->wakeAll();
    return place;
}

void RequestLine::leave(const Waiter& waiter) {
    const std::lock_guard lock(state_->mutex);
    if (state_->line.remove(&waiter) > 0) state_->wakeAll();
}

void RequestLine::changeUnsent(std::size_t before, std::size_t now) {
    if (before == now) return;
    const std::lock_guard lock(state_->mutex);
    state_->unsentBytes += now - before;
    if (now < before) state_->wakeAll();
}

}  // namespace vrx::host
