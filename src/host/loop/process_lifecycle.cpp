#include "vrx/host/loop/process_lifecycle.h"

#include <utility>

#include "vrx/platform/log.h"

namespace vrx::host {

using platform::WorkInFlight;

ProcessLifecycle::~ProcessLifecycle() {
    std::lock_guard lock(state_->mutex);
    state_->mainLoop = nullptr;
}

void ProcessLifecycle::exitCleanWhenIdle() {
    std::lock_guard lock(state_->mutex);
    state_->isExitWanted = true;
    considerEnd(state_);
}

WorkInFlight ProcessLifecycle::beginWork() {
    std::lock_guard lock(state_->mutex);
    return begin(state_);
}

WorkInFlight ProcessLifecycle::beginWorkUnlessEnding() {
    std::lock_guard lock(state_->mutex);
    return state_->isEnding ? nullptr : begin(state_);
}

void ProcessLifecycle::setUnreadQuestion(std::function<bool()> hasUnread) {
    std::lock_guard lock(state_->mutex);
    state_->hasUnread = std::move(hasUnread);
}

void ProcessLifecycle::callWhenIdle(std::function<void()> call) {
    std::lock_guard lock(state_->mutex);
    state_->idleCalls.push_back(std::move(call));
    callIdle(*state_);
}

void ProcessLifecycle::callIdle(State& state) {
    if (state.inFlight > 0 || !state.mainLoop) return;
    for (auto& call : std::exchange(state.idleCalls, {})) state.mainLoop->post(std::move(call));
}

void ProcessLifecycle::setMainQueue(std::weak_ptr<platform::Queue> queue) {
    std::lock_guard lock(state_->mutex);
    state_->mainQueue = std::move(queue);
}

bool ProcessLifecycle::isEnding() const {
    std::lock_guard lock(state_->mutex);
    return state_->isEnding;
}

WorkInFlight ProcessLifecycle::begin(const std::shared_ptr<State>& state) {
    ++state->inFlight;
    return {state.get(), [state](void*) {
                std::lock_guard lock(state->mutex);
                --state->inFlight;
                callIdle(*state);
                considerEnd(state);
            }};
}

// Decides on the main thread, after the tasks that are posted already: they may begin work.
void ProcessLifecycle::considerEnd(const std::shared_ptr<State>& state) {
    if (!state->isExitWanted || state->inFlight > 0 || !state->mainLoop) return;
    auto decide = [state] {
        std::lock_guard lock(state->mutex);
        if (state->mainLoop) state->mainLoop->post([state] { endIfIdle(*state); });
    };
    if (auto queue = state->mainQueue.lock())
        queue->post(decide);
    else
        state->mainLoop->post([state] { endIfIdle(*state); });
}

void ProcessLifecycle::endIfIdle(State& state) {
    std::lock_guard lock(state.mutex);
    if (state.isEnding || state.inFlight > 0 || !state.mainLoop || (state.hasUnread && state.hasUnread())) return;
    state.isEnding = true;
    log(platform::Level::Default, "Nothing is under way: ending, to be started anew");
    state.mainLoop->stop();
}

}  // namespace vrx::host
