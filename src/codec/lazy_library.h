// A shared library that is opened when its first function is asked for, and stays open: what a process may never need
// costs it nothing. Any thread may ask.
#pragma once

#include <mutex>
#include <string>

namespace vrx::codec {

class LazyLibrary {
public:
    // The library's file name, found where the linker would find it. What its functions are called ends with the
    // suffix.
    explicit LazyLibrary(std::string fileName, std::string suffix = "")
        : fileName_(std::move(fileName)), suffix_(std::move(suffix)) {}
    LazyLibrary(const LazyLibrary&) = delete;
    LazyLibrary& operator=(const LazyLibrary&) = delete;

    // A function by its name, null when there is no such library or function:
    //     auto open = library.function<decltype(&::unum_open)>("unum_open");
    template <class Pointer>
    Pointer function(const char* name) const {
        return reinterpret_cast<Pointer>(symbol(name));
    }

private:
    void* symbol(const char* name) const;

    const std::string fileName_;
    const std::string suffix_;
    mutable std::once_flag isOpened_;
    mutable void* library_ = nullptr;
};

}  // namespace vrx::codec
