#include "vrx/sim/follow_up_controller.h"

#include <algorithm>
#include <cerrno>
#include <utility>

#include "vrx/codec/property_list.h"

namespace vrx::sim {

using platform::Error;
using platform::FollowUpItem;
using platform::MaybeError;
using platform::Result;

class FollowUpControllers::Controller final : public platform::FollowUpController {
public:
    Controller(FollowUpControllers& service, std::string client) : service_(service), client_(std::move(client)) {}

    MaybeError postFollowUpItem(const FollowUpItem& item) override {
        MaybeError error = post(item);
        service_.tell({.request = Request::Post, .isDone = !error, .item = &item});
        return error;
    }
    MaybeError clearPendingFollowUpItems(const std::vector<std::string>& uniqueIdentifiers) override {
        MaybeError error = clear(uniqueIdentifiers);
        service_.tell({.request = Request::Clear, .isDone = !error, .identifiers = &uniqueIdentifiers});
        return error;
    }
    Result<std::vector<FollowUpItem>> pendingFollowUpItems() override {
        MaybeError error = service_.begin(Request::List, "list");
        service_.tell({.request = Request::List, .isDone = !error});
        if (error) return *error;
        return pending();
    }

private:
    MaybeError post(const FollowUpItem& item) {
        if (MaybeError error = service_.begin(Request::Post, "post " + item.uniqueIdentifier)) return error;
        auto stored = codec::serializePropertyList(item.userInfo, platform::PropertyListFormat::Binary);
        if (!stored) return stored.error();
        if (service_.interference_.strikes(Defect::PostLost)) return std::nullopt;
        auto present = std::ranges::find(pending(), item.uniqueIdentifier, &FollowUpItem::uniqueIdentifier);
        if (present == pending().end() || service_.interference_.strikes(Defect::ItemDoubled))
            pending().push_back(item);
        else
            *present = item;
        service_.changed();
        return std::nullopt;
    }
    MaybeError clear(const std::vector<std::string>& uniqueIdentifiers) {
        std::string request = "clear";
        for (const std::string& identifier : uniqueIdentifiers) request += " " + identifier;
        if (MaybeError error = service_.begin(Request::Clear, std::move(request))) return error;
        if (service_.interference_.strikes(Defect::ClearLost)) return std::nullopt;
        std::erase_if(pending(), [&](const FollowUpItem& item) {
            return std::ranges::find(uniqueIdentifiers, item.uniqueIdentifier) != uniqueIdentifiers.end();
        });
        service_.changed();
        return std::nullopt;
    }
    std::vector<FollowUpItem>& pending() { return service_.pending(client_); }

    FollowUpControllers& service_;
    const std::string client_;
};

std::unique_ptr<platform::FollowUpController> FollowUpControllers::makeController(std::string clientIdentifier) {
    return std::make_unique<Controller>(*this, std::move(clientIdentifier));
}

MaybeError FollowUpControllers::begin(Request request, std::string text) {
    interference_.call();
    asked_.push_back(std::move(text));
    int& failures = failures_[request];
    if (failures == 0) return std::nullopt;
    --failures;
    return Error{platform::error_domain::followUp, EIO,
                 "failed to " + asked_.back().substr(0, asked_.back().find(' '))};
}

}  // namespace vrx::sim
