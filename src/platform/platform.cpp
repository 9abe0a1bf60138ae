#include "vrx/platform/platform.h"

#include <atomic>
#include <cstdio>
#include <cstdlib>

namespace vrx::platform {

namespace {
std::atomic<Platform*> currentPlatform = nullptr;
}

Platform& Platform::current() {
    Platform* platform = currentPlatform.load(std::memory_order_acquire);
    return need(platform, "current one");
}

bool Platform::hasCurrent() {
    return currentPlatform.load(std::memory_order_acquire) != nullptr;
}

void Platform::setCurrent(Platform* platform) {
    currentPlatform.store(platform, std::memory_order_release);
}

void Platform::missing(const char* facility) {
    std::fprintf(stderr, "vrx: the platform has no %s\n", facility);
    std::abort();
}

ScopedPlatform::ScopedPlatform(Platform& platform)
    : previous_(Platform::hasCurrent() ? &Platform::current() : nullptr) {
    Platform::setCurrent(&platform);
}

ScopedPlatform::~ScopedPlatform() {
    Platform::setCurrent(previous_);
}

}  // namespace vrx::platform
