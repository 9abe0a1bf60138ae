// Renewals of credentials under way. Each runs on a thread of its own, which also answers. An equal question that comes
// while a renewal runs joins it: its token will be newer than the one that was stored at the time of the question. Any
// thread may ask.
#pragma once

#include <functional>
#include <list>
#include <mutex>
#include <thread>
#include <vector>

#include "vrx/host/base/descriptor.h"
#include "vrx/platform/account_store.h"

namespace vrx::host {

class CredentialRenewals {
public:
    using Completion = platform::OnceCallback<platform::RenewalResult>;
    struct Question {
        platform::AuthenticationAccount account;
        platform::RenewalOptions options;
        bool operator==(const Question&) const = default;
    };
    // Does the work, however long it takes. Returns early, with a failure, once the stop file is readable.
    using Renew = std::function<platform::RenewalResult(const Question& question, int stopFile)>;

    explicit CredentialRenewals(Renew renew) : renew_(std::move(renew)) {}
    // Stops, and waits until everybody is answered.
    ~CredentialRenewals();

    void begin(Question question, Completion completion);
    // Makes renewals fail soon, those under way and those begun later. All are answered.
    void stop();

private:
    struct Run {
        const Question question;
        std::vector<Completion> waiting;
        bool isJoinable = true;  // by equal questions
        bool hasEnded = false;
        std::thread thread{};
    };
    void run(Run& run);
    void removeEnded();

    const Renew renew_;
    const Descriptor stopFile_ = makeEventFile();
    std::mutex mutex_;
    std::list<Run> runs_;
};

}  // namespace vrx::host
