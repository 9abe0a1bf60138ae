// Where the replies to one connection's requests are put: by the thread that serves the connection, which sends them at
// once, or by any other, which hands them over. Replies outlive connections: those of one that has ended are dropped.
#pragma once

#include <atomic>
#include <cstdint>
#include <memory>
#include <mutex>
#include <optional>
#include <thread>
#include <utility>
#include <vector>

#include "vrx/host/base/descriptor.h"
#include "vrx/platform/process_lifecycle.h"
#include "vrx/platform/value.h"

namespace vrx {
class VRXAgentProtocol;
}

namespace vrx::host {

using RequestNumber = std::uint64_t;

// The archived root of a reply, or nothing when the request was given up unanswered.
struct RequestReply {
    RequestNumber request;
    std::optional<platform::Value> root;
    platform::WorkInFlight work;  // until it is sent
};

class ReplySender {
public:
    virtual ~ReplySender() = default;
    virtual void send(const RequestReply& reply) = 0;
};

class ReplyBox {
public:
    // Any thread.
    void put(RequestReply reply);
    // Makes the wake file readable, so that the serving thread looks about.
    void wake();

    // The serving thread: opens the box for its sender, which is used on this thread only; sends what others have put,
    // while the box is open.
    void open(ReplySender& sender);
    void sendPending();
    void close();
    int wakeFile() const { return wakeFile_.number(); }

private:
    const Descriptor wakeFile_ = makeEventFile();
    std::mutex mutex_;
    ReplySender* sender_ = nullptr;  // none while the box is not open
    std::thread::id servingThread_;
    std::vector<RequestReply> pending_;
    std::atomic<bool> hasPending_ = false;
};

// The obligation to answer one request. It keeps the object that serves the request alive, and the process; when it is
// dropped, the caller is told that there will be no reply.
class PendingReply {
public:
    PendingReply(std::shared_ptr<ReplyBox> box, RequestNumber request, std::shared_ptr<VRXAgentProtocol> server,
                 platform::WorkInFlight work)
        : box_(std::move(box)), request_(request), server_(std::move(server)), work_(std::move(work)) {}
    PendingReply(PendingReply&&) = default;
    PendingReply& operator=(PendingReply&&) = delete;
    ~PendingReply() {
        if (box_) box_->put({request_, std::nullopt, work_});
    }

    void send(platform::Value root) { std::exchange(box_, nullptr)->put({request_, std::move(root), work_}); }

private:
    std::shared_ptr<ReplyBox> box_;
    RequestNumber request_;
    std::shared_ptr<VRXAgentProtocol> server_;
    platform::WorkInFlight work_;
};

}  // namespace vrx::host
