// Asks the agent for what the page shows, when something has changed and when the page wants it, and tells the page.
//
// It asks for all devices at a time and nothing else of a record: the agent brings the follow-up of a device that is
// asked for by itself in step, and takes it away when there is no record for the moment.
//
// One thread uses it: that to which `post` brings a call, from whichever thread.
#pragma once

#include <functional>
#include <memory>
#include <string>

#include "settings/model.h"

namespace vrx::settings {

class Source final {
public:
    using Post = std::function<void(std::function<void()>)>;

    struct Page {
        std::function<void(const Situation&)> show;       // after each round of questions
        std::function<void(bool isRefreshing)> progress;  // a refresh by hand begins or ends
        std::function<void(bool isComplete)> refreshed;   // whether there was a record for each device
        std::function<void(bool isDismissed)> dismissed;
    };

    // What is known stays as long as questions fail.
    Source(Post post, Page page, Situation known);
    ~Source();
    Source(const Source&) = delete;
    Source& operator=(const Source&) = delete;

    // Asks for what is known already.
    void look();
    // Has all records downloaded, and the follow-ups brought in step only if each device then has one.
    void refresh();
    void dismiss(const std::string& identifier);
    const std::string& socketPath() const;

private:
    class Rounds;
    const std::shared_ptr<Rounds> rounds_;
};

}  // namespace vrx::settings
