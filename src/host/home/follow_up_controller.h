// The follow-up service, on host.db: whoever shows the items reads them there. Any number of threads and processes may
// use it. A listing is kept in memory until something is committed to the database, and a request that would change
// nothing writes nothing. An item that cannot be read is left out, with a line in the log, until it is posted again or
// cleared.
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
    // The database must outlive this object, and this object its controllers.
    explicit FollowUpControllers(Database& database) : database_(database) {}

    std::unique_ptr<platform::FollowUpController> makeController(std::string clientIdentifier) override;
    std::string settingsAppBundleIdentifier() const override;

    // What is pending for a client. Within a transaction.
    static std::vector<platform::FollowUpItem> pending(Connection& connection, const std::string& client);

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
    static Listing listed(Connection& connection, const std::string& client);
    bool isPending(Connection& connection, const Database::Stamp& stamp, const std::string& client,
                   const platform::FollowUpItem& item) const;

    Database& database_;
    Copies copies_;  // used within Database::peek only, so by one thread at a time
};

}  // namespace vrx::host
