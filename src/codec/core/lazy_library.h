// A shared library that is opened when its first function is asked for, and stays open: what a process may never need
// costs it nothing. Any thread may ask.
#pragma once

#include <mutex>
#include <string>

namespace vrx::codec {

class LazyLibrary {
public:
    // A function, which becomes the type that it is put into; null when it is not there.
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

    // The library's file name, found where the linker would find it. What its functions are called ends with the
    // suffix.
    explicit LazyLibrary(std::string fileName, std::string suffix = "")
        : fileName_(std::move(fileName)), suffix_(std::move(suffix)) {}
    LazyLibrary(const LazyLibrary&) = delete;
    LazyLibrary& operator=(const LazyLibrary&) = delete;

    // By its name:
    //     decltype(&::unum_open) open = icu().function("unum_open");
    Function function(const char* name) const;
    // As function(), for one that some releases of the library do not have: its absence is nothing missing.
    Function optionalFunction(const char* name) const;

    // What was not there, the library or the first such function, as a text that names it; empty when all was.
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
