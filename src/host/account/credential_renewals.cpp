#include "vrx/host/account/credential_renewals.h"

#include <system_error>

#include "vrx/host/account/credential_helper.h"
#include "vrx/host/base/requester.h"

namespace vrx::host {

using platform::RenewalResult;

CredentialRenewals::~CredentialRenewals() {
    stop();
    for (Run& run : runs_) run.thread.join();
}

void CredentialRenewals::stop() {
    eventfd_write(stopFile_.number(), 1);
}

// Holds the lock throughout. A renewal needs it before it answers, so none answers before this returns.
void CredentialRenewals::begin(Question question, Completion completion) {
    completion = [requester = RequesterScope::current(), completion = std::move(completion)](auto result) mutable {
        const RequesterScope scope(requester);
        completion(std::move(result));
    };
    std::unique_lock lock(mutex_);
    removeEnded();
    for (Run& run : runs_) {
        if (!run.isJoinable || run.question != question) continue;
        run.waiting.push_back(std::move(completion));
        return;
    }
    Run& added = runs_.emplace_back(Run{.question = std::move(question), .waiting = {}});
    added.waiting.push_back(std::move(completion));
    try {
        added.thread = std::thread([this, &added] { run(added); });
    } catch (const std::system_error& error) {
        // There is no thread to answer on, and the caller must not wait for ever.
        completion = std::move(added.waiting.front());
        runs_.pop_back();
        lock.unlock();
        const platform::Error failure = credentialError(CredentialFailure::NotStarted, error.what());
        completion({failure.code, failure});
    }
}

void CredentialRenewals::run(Run& run) {
    const RenewalResult result = renew_(run.question, stopFile_.number());
    std::vector<Completion> waiting;
    {
        std::lock_guard lock(mutex_);
        run.isJoinable = false;
        waiting.swap(run.waiting);
    }
    for (Completion& completion : waiting) completion(result);
    std::lock_guard lock(mutex_);
    run.hasEnded = true;
}

// Joins the threads that have nothing left to do.
void CredentialRenewals::removeEnded() {
    for (auto run = runs_.begin(); run != runs_.end();) {
        if (!run->hasEnded) {
            ++run;
            continue;
        }
        run->thread.join();
        run = runs_.erase(run);
    }
}

}  // namespace vrx::host
