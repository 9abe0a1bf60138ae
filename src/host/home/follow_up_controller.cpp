#include "vrx/host/home/follow_up_controller.h"

#include <algorithm>

#include "vrx/codec/property_list.h"
#include "vrx/host/home/follow_up_document.h"
#include "vrx/platform/log.h"
#include "vrx/platform/vendor.h"

namespace vrx::host {

using platform::Data;
using platform::FollowUpItem;
using platform::Level;
using platform::MaybeError;
using platform::Result;
using platform::Value;

namespace {

constexpr const char* selectAll = "SELECT identifier, item FROM follow_ups WHERE client = ? ORDER BY position";
constexpr const char* selectOne = "SELECT identifier, item FROM follow_ups WHERE client = ? AND identifier = ?";
constexpr const char* replace =
    "INSERT INTO follow_ups (client, identifier, item) VALUES (?, ?, ?) "
    "ON CONFLICT (client, identifier) DO UPDATE SET item = excluded.item";
constexpr const char* removeOne = "DELETE FROM follow_ups WHERE client = ? AND identifier = ?";

// The item of a row. Nothing, with a line in the log, when it cannot be read.
std::optional<FollowUpItem> storedItem(const Statement& row) {
    const std::span<const std::uint8_t> bytes = row.bytes(1);
    const Result<Value> document = codec::parsePropertyList(Data(bytes.begin(), bytes.end()));
    Result<FollowUpItem> item = document ? followUpFromDocument(*document) : document.error();
    if (item) return std::move(item).value();
    log(Level::Error, "The follow-up %@ cannot be read: %@", row.text(0), item.error());
    return std::nullopt;
}

bool holds(const std::vector<FollowUpItem>& items, const std::string& identifier) {
    return std::any_of(items.begin(), items.end(),
                       [&](const FollowUpItem& item) { return item.uniqueIdentifier == identifier; });
}

}  // namespace

class FollowUpControllers::Controller final : public platform::FollowUpController {
public:
    Controller(FollowUpControllers& service, std::string client) : service_(service), client_(std::move(client)) {}

    MaybeError postFollowUpItem(const FollowUpItem& item) override { return service_.post(client_, item); }
    MaybeError clearPendingFollowUpItems(const std::vector<std::string>& uniqueIdentifiers) override {
        return service_.clear(client_, uniqueIdentifiers);
    }
    Result<std::vector<FollowUpItem>> pendingFollowUpItems() override { return service_.pending(client_); }

private:
    FollowUpControllers& service_;
    const std::string client_;
};

std::unique_ptr<platform::FollowUpController> FollowUpControllers::makeController(std::string clientIdentifier) {
    return std::make_unique<Controller>(*this, std::move(clientIdentifier));
}

std::string FollowUpControllers::settingsAppBundleIdentifier() const {
    return platform::vendorIdentifier(platform::settingsAppRemainder);
}

// Writes nothing when the item is pending as it is, which is usual in a refresh.
MaybeError FollowUpControllers::post(const std::string& client, const FollowUpItem& item) {
    bool isUnchanged = false;
    if (MaybeError error = database_.peek([&](Connection& connection, const Database::Stamp& stamp) {
            isUnchanged = isPending(connection, stamp, client, item);
        }))
        return error;
    if (isUnchanged) return std::nullopt;
    const Result<Data> bytes =
        codec::serializePropertyList(followUpDocument(item), platform::PropertyListFormat::Binary);
    if (!bytes) return bytes.error();
    return database_.write([&](Connection& connection) {
        connection.statement(replace).bind(0, client).bind(1, item.uniqueIdentifier).bind(2, *bytes).step();
    });
}

// Writes nothing when none of the items is pending, which is usual in a refresh.
MaybeError FollowUpControllers::clear(const std::string& client, const std::vector<std::string>& identifiers) {
    bool isAnyPending = false;
    if (MaybeError error = database_.peek([&](Connection& connection, const Database::Stamp& stamp) {
            const Listing& present = listing(connection, stamp, client);
            isAnyPending =
                !present.isWhole || std::any_of(identifiers.begin(), identifiers.end(),
                                                [&](const std::string& one) { return holds(present.items, one); });
        }))
        return error;
    if (!isAnyPending) return std::nullopt;
    return database_.write([&](Connection& connection) {
        for (const std::string& identifier : identifiers)
            connection.statement(removeOne).bind(0, client).bind(1, identifier).step();
    });
}

Result<std::vector<FollowUpItem>> FollowUpControllers::pending(const std::string& client) {
    std::vector<FollowUpItem> items;
    if (MaybeError error = database_.peek([&](Connection& connection, const Database::Stamp& stamp) {
            items = listing(connection, stamp, client).items;
        }))
        return *error;
    return items;
}

const FollowUpControllers::Listing& FollowUpControllers::listing(Connection& connection, const Database::Stamp& stamp,
                                                                 const std::string& client) {
    if (stamp != copies_.stamp) copies_ = {stamp, {}};
    if (auto copy = copies_.listings.find(client); copy != copies_.listings.end()) return copy->second;
    return copies_.listings.emplace(client, listed(connection, client)).first->second;
}

FollowUpControllers::Listing FollowUpControllers::listed(Connection& connection, const std::string& client) {
    Listing listing;
    Statement& rows = connection.statement(selectAll).bind(0, client);
    while (rows.step()) {
        if (std::optional<FollowUpItem> item = storedItem(rows))
            listing.items.push_back(*std::move(item));
        else
            listing.isWhole = false;
    }
    return listing;
}

std::vector<FollowUpItem> FollowUpControllers::pending(Connection& connection, const std::string& client) {
    return listed(connection, client).items;
}

// Whether the item is pending with the same content. Without a current listing it reads one row: in a series of posts
// each makes the listing out of date.
bool FollowUpControllers::isPending(Connection& connection, const Database::Stamp& stamp, const std::string& client,
                                    const FollowUpItem& item) const {
    const auto copy = copies_.listings.find(client);
    if (stamp == copies_.stamp && copy != copies_.listings.end()) {
        const std::vector<FollowUpItem>& items = copy->second.items;
        return std::find(items.begin(), items.end(), item) != items.end();
    }
    Statement& row = connection.statement(selectOne).bind(0, client).bind(1, item.uniqueIdentifier);
    return row.step() && storedItem(row) == item;
}

}  // namespace vrx::host
