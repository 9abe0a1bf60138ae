#include "vrx/host/ipc/reply_box.h"

namespace vrx::host {

void ReplyBox::put(RequestReply reply) {
    ReplySender* sender = nullptr;
    {
        std::lock_guard lock(mutex_);
        if (!sender_) return;
        if (std::this_thread::get_id() != servingThread_) {
            pending_.push_back(std::move(reply));
            if (!hasPending_.exchange(true)) wake();
            return;
        }
        sender = sender_;
    }
    sender->send(reply);
}

void ReplyBox::wake() {
    // It can only fail when the counter is full, and then the thread is awake.
    [[maybe_unused]] int result = eventfd_write(wakeFile_.number(), 1);
}

void ReplyBox::open(ReplySender& sender) {
    std::lock_guard lock(mutex_);
    sender_ = &sender;
    servingThread_ = std::this_thread::get_id();
}

void ReplyBox::sendPending() {
    if (!hasPending_) return;
    std::vector<RequestReply> pending;
    {
        std::lock_guard lock(mutex_);
        pending.swap(pending_);
        hasPending_ = false;
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
