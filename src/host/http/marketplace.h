// The Marketplace over HTTP: the catalogue's lookup and the account's purchase history, each a GET that is answered
// with a JSON object. The device profile gives their addresses, read for each request; docs/formats.md describes both
// exchanges. Any thread may ask; answers come on workers.
#pragma once

#include "vrx/host/profile/device_profile.h"
#include "vrx/platform/purchase_history.h"
#include "vrx/platform/store.h"

namespace vrx::host {

class Marketplace final : public platform::Store {
public:
    explicit Marketplace(const DeviceProfile& profile) : profile_(profile) {}

    platform::StoreProfile lookupProfile() const override;
    // No-op: every key is always available.
    void registerBagKeys(const platform::StoreProfile&) override {}
    std::shared_ptr<platform::StoreBag> openBag(const std::string& profile, const std::string& version) override;
    std::unique_ptr<platform::StoreLookup> makeLookup(std::shared_ptr<platform::StoreBag> bag, std::string callerName,
                                                      platform::StoreKeyProfile keyProfile) override;

private:
    const DeviceProfile& profile_;
};

class PurchaseHistory final : public platform::PurchaseHistory {
public:
    explicit PurchaseHistory(const DeviceProfile& profile) : profile_(profile) {}

    void runQuery(platform::PurchaseQuery query,
                  platform::OnceCallback<std::vector<platform::Purchase>> resultHandler) override;

private:
    const DeviceProfile& profile_;
};

}  // namespace vrx::host
