// Transfers that wait for their turn: only some run at the same time, and fewer of them to one host. The agent's own go
// first, then those of its clients' users in turn. For the transfer thread.
#pragma once

#include <sys/types.h>

#include <chrono>
#include <cstdint>
#include <list>
#include <map>
#include <memory>
#include <optional>
#include <string>
#include <vector>

#include "vrx/host/http/http_transfer.h"

namespace vrx::host {

class TransferLine {
public:
    using Transfer = std::unique_ptr<HttpTransfer>;
    using SteadyClock = std::chrono::steady_clock;

    explicit TransferLine(const HttpLimits& limits) : limits_(limits) {}

    void add(Transfer transfer);
    // Takes the transfer whose turn it is, if there is one. It runs from now on.
    Transfer next();
    // To be called once for each that ran.
    void ended(const HttpTransfer& transfer);

    // Those that have waited too long.
    std::vector<Transfer> removeOverdue(SteadyClock::time_point now);
    // When the first will have waited too long; nothing while none waits.
    std::optional<SteadyClock::time_point> firstOverdue() const;
    void clear() { waiting_.clear(); }

private:
    struct Waiting {
        Transfer transfer;
        SteadyClock::time_point end;
    };
    bool goesBefore(const HttpTransfer& one, const HttpTransfer& other) const;
    std::uint64_t lastTurn(uid_t user) const;

    const HttpLimits& limits_;
    std::list<Waiting> waiting_;  // in the order of arrival, and so of `end`
    std::size_t running_ = 0;
    std::map<std::string, std::size_t> runningByHost_;
    std::map<uid_t, std::uint64_t> lastTurns_;  // of the users that wait
    std::uint64_t turns_ = 0;
};

}  // namespace vrx::host
