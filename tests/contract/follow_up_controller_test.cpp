// What every follow-up service does, simulated or real.
#include "platform/follow_up_controller.h"

#include <gmock/gmock.h>

#include "sim/host.h"

namespace vrx {
namespace {

using platform::Array;
using platform::dateFromEpoch;
using platform::Dictionary;
using platform::FollowUpItem;
using testing::ElementsAre;
using testing::IsEmpty;

class SimulatedService {
public:
    platform::FollowUpControllers& controllers() { return host_.followUps; }
    // What the next process finds.
    void restart() {}

private:
    sim::Host host_;
};

template <class Subject>
class FollowUpControllerContract : public testing::Test {
protected:
    // A controller for each request, as the agent has it.
    std::unique_ptr<platform::FollowUpController> controller(const std::string& client = "client") {
        return subject.controllers().makeController(client);
    }
    bool post(const FollowUpItem& item) { return !controller()->postFollowUpItem(item); }
    bool clear(const std::vector<std::string>& identifiers) {
        return !controller()->clearPendingFollowUpItems(identifiers);
    }
    std::vector<FollowUpItem> pending(const std::string& client = "client") {
        auto items = controller(client)->pendingFollowUpItems();
        return items ? *items : std::vector<FollowUpItem>{{.uniqueIdentifier = "could not be listed"}};
    }
    std::vector<std::string> identifiers() {
        std::vector<std::string> identifiers;
        for (const FollowUpItem& item : pending()) identifiers.push_back(item.uniqueIdentifier);
        return identifiers;
    }
    static FollowUpItem item(std::string identifier) { return {.uniqueIdentifier = std::move(identifier)}; }

    Subject subject;
};

struct Names {
    template <class Subject>
    static std::string GetName(int) {
        return std::is_same_v<Subject, SimulatedService> ? "Simulated" : "Real";
    }
};
using Subjects = testing::Types<SimulatedService>;
TYPED_TEST_SUITE(FollowUpControllerContract, Subjects, Names);

TYPED_TEST(FollowUpControllerContract, KeepsItemsWholeAcrossProcesses) {
    const FollowUpItem full{
        .uniqueIdentifier = "full",
        .groupIdentifier = "group",
        .targetBundleIdentifier = "target",
        .extensionIdentifier = "extension",
        .displayStyle = 2 | 1 | 16 | (1ULL << 40),
        .title = "Ünïcode 🙂",
        .informativeFooterText = "",
        .expirationDate = dateFromEpoch(1769860799.999),  // gone by, and pending all the same
        .userInfo = {{"text", "t"}, {"flag", true}, {"number", 1.5}, {"deep", Dictionary{{"list", Array{1, "2"}}}}},
        .actions = {{.label = "label"}, {.url = "https://url.example/"}, {}}};
    FollowUpItem far = this->item("far");
    far.expirationDate = dateFromEpoch(253402300799.999);  // the end of the year 9999
    FollowUpItem early = this->item("early");
    early.expirationDate = dateFromEpoch(-62135596800);  // the begin of the year 1
    for (const FollowUpItem& item : {full, this->item("bare"), far, early}) EXPECT_TRUE(this->post(item));
    this->subject.restart();
    EXPECT_THAT(this->pending(), ElementsAre(full, this->item("bare"), far, early));
    EXPECT_THAT(this->pending("other client"), IsEmpty());
}

TYPED_TEST(FollowUpControllerContract, ReplacesAnItemInItsPlace) {
    for (const char* identifier : {"a", "b", "c"}) EXPECT_TRUE(this->post(this->item(identifier)));
    FollowUpItem other = this->item("b");
    other.title = "other";
    EXPECT_TRUE(this->post(other));
    EXPECT_TRUE(this->post(other)) << "nothing new in it";
    EXPECT_THAT(this->pending(), ElementsAre(this->item("a"), other, this->item("c")));

    FollowUpItem bad = this->item("b");
    bad.userInfo = {{"null", nullptr}};
    EXPECT_FALSE(this->post(bad)) << "what cannot be kept";
    EXPECT_EQ(this->pending().at(1), other);
}

TYPED_TEST(FollowUpControllerContract, ClearsWhatIsThere) {
    for (const char* identifier : {"a", "b", "c", "d"}) EXPECT_TRUE(this->post(this->item(identifier)));
    EXPECT_FALSE(this->controller("other client")->clearPendingFollowUpItems({"b"}));
    EXPECT_TRUE(this->clear({}));
    EXPECT_TRUE(this->clear({"unknown"}));
    EXPECT_THAT(this->identifiers(), ElementsAre("a", "b", "c", "d"));
    EXPECT_TRUE(this->clear({"d", "unknown", "a", "a"}));
    EXPECT_TRUE(this->post(this->item("a")));
    EXPECT_THAT(this->identifiers(), ElementsAre("b", "c", "a"));
    this->subject.restart();
    EXPECT_THAT(this->identifiers(), ElementsAre("b", "c", "a"));
}

}  // namespace
}  // namespace vrx
