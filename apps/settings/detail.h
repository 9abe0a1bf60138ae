// What the page shows of one device, and of one offer: the groups of a page of preferences. The main thread only.
#pragma once

#include <adwaita.h>

#include <functional>
#include <vector>

#include "settings/model.h"

namespace vrx::settings {

struct OfferHandlers {
    std::function<void(const Offer&)> showDetails;
    std::function<void(const Offer&)> dismiss;
};

// An offer with its text and its buttons.
AdwPreferencesGroup* offerGroup(const Offer& offer, const OfferHandlers& handlers);

// A device's record. The caller owns the groups, which float.
std::vector<AdwPreferencesGroup*> deviceGroups(const Device& device, const std::vector<Offer>& offers,
                                               const OfferHandlers& handlers);

// An offer's details. The device is null when the offer is for none that is known.
std::vector<AdwPreferencesGroup*> offerDetailsGroups(const Offer& offer, const Device* device,
                                                     const OfferHandlers& handlers);

}  // namespace vrx::settings
