#include "vrx/codec/core/lazy_library.h"

#include <dlfcn.h>

namespace vrx::codec {

LazyLibrary::Function LazyLibrary::function(const char* name) const {
    std::lock_guard lock(mutex_);
    void* address = addressOf(name);
    if (!address && missing_.empty()) missing_ = dlerror();
    return Function(address);
}

LazyLibrary::Function LazyLibrary::optionalFunction(const char* name) const {
    std::lock_guard lock(mutex_);
    return Function(addressOf(name));
}

// The caller holds the mutex. A library that cannot be opened is tried again by the next function until one is missing.
void* LazyLibrary::addressOf(const char* name) const {
    if (!library_ && missing_.empty()) library_ = dlopen(fileName_.c_str(), RTLD_LAZY | RTLD_LOCAL);
    return library_ ? dlsym(library_, (name + suffix_).c_str()) : nullptr;
}

std::string LazyLibrary::missing() const {
    std::lock_guard lock(mutex_);
    return missing_;
}

}  // namespace vrx::codec
