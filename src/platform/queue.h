// Where work runs. All work that is not done on the calling thread is posted to one of the platform's queues.
#pragma once

#include <memory>
#include <string>
#include <utility>

#include "vrx/platform/date.h"
#include "vrx/platform/task.h"

namespace vrx::platform {

// Runs tasks that any thread may post. A serial queue (the main queue is one) runs them one at a time, in the order of
// posting. A task must not throw.
class Queue {
public:
    virtual ~Queue() = default;
    virtual void post(Task task) = 0;
    // Runs the task no earlier than the delay from now; a delay of 0 or less is post().
    virtual void postAfter(Duration delay, Task task) = 0;
    // The same for a task that does nothing once the owner is gone: then the queue need not wake up for it.
    virtual void postAfterWhile(std::weak_ptr<const void> /*owner*/, Duration delay, Task task) {
        postAfter(delay, std::move(task));
    }
};

// A flag that threads can wait for; once set it stays set.
class Event {
public:
    virtual ~Event() = default;
    virtual void set() = 0;
    virtual void wait() = 0;
    // Returns whether the flag was set within the time.
    virtual bool waitFor(Duration limit) = 0;
};

// Of two tasks that wait for a worker, the one that a user waits for goes first; Background is the usual one.
enum class Priority { Background, UserInitiated };

class Queues {
public:
    virtual ~Queues() = default;
    // The queue of the main thread's event loop.
    virtual Queue& mainQueue() = 0;
    // A new serial queue. Posted work keeps it alive until that work has run.
    virtual std::shared_ptr<Queue> makeSerialQueue(std::string label) = 0;
    // Workers that run tasks side by side. A task that waits for an Event never starves the others.
    virtual Queue& workers(Priority priority) = 0;
    // Wait for an event on workers and connection threads, never on a serial queue whose own tasks would have to set
    // it.
    virtual std::shared_ptr<Event> makeEvent() = 0;
};

}  // namespace vrx::platform
