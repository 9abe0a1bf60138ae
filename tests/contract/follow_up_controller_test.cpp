// What every follow-up service does, simulated or real.
#include "vrx/platform/follow_up_controller.h"

#include "contract/hosts.h"

namespace vrx {
namespace {

using platform::FollowUpItem;

template <class Host>
class FollowUpControllerContract : public ContractTest<Host> {
protected:
    // A controller for each request, as the agent has it.
    auto controller(const std::string& client = "client") { return this->host.followUps().makeController(client); }
    bool post(const FollowUpItem& item) { return !controller()->postFollowUpItem(item); }
    bool clear(const std::vector<std::string>& some) { return !controller()->clearPendingFollowUpItems(some); }
    std::vector<FollowUpItem> pending() { return controller()->pendingFollowUpItems().value(); }

    const FollowUpItem a{.uniqueIdentifier = "a"}, b{.uniqueIdentifier = "b"}, c{.uniqueIdentifier = "c"};
};

TYPED_TEST_SUITE(FollowUpControllerContract, Hosts, HostNames);

TYPED_TEST(FollowUpControllerContract, KeepsItemsWholeAcrossProcesses) {
    FollowUpItem full{"full", "group", "target", "extension", 2 | 1 | 16 | (1ULL << 40), "Ünï 🙂", ""};
    full.expirationDate = dateFromEpoch(1769860799.999);  // gone by, and pending all the same
    full.userInfo = {{"text", "t"}, {"flag", true}, {"number", 1.5}, {"deep", Dictionary{{"list", Array{1, "2"}}}}};
    full.actions = {{.label = "label"}, {.url = "https://url.example/"}, {}};
    FollowUpItem far = this->b, early = this->c;
    far.expirationDate = dateFromEpoch(253402300799.999);  // the end of the year 9999
    early.expirationDate = dateFromEpoch(-62135596800);    // the begin of the year 1
    for (const FollowUpItem& item : {full, this->a, far, early}) EXPECT_TRUE(this->post(item));
    this->host.restart();
    EXPECT_THAT(this->pending(), ElementsAre(full, this->a, far, early));
    EXPECT_TRUE(this->controller("other client")->pendingFollowUpItems().value().empty());
}

TYPED_TEST(FollowUpControllerContract, ReplacesInPlaceAndClearsWhatIsThere) {
    for (const FollowUpItem& item : {this->a, this->b, this->c}) EXPECT_TRUE(this->post(item));
    FollowUpItem other = this->b, bad = this->b;
    other.title = "other";
    bad.userInfo = {{"null", nullptr}};
    EXPECT_TRUE(this->post(other));
    EXPECT_TRUE(this->post(other)) << "nothing new in it";
    EXPECT_FALSE(this->post(bad)) << "what cannot be kept";
    EXPECT_FALSE(this->controller("other client")->clearPendingFollowUpItems({"b"}));
    for (const auto& some : {std::vector<std::string>{}, {"unknown"}}) EXPECT_TRUE(this->clear(some));
    EXPECT_THAT(this->pending(), ElementsAre(this->a, other, this->c));
    EXPECT_TRUE(this->clear({"c", "unknown", "a", "a"}));
    EXPECT_TRUE(this->post(this->a));
    this->host.restart();
    EXPECT_THAT(this->pending(), ElementsAre(other, this->a));
}

}  // namespace
}  // namespace vrx
