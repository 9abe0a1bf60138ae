// The one-time move from the older single-device layout, at start.
#include "support/simulated_host.h"
#include "vrx/coverage/records/warranty.h"
#include "vrx/service/start_up.h"

namespace vrx {
namespace {

TEST(Migration, HappensOnceWhateverCameOfIt) {
    constexpr std::size_t moves = 3, loses = 2, nothing = 0;  // what is asked of the follow-ups
    for (const auto& [stored, file, asked] : {std::tuple(Value(), "", moves),
                                              {0, "", moves},
                                              {1, "", moves},
                                              {-7, "", moves},
                                              {1, "damaged", loses},
                                              {2, "", nothing},
                                              {5, "", nothing},
                                              {std::int64_t{1} << 40, "", nothing}}) {
        SCOPED_TRACE(stored.description() + file);
        sim::Host host;
        auto& pending = host.followUps.pending("com.orvane.Vireo");
        pending = {{.uniqueIdentifier = "com.orvane.Vireo"}};
        host.followUps.fail(sim::FollowUpControllers::Request::Clear);
        VRXWarranty::initWithDictionary(Dictionary{{"qxLocalizedOfferLabel", "label"}})->cache();
        if (asked == loses) host.files.put(VRXWarranty::_legacyWarrantyPath(), file);
        host.defaults.set("VRXMigrationVersion", stored);
        for (int start = 0; start < 2; ++start) StartUp();
        EXPECT_EQ(host.followUps.asked().size(), asked);
        EXPECT_EQ(host.defaults.get("VRXMigrationVersion"), asked == nothing ? stored : Value(2));
        EXPECT_EQ(host.log.count("default device SerialNumber: '%{private}@'"), asked == nothing ? 0 : 1);
        EXPECT_EQ(host.files.contains(VRXWarranty::_legacyWarrantyPath()), asked != moves);
        EXPECT_EQ(pending.back().title.value_or(""), asked == moves ? "label" : "") << "that of the record";
    }
}

}  // namespace
}  // namespace vrx
