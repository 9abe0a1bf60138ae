#include "vrx/host/ipc/reply_box.h"

namespace vrx::host {

void ReplyBox::put(RequestReply reply) {
    ReplySender* sender = nullptr;
    {
        std::lock_guard lock(mutex_);
        if (!sender_) return;
        if (std::this_thread::get_id() != servingThread_) {
            pending_.push_back(std::move(reply));
            return wakeLocked();
        }
        sender = sender_;
    }
    sender->send(reply);
}

void ReplyBox::wake() {
    std::lock_guard lock(mutex_);
    wakeLocked();
}

void ReplyBox::wakeLocked() {
    if (!isAwake_.exchange(true)) eventfd_write(wakeFile_.number(), 1);
}

void ReplyBox::open(ReplySender& sender) {
    std::lock_guard lock(mutex_);
    sender_ = &sender;
    servingThread_ = std::this_thread::get_id();
}

void ReplyBox::sendPending() {
    if (!isAwake_) return;
    std::vector<RequestReply> pending;
    {
        std::lock_guard lock(mutex_);
        pending.swap(pending_);
        isAwake_ = false;
        eventfd_t count;
        eventfd_read(wakeFile_.number(), &count);
    }
    for (const RequestReply& reply : pending) sender_->send(reply);
}

void ReplyBox::close() {
    std::vector<RequestReply> dropped;
    std::lock_guard lock(mutex_);
    sender_ = nullptr;
    dropped.swap(pending_);
}

}  // namespace vrx::host
