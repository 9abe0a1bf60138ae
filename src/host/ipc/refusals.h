// Tells refused clients why: authenticates each, answers its calls with the error, and closes after the first that is
// not introspection. All share one thread, which starts with the first refusal and sleeps while there is none. Main
// thread.
#pragma once

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

    // Closes the socket at once when too many clients are being told, and later when the client takes too long to
    // listen.
    void refuse(Descriptor socket, pid_t peer, const char* errorName, std::string text);

private:
    class Refused;
    void run();
    int serveAll();

    const ServiceLimits& limits_;
    const Descriptor wakeFile_ = makeEventFile();
    std::mutex mutex_;
    std::list<std::unique_ptr<Refused>> arriving_;
    std::size_t count_ = 0;  // of all that have not ended
    bool isStopping_ = false;
    std::list<std::unique_ptr<Refused>> present_;  // used by the thread only
    std::thread thread_;
};

}  // namespace vrx::host
