// Work to be done later, and callbacks that are called exactly once.
#pragma once

#include <cassert>
#include <exception>
#include <memory>
#include <type_traits>
#include <utility>

namespace vrx::platform {

// A move-only function, for closures that own move-only objects such as a reply.
template <class Signature>
class UniqueFunction;

template <class R, class... Args>
class UniqueFunction<R(Args...)> {
public:
    UniqueFunction() = default;
    UniqueFunction(std::nullptr_t) {}
    template <class F>
    requires(!std::same_as<std::remove_cvref_t<F>, UniqueFunction> && std::is_invocable_r_v<R, F&, Args...>)
        UniqueFunction(F&& function)
        : body_(std::make_unique<Body<std::decay_t<F>>>(std::forward<F>(function))) {}

    explicit operator bool() const { return body_ != nullptr; }
    R operator()(Args... args) const { return body_->call(std::forward<Args>(args)...); }

private:
    struct AnyBody {
        virtual ~AnyBody() = default;
        virtual R call(Args... args) = 0;
    };
    template <class F>
    struct Body final : AnyBody {
        explicit Body(F function) : function(std::move(function)) {}
        R call(Args... args) override { return function(std::forward<Args>(args)...); }
        F function;
    };
    std::unique_ptr<AnyBody> body_;
};

using Task = UniqueFunction<void()>;

// While one is alive on a thread, that thread may drop callbacks unanswered. Queues hold one while they discard, at the
// end of the process, the tasks that have not run.
class ShutdownScope {
public:
    ShutdownScope() { ++depth(); }
    ~ShutdownScope() { --depth(); }
    ShutdownScope(const ShutdownScope&) = delete;
    ShutdownScope& operator=(const ShutdownScope&) = delete;
    static bool isActive() { return depth() > 0; }

private:
    static int& depth() {
        static thread_local int depth = 0;
        return depth;
    }
};

// A callback that must be called exactly once. Debug builds stop on a second call, and on a callback that is dropped
// unanswered unless letGo() was called or an exception is passing. Its owner may call it on any thread.
template <class... Args>
class OnceCallback {
public:
    OnceCallback() = default;  // empty: there is nothing to call
    OnceCallback(std::nullptr_t) {}
    template <class F>
    requires(!std::same_as<std::remove_cvref_t<F>, OnceCallback> && std::is_invocable_v<F&, Args...>)
        OnceCallback(F&& function)
        : function_(std::forward<F>(function)) {}
    OnceCallback(OnceCallback&& other) noexcept = default;
    OnceCallback& operator=(OnceCallback&& other) noexcept {
        checkAnswered();
        function_ = std::move(other.function_);
        return *this;
    }
    ~OnceCallback() { checkAnswered(); }

    // Whether it is still to be called.
    explicit operator bool() const { return static_cast<bool>(function_); }

    void operator()(Args... args) {
        assert(function_ && "a callback was called a second time");
        auto function = std::move(function_);
        function(std::forward<Args>(args)...);
    }

    // Drops the callback unanswered, because nobody waits for the answer any more.
    void letGo() { function_ = nullptr; }

private:
    void checkAnswered() const {
        assert((!function_ || std::uncaught_exceptions() > 0 || ShutdownScope::isActive()) &&
               "a callback was dropped unanswered");
    }

    UniqueFunction<void(Args...)> function_;
};

}  // namespace vrx::platform
