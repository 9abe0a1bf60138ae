// What the classes of the client library have in common: how they are connected, and what a call comes to.
#pragma once

#include <functional>
#include <memory>
#include <string>
#include <utility>
#include <variant>

#include "vrx/platform/date.h"

namespace vrx::client {

class Caller;

// Why there is no answer.
struct Failure {
    enum class Kind {
        NotReachable,  // no agent answers at the socket, or the connection ended twice
        Refused,       // see Refusal
        TimedOut,      // no reply within the time limit; the agent may still do what was asked
        BadReply,      // the answer is not of the operation's type: agent and library do not fit each other
        Cancelled,     // by Call::cancel(); the agent may still do what was asked
    };
    enum class Refusal {
        Entitlement,  // the caller does not hold the entitlement
        Limit,        // too many connections, requests or subscriptions at the same time, or a reply that is too large
        Argument,     // an argument is too long, or is not text
    };
    Kind kind;
    std::string text;                        // for people; after a refusal, the agent's own words
    Refusal refusal = Refusal::Entitlement;  // only when the kind is Refused
};

// The agent's answer, or why there is none. The answer itself may be null. Callers may ask value() and failure() only
// for what is there.
template <class T>
class Answer {
public:
    Answer(T value) : content_(std::in_place_index<0>, std::move(value)) {}
    Answer(Failure failure) : content_(std::in_place_index<1>, std::move(failure)) {}

    explicit operator bool() const { return content_.index() == 0; }
    const T& value() const { return std::get<0>(content_); }
    const T& operator*() const { return value(); }
    const T* operator->() const { return &value(); }
    const Failure& failure() const { return std::get<1>(content_); }

private:
    std::variant<T, Failure> content_;
};

// Called once, on a thread of the library, unless its object goes first.
template <class T>
using Callback = std::function<void(Answer<T> answer)>;

// A call under way whose answer comes later. It goes on without this object. Any thread.
class Call {
public:
    Call() = default;
    // The callback gets Cancelled soon, unless it has got something else. Does nothing when the call is over.
    void cancel() const {
        if (cancel_) cancel_();
    }

private:
    friend class Caller;
    explicit Call(std::function<void()> cancel) : cancel_(std::move(cancel)) {}

    std::function<void()> cancel_;
};

struct ConnectionOptions {
    std::string socketPath = {};          // empty: that of wire::findAgent(), once
    platform::Duration timeLimit{420.0};  // the limit of a call; longer than any download of the agent
    std::size_t connections = 8;
};

}  // namespace vrx::client
