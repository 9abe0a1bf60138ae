// Renewals of credentials under way. Each runs on a thread of its own, on which whoever asked for it is answered. What
// is asked once more while it runs is the same renewal: its token is newer than the one that was stored when the second
// was asked for. Any thread may ask.
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
    // Does the work, as long as it takes; ends early, with a failure, once the stop file can be read.
    using Renew = std::function<platform::RenewalResult(const Question& question, int stopFile)>;

    explicit CredentialRenewals(Renew renew) : renew_(std::move(renew)) {}
    // Stops, and waits until all are answered.
    ~CredentialRenewals();

    void begin(Question question, Completion completion);
    // Ends what is under way, and soon after it begins what comes later: all of it fails, and is answered.
    void stop();

private:
    struct Run {
        const Question question;
        std::vector<Completion> waiting;
        bool isJoinable = true;  // by others who ask the same
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
