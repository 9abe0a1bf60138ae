// Waits until any process changes a home's database, without polling. Takes over SIGINT and SIGTERM for the rest of the
// program. One thread.
#pragma once

#include <string>

#include "vrx/host/base/descriptor.h"
#include "vrx/platform/date.h"
#include "vrxhost/home.h"

namespace vrx::apps {

class HomeWatch {
public:
    // Notices changes from now on.
    explicit HomeWatch(Home& home);

    enum class Wake {
        Look,  // the database may have changed, or the date has come
        Gone,  // the database is gone
        End,   // a signal has come
    };
    // Returns at the date at the latest.
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
