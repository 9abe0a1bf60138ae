// A property of a shared object: read and replaced whole, from any thread.
#pragma once

#include <mutex>
#include <utility>

namespace vrx::platform {

template <class T>
class Property {
public:
    explicit Property(T value = T()) : value_(std::move(value)) {}

    T get() const {
        std::lock_guard lock(mutex_);
        return value_;
    }
    // The old value is released outside the lock, together with the argument.
    void set(T value) {
        std::lock_guard lock(mutex_);
        std::swap(value_, value);
    }

private:
    mutable std::mutex mutex_;
    T value_;
};

}  // namespace vrx::platform
