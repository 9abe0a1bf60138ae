#include "vrx/codec/core/lazy_library.h"

#include <dlfcn.h>

namespace vrx::codec {

LazyLibrary::Function LazyLibrary::function(const char* name) const {
    std::lock_guard lock(mutex_);
    if (!library_ && missing_.empty()) library_ = dlopen(fileName_.c_str(), RTLD_LAZY | RTLD_LOCAL);
    void* address = library_ ? dlsym(library_, (name + suffix_).c_str()) : nullptr;
    if (!address && missing_.empty()) missing_ = dlerror();
    return Function(address);
}

std::string LazyLibrary::missing() const {
    std::lock_guard lock(mutex_);
    return missing_;
}

}  // namespace vrx::codec
