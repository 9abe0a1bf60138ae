// Tells refused clients why: authenticates each, answers its calls with the error, and closes after the first that is
// not introspection. All share one thread, which starts with the first refusal and sleeps while there is none. When
// there are too many, the user with the most of them loses the one that has had the longest time. Main thread.
#pragma once

#include <sys/socket.h>

#include <array>
#include <atomic>
#include <chrono>
#include <list>
#include <memory>
#include <mutex>
#include <string>
#include <thread>

#include "vrx/host/base/descriptor.h"
#include "vrx/host/ipc/service_limits.h"

namespace vrx::host {

class Refusals {
public:
    explicit Refusals(const ServiceLimits& limits);
    ~Refusals();
    Refusals(const Refusals&) = delete;
    Refusals& operator=(const Refusals&) = delete;

    // The peer is the process that connected. Closes the socket when the client takes too long to listen.
    void refuse(Descriptor socket, const ucred& peer, const char* errorName, std::string text);

private:
    class Refused;
    void run();
    int serveAll();
    void removeSurplus();
    void keepSpare();

    const ServiceLimits& limits_;
    const Descriptor wakeFile_ = makeEventFile();
    // Given up for the next refusal when there are no descriptors left.
    std::array<Descriptor, 2> spare_;
    std::mutex mutex_;
    std::list<std::unique_ptr<Refused>> arriving_;  // not many: the thread takes them at once
    bool isStopping_ = false;
    std::list<std::unique_ptr<Refused>> present_;  // in the order of arrival; used by the thread only
    std::thread thread_;
};

}  // namespace vrx::host
