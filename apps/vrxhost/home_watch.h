// Waits for something to happen to a home's database, by whatever process, without looking again and again. It takes
// SIGINT and SIGTERM over for the rest of the program. One thread.
#pragma once

#include <string>

#include "vrx/host/base/descriptor.h"
#include "vrx/platform/date.h"
#include "vrxhost/home.h"

namespace vrx::apps {

class HomeWatch {
public:
    // What happens from now on is told of.
    explicit HomeWatch(Home& home);

    enum class Wake {
        Look,  // something may have been committed, which can be read now; or it is the date
        Gone,  // there is no database any more
        End,   // a signal has come
    };
    // Comes back at the date at the latest.
    Wake wait(std::optional<platform::Date> latest);

private:
    void arm(std::optional<platform::Date> latest) const;
    Wake letWritersFinish();

    Home& home_;
    const host::Descriptor changes_;
    const host::Descriptor signals_;
    const host::Descriptor timer_;
};

}  // namespace vrx::apps
