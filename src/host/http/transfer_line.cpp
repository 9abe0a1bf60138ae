#include "vrx/host/http/transfer_line.h"

#include <algorithm>

namespace vrx::host {

void TransferLine::add(Transfer transfer) {
    waiting_.push_back(
        {std::move(transfer), SteadyClock::now() + std::chrono::ceil<SteadyClock::duration>(limits_.longestWait)});
}

std::uint64_t TransferLine::lastTurn(uid_t user) const {
    const auto last = lastTurns_.find(user);
    return last == lastTurns_.end() ? 0 : last->second;
}

// Of one requester's, none goes before another.
bool TransferLine::goesBefore(const HttpTransfer& one, const HttpTransfer& other) const {
    if (!one.requester() || !other.requester()) return !one.requester() && other.requester();
    return lastTurn(*one.requester()) < lastTurn(*other.requester());
}

TransferLine::Transfer TransferLine::next() {
    if (running_ >= limits_.transfers) return nullptr;
    auto first = waiting_.end();
    for (auto waiting = waiting_.begin(); waiting != waiting_.end(); ++waiting) {
        const auto ofHost = runningByHost_.find(waiting->transfer->host());
        if (ofHost != runningByHost_.end() && ofHost->second >= limits_.transfersPerHost) continue;
        if (first == waiting_.end() || goesBefore(*waiting->transfer, *first->transfer)) first = waiting;
    }
    if (first == waiting_.end()) return nullptr;
    Transfer transfer = std::move(first->transfer);
    waiting_.erase(first);
    if (waiting_.empty())
        lastTurns_.clear();
    else if (transfer->requester())
        lastTurns_[*transfer->requester()] = ++turns_;
    ++running_;
    ++runningByHost_[transfer->host()];
    return transfer;
}

void TransferLine::ended(const HttpTransfer& transfer) {
    --running_;
    const auto ofHost = runningByHost_.find(transfer.host());
    if (--ofHost->second == 0) runningByHost_.erase(ofHost);
}

std::vector<TransferLine::Transfer> TransferLine::removeOverdue(SteadyClock::time_point now) {
    std::vector<Transfer> overdue;
    while (!waiting_.empty() && waiting_.front().end <= now) {
        overdue.push_back(std::move(waiting_.front().transfer));
        waiting_.pop_front();
    }
    return overdue;
}

std::optional<TransferLine::SteadyClock::time_point> TransferLine::firstOverdue() const {
    if (waiting_.empty()) return std::nullopt;
    return waiting_.front().end;
}

}  // namespace vrx::host
