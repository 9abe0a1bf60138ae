// Makes the calls of one client object: waiting, or later on threads of its own. Any thread may call.
#pragma once

#include <memory>
#include <string>
#include <utility>

#include "vrx/client/answer.h"
#include "vrx/client/bus_pool.h"
#include "vrx/client/decoding.h"
#include "vrx/client/workers.h"
#include "vrx/wire/names.h"

namespace vrx::client {

class Caller {
public:
    explicit Caller(ConnectionOptions options);
    // The workers can then end without waiting for replies.
    ~Caller() { pool_->close(); }
    Caller(const Caller&) = delete;
    Caller& operator=(const Caller&) = delete;

    template <class T>
    Answer<T> call(const wire::Interface& interface, const wire::Operation& operation,
                   const CallArguments& arguments = {}) {
        return answer<T>(Request{interface, operation, arguments});
    }

    // The text is the operation's string argument, if it has one. The task owns it until the call has ended.
    template <class T>
    Call callLater(const wire::Interface& interface, const wire::Operation& operation, Callback<T> callback,
                   std::string text = {}, CallArguments arguments = {}) {
        auto request = std::make_shared<Request>(Request{interface, operation, arguments});
        workers_.post([this, request, callback = std::move(callback), text = std::move(text)] {
            request->arguments.text = text;
            Answer<T> reply = answer<T>(*request);
            if (callback) callback(std::move(reply));
        });
        return Call([pool = std::weak_ptr(pool_), request = std::move(request)] {
            if (const auto present = pool.lock()) present->cancel(*request);
        });
    }

    const std::string& socketPath() const { return pool_->socketPath(); }
    platform::Duration timeLimit() const { return timeLimit_; }

private:
    template <class T>
    Answer<T> answer(const Request& request) {
        Answer<platform::Value> root = pool_->call(request, deadline());
        if (!root) return root.failure();
        return Decoder<T>::decode(*root);
    }
    Deadline deadline() const;

    const platform::Duration timeLimit_;
    const std::shared_ptr<BusPool> pool_;
    Workers workers_;
};

}  // namespace vrx::client
