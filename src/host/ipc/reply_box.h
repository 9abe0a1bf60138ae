// Collects the replies to one connection's requests. The thread that serves the connection sends its own at once; other
// threads hand theirs over. Replies outlive connections: those to a closed connection are dropped.
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

// What a request holds until its reply is sent.
struct UnderWay {
    platform::WorkInFlight work;
    std::shared_ptr<void> place;  // among the requests of all clients
};

// The archived root of a reply; nothing when the request was dropped without an answer.
struct RequestReply {
    RequestNumber request;
    std::optional<platform::Value> root;
    UnderWay underWay;
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
    // Makes the wake file readable, so that the serving thread looks at its state.
    void wake();

    // For the serving thread. open() names the sender, which is used on this thread only; sendPending() sends what
    // other threads have put, and answers to wake(): look at the state after it.
    void open(ReplySender& sender);
    void sendPending();
    void close();
    int wakeFile() const { return wakeFile_.number(); }

private:
    void wakeLocked();

    const Descriptor wakeFile_ = makeEventFile();
    std::mutex mutex_;
    ReplySender* sender_ = nullptr;  // null while the box is not open
    std::thread::id servingThread_;
    std::vector<RequestReply> pending_;
    std::atomic<bool> isAwake_ = false;  // the wake file is readable
};

// The obligation to answer one request. It keeps the process and the object that serves the request alive. Dropped
// without an answer, it tells the caller that there will be no reply.
class PendingReply {
public:
    PendingReply(std::shared_ptr<ReplyBox> box, RequestNumber request, std::shared_ptr<VRXAgentProtocol> server,
                 UnderWay underWay)
        : box_(std::move(box)), request_(request), server_(std::move(server)), underWay_(std::move(underWay)) {}
    PendingReply(PendingReply&&) = default;
    PendingReply& operator=(PendingReply&&) = delete;
    ~PendingReply() {
        if (box_) box_->put({request_, std::nullopt, underWay_});
    }

    void send(platform::Value root) { std::exchange(box_, nullptr)->put({request_, std::move(root), underWay_}); }

private:
    std::shared_ptr<ReplyBox> box_;
    RequestNumber request_;
    std::shared_ptr<VRXAgentProtocol> server_;
    UnderWay underWay_;
};

}  // namespace vrx::host
