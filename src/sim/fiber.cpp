#include "vrx/sim/fiber.h"

#include <sys/mman.h>
#include <unistd.h>

#include <cassert>
#include <cstdlib>
#include <new>
#include <utility>

// The sanitizers' interface. It is weak: in a program without a sanitizer these functions are null.
extern "C" {
[[gnu::weak]] void __sanitizer_start_switch_fiber(void** fakeStack, const void* stack, std::size_t bytes);
[[gnu::weak]] void __sanitizer_finish_switch_fiber(void* fakeStack, const void** stack, std::size_t* bytes);
[[gnu::weak]] void* __tsan_get_current_fiber();
[[gnu::weak]] void* __tsan_create_fiber(unsigned flags);
[[gnu::weak]] void __tsan_destroy_fiber(void* fiber);
[[gnu::weak]] void __tsan_switch_to_fiber(void* fiber, unsigned flags);
}

namespace vrx::sim {

namespace {

// Only the pages that are touched take memory.
constexpr std::size_t stackBytes = 512 * 1024;

std::size_t pageBytes() {
    return static_cast<std::size_t>(sysconf(_SC_PAGESIZE));
}

// The fiber that is being entered, because a context's first function takes no pointer.
thread_local Fiber* beginning = nullptr;

}  // namespace

Fiber::Fiber() {
    void* mapping = mmap(nullptr, pageBytes() + stackBytes, PROT_READ | PROT_WRITE,
                         MAP_PRIVATE | MAP_ANONYMOUS | MAP_NORESERVE | MAP_STACK, -1, 0);
    if (mapping == MAP_FAILED) throw std::bad_alloc();
    mapping_ = static_cast<std::byte*>(mapping);
    stack_ = mapping_ + pageBytes();
    mprotect(mapping_, pageBytes(), PROT_NONE);
    if (__tsan_create_fiber) insideThread_ = __tsan_create_fiber(0);

    getcontext(&inside_);
    inside_.uc_stack.ss_sp = stack_;
    inside_.uc_stack.ss_size = stackBytes;
    inside_.uc_link = nullptr;
    makecontext(&inside_, &Fiber::main, 0);
}

Fiber::~Fiber() {
    assert(isIdle());
    if (hasStarted_) {
        isEnding_ = true;
        enter();
    }
    if (__tsan_destroy_fiber) __tsan_destroy_fiber(insideThread_);
    munmap(mapping_, pageBytes() + stackBytes);
}

void Fiber::start(platform::Task task) {
    assert(isIdle());
    task_ = std::move(task);
    isBusy_ = true;
    enter();
}

void Fiber::main() noexcept {
    Fiber& self = *beginning;
    self.hasStarted_ = true;
    self.arrive();
    self.runTasks();
    self.leave();  // never returns
    std::abort();
}

void Fiber::runTasks() {
    while (!isEnding_) {
        // The task and all that it owns are destroyed on this stack as well.
        std::exchange(task_, nullptr)();
        isBusy_ = false;
        leave();
    }
}

void Fiber::enter() {
    beginning = this;
    if (__sanitizer_start_switch_fiber) __sanitizer_start_switch_fiber(&outsideFakeStack_, stack_, stackBytes);
    if (__tsan_switch_to_fiber) {
        outsideThread_ = __tsan_get_current_fiber();
        __tsan_switch_to_fiber(insideThread_, 0);
    }
    swapcontext(&outside_, &inside_);
    if (__sanitizer_finish_switch_fiber) __sanitizer_finish_switch_fiber(outsideFakeStack_, nullptr, nullptr);
}

void Fiber::leave() {
    void** keptFakeStack = isEnding_ ? nullptr : &insideFakeStack_;
    if (__sanitizer_start_switch_fiber)
        __sanitizer_start_switch_fiber(keptFakeStack, outsideStack_, outsideStackBytes_);
    if (__tsan_switch_to_fiber) __tsan_switch_to_fiber(outsideThread_, 0);
    swapcontext(&inside_, &outside_);
    arrive();
}

void Fiber::arrive() {
    if (__sanitizer_finish_switch_fiber)
        __sanitizer_finish_switch_fiber(insideFakeStack_, &outsideStack_, &outsideStackBytes_);
}

}  // namespace vrx::sim
