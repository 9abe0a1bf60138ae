// The follow-up service, on host.db: whoever shows the items reads them there. Any thread, and any number of processes
// at once, may use it. What was listed once is answered from memory for as long as nothing has been committed to the
// database since, and a request that would change nothing writes nothing. An item that cannot be read back is left out,
// with a line in the log; posting it again, or clearing it, ends that.
#pragma once

#include <map>
#include <memory>
#include <string>
#include <vector>

#include "vrx/host/home/database.h"
#include "vrx/platform/follow_up_controller.h"

namespace vrx::host {

class FollowUpControllers final : public platform::FollowUpControllers {
public:
    // The database must outlive it, and it the controllers that it makes.
    explicit FollowUpControllers(Database& database) : database_(database) {}

    std::unique_ptr<platform::FollowUpController> makeController(std::string clientIdentifier) override;
    std::string settingsAppBundleIdentifier() const override;

private:
    class Controller;

    // What is pending for a client.
    struct Listing {
        std::vector<platform::FollowUpItem> items;
        bool isWhole = true;  // every item could be read
    };
    // What was listed, by client, at one state of the database.
    struct Copies {
        Database::Stamp stamp;
        std::map<std::string, Listing> listings;
    };

    platform::MaybeError post(const std::string& client, const platform::FollowUpItem& item);
    platform::MaybeError clear(const std::string& client, const std::vector<std::string>& identifiers);
    platform::Result<std::vector<platform::FollowUpItem>> pending(const std::string& client);

    // Within Database::peek.
    const Listing& listing(Connection& connection, const Database::Stamp& stamp, const std::string& client);
    bool isPending(Connection& connection, const Database::Stamp& stamp, const std::string& client,
                   const platform::FollowUpItem& item) const;

    Database& database_;
    Copies copies_;  // used within Database::peek, one thread at a time
};

}  // namespace vrx::host
