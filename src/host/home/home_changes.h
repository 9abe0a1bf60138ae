// Tells what any process changes in a home of what applications show: the pending follow-ups of one client, the length
// of a day, and the files of cached records. It compares contents, so that no other row of the database counts, nor a
// record that is cached anew as it was. Costs nothing while nothing is written. Made and destroyed on the main thread.
#pragma once

#include <functional>
#include <map>
#include <memory>
#include <string>

#include "vrx/host/base/changes.h"
#include "vrx/host/home/database.h"
#include "vrx/host/loop/file_watch.h"
#include "vrx/platform/defaults_store.h"
#include "vrx/platform/queue.h"

namespace vrx::host {

class HomeChanges {
public:
    // All must outlive the queue's tasks.
    struct Places {
        Database& database;
        const platform::DefaultsStore& defaults;
        std::string databasePath;
        std::string client;         // whose follow-ups count
        std::string recordsFolder;  // with a slash at its end
    };
    // The queue runs one task at a time: the first of them takes down how things are, and a task that is posted after
    // this constructor knows that every change from then on is told. It tells on that queue.
    HomeChanges(sd_event* loop, std::shared_ptr<platform::Queue> queue, Places places,
                std::function<void(Changes::Kinds)> tell);

private:
    class Comparison;

    const std::shared_ptr<Comparison> comparison_;
    const FileWatch watch_;
};

}  // namespace vrx::host
