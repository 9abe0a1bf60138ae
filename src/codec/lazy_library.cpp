#include "codec/lazy_library.h"

#include <dlfcn.h>

namespace vrx::codec {

void* LazyLibrary::symbol(const char* name) const {
    std::call_once(isOpened_, [this] { library_ = dlopen(fileName_.c_str(), RTLD_LAZY | RTLD_LOCAL); });
    return library_ ? dlsym(library_, (name + suffix_).c_str()) : nullptr;
}

}  // namespace vrx::codec
