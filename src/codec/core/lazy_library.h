// A shared library that is opened when its first function is asked for, and stays open. A process that never needs it
// does not pay for it. Any thread may ask.
#pragma once

#include <mutex>
#include <string>

namespace vrx::codec {

class LazyLibrary {
public:
    // A function, which converts to the type of the pointer that takes it; null when it is missing.
    class Function {
    public:
        explicit Function(void* address) : address_(address) {}
        template <class Pointer>
        operator Pointer() const {
            return reinterpret_cast<Pointer>(address_);
        }

    private:
        void* address_;
    };

    // The library's file name, which is looked up as the linker does. The suffix ends the names of its functions.
    explicit LazyLibrary(std::string fileName, std::string suffix = "")
        : fileName_(std::move(fileName)), suffix_(std::move(suffix)) {}
    LazyLibrary(const LazyLibrary&) = delete;
    LazyLibrary& operator=(const LazyLibrary&) = delete;

    // A function by its name:
    //     decltype(&::unum_open) open = icu().function("unum_open");
    Function function(const char* name) const;
    // Like function(), for a function that some releases of the library lack: missing() does not report it.
    Function optionalFunction(const char* name) const;

    // A text that names what was missing first, the library or a function; empty when nothing was.
    std::string missing() const;

private:
    void* addressOf(const char* name) const;

    const std::string fileName_;
    const std::string suffix_;
    mutable std::mutex mutex_;
    mutable void* library_ = nullptr;
    mutable std::string missing_;
};

}  // namespace vrx::codec
