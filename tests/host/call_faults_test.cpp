// The agent's parts that store something, under calls that fail: nothing that was acknowledged is lost, nothing is
// claimed that is not stored, and a sound file stays where it is.
#include "host/call_faults.h"

#include <map>

#include "host/activities/real_activities.h"
#include "host/support.h"
#include "vrx/coverage/records/warranty.h"
#include "vrx/host/base/files.h"
#include "vrx/host/home/defaults_store.h"
#include "vrx/host/home/follow_up_controller.h"
#include "vrx/platform/vendor.h"

namespace vrx::host {
namespace {

using platform::FollowUpItem;
using platform::Value;
using ::testing::IsSupersetOf;

constexpr int prepared = 40;  // settings of 500 bytes, several pages in all

// Each slice tries every so manieth call. Sanitized programs are slow, so they try some of them.
constexpr int slices = 4;
constexpr int stride = isSanitized ? 17 : 1;

const bool isInstalled = (CallFaults::install(), true);

std::string key(int number) {
    return "key" + std::to_string(number);
}

using Firings = std::map<std::string, int>;

struct Agent {
    Agent(const std::string& home, Firings& firings) : firings(firings), process(home + "/host.db"), files(home) {
        process.activities().setHandlerFactory([this](const std::string& name) { return handler(name); });
    }

    platform::ActivityHandler handler(const std::string& name) {
        return [this, name](platform::OnceCallback<platform::BackgroundActivityResult> completion) {
            ++firings[name];
            if (name == "due") schedule("its next", 5);
            completion(platform::BackgroundActivityResult::Finished);
        };
    }
    // These return whether it is stored.
    bool schedule(const std::string& name, std::int64_t delay) {
        process.activities().schedule({.identifier = name, .criteria{{.delay = delay}}}, handler(name));
        return !process.hasWorkInFlight();
    }
    bool post(const std::string& name) { return !followUps->postFollowUpItem(FollowUpItem{.uniqueIdentifier = name}); }
    bool cache(const std::string& serialNumber, int round) {
        const std::size_t logged = process.logged().size();
        VRXWarranty::warrantyWithDictionary(Dictionary{{"round", round}})->cacheWarranty(serialNumber);
        const auto lines = process.logged();
        return std::none_of(lines.begin() + static_cast<std::ptrdiff_t>(logged), lines.end(),
                            [](const auto& line) { return line.starts_with("Cannot write the cached record"); });
    }
    // The round of what is cached, or null.
    Value cached(const std::string& serialNumber) {
        const auto record = VRXWarranty::cachedWarrantyForSerialNumber(serialNumber);
        return record ? record->dictionaryRepresentation()["round"] : Value();
    }

    Firings& firings;
    RealActivities process;
    Database& database = process.restart();
    DefaultsStore store{database};
    FollowUpControllers controllers{database};
    std::unique_ptr<platform::FollowUpController> followUps = controllers.makeController("client");
    Files files;
    codec::Digest digest;
    codec::PropertyList propertyList;
    platform::Platform platform{{.defaultsStore = &store,
                                 .digest = &digest,
                                 .files = &files,
                                 .propertyList = &propertyList,
                                 .systemLog = &platform::Platform::current().systemLog()}};
    platform::ScopedPlatform current{platform};
};

class CallFaultsTest : public ::testing::TestWithParam<std::tuple<CallFaults::Kind, bool, int>> {
protected:
    // Two activities are scheduled, and the run of one of them was cut off. The system's own are still to come.
    void SetUp() override {
        Firings none;
        Agent agent(home / "", none);
        for (int i = 0; i < prepared; ++i) agent.store.set(key(i), std::string(500, 'x'));
        ASSERT_TRUE(agent.post("prepared") && agent.cache("A", 0));
        agent.process.pass(1s);
        ASSERT_TRUE(agent.schedule("due", 5) && agent.schedule("interrupted", 5));
        ASSERT_FALSE(agent.database.write([](Connection& connection) {
            connection.execute(
                "DELETE FROM host_facts;"
                "INSERT INTO activity_runs (identifier, generation, began) "
                "SELECT identifier, generation, 0 FROM activities WHERE identifier = 'interrupted'");
        }));
    }

    // What an agent does from its start to its end, with a fault on the way. Afterwards it is started again.
    void runWithFault(int call) {
        const auto [kind, isForGood, slice] = GetParam();
        TemporaryFolder folder;
        std::filesystem::copy(home.path(), folder.path(), std::filesystem::copy_options::recursive);
        std::vector<std::string> acknowledged, posted;
        std::map<std::string, bool> isCached;
        // Each is to run once, whatever happens.
        std::vector<std::string> scheduled = {platform::vendorIdentifier(platform::upgradeActivityRemainder),
                                              platform::vendorIdentifier(platform::bootActivityRemainder), "due",
                                              "its next", "interrupted"};
        Firings firings;
        bool isCleared = false, isAtRest = false;
        CallFaults::fail(kind, call, isForGood);
        {
            Agent agent(folder.path(), firings);
            for (int i = 0; i < 2; ++i) {
                const Value read = agent.store.get(key(i));
                EXPECT_TRUE(read.isNull() || read == Value(std::string(500, 'x')));
            }
            for (const char* name : {"one", "two"}) {
                if (!agent.store.write(name, name)) acknowledged.push_back(name);
                if (agent.post(name)) posted.push_back(name);
                if (agent.schedule(name, name[0] == 'o' ? 0 : 86400)) scheduled.push_back(name);
            }
            if (const auto pending = agent.followUps->pendingFollowUpItems()) {
                EXPECT_GE(pending->size(), posted.size() + 1);
            }
            isCleared = !agent.followUps->clearPendingFollowUpItems({"prepared"});
            for (const char* name : {"A", "B"}) isCached[name] = agent.cache(name, 1);
            EXPECT_THAT(agent.cached("A"), AnyOf(Value(), Value(0), Value(1)));
            agent.process.pass(1s);
            agent.database.write([](Connection& connection) {
                connection.execute("INSERT INTO activity_requests (identifier) VALUES ('asked')");
            });
            agent.process.registry().reconsider();
            agent.process.pass(9s);
            isAtRest = !agent.process.hasWorkInFlight();
            EXPECT_THAT(agent.process.logged(), Not(Contains(HasSubstr("another process"))))
                << "it has the home to itself";
        }
        hasFailed = CallFaults::end();
        EXPECT_TRUE(isAtRest || isForGood);

        Database between(folder / "host.db");
        const auto error = between.open();
        ASSERT_FALSE(error) << error->text;
        std::vector<std::string> begun;
        const ActivityList list = listActivities(between).value();
        for (const ActivityRun& run : list.runs) begun.push_back(run.identifier);
        for (const auto& [name, count] : firings) EXPECT_THAT(begun, Contains(name)) << "nothing says that it ran";
        bool isToldToBeFired = false;
        between.read([&](Connection& connection) {
            isToldToBeFired = connection.integer("SELECT count(*) FROM activity_requests WHERE answer = 1") == 1;
        });
        EXPECT_TRUE(!isToldToBeFired || firings.contains("asked"));

        Agent next(folder.path(), firings);
        for (int i = 0; i < prepared; ++i) EXPECT_EQ(next.store.get(key(i)), Value(std::string(500, 'x')));
        for (const std::string& name : acknowledged) EXPECT_EQ(next.store.get(name), Value(name));
        std::vector<std::string> pending;
        const auto listed = next.followUps->pendingFollowUpItems();
        for (const FollowUpItem& item : listed.value()) pending.push_back(item.uniqueIdentifier);
        EXPECT_THAT(pending, IsSupersetOf(posted));
        EXPECT_FALSE(isCleared && std::ranges::find(pending, "prepared") != pending.end());
        EXPECT_THAT(next.cached("A"), AnyOf(Value(isCached["A"] ? 1 : 0), Value(1)));
        EXPECT_THAT(next.cached("B"), AnyOf(isCached["B"] ? Value(1) : Value(), Value(1)));
        EXPECT_TRUE(next.cache("A", 2) && next.cache("B", 2)) << "what the other left over is not in the way";
        next.process.pass(48h);
        for (const std::string& name : scheduled) {
            EXPECT_GE(firings[name], 1) << name;
            EXPECT_LE(firings[name], isAtRest ? 1 : 2) << name;
        }
        std::size_t files = 0;
        for (const auto& entry : std::filesystem::recursive_directory_iterator(folder.path()))
            files += entry.is_regular_file();
        EXPECT_EQ(files, 5u) << "two records, host.db, and two that SQLite keeps beside it";
    }

    TemporaryFolder home;
    bool hasFailed = false;
};

TEST_P(CallFaultsTest, LoseNothingThatWasAcknowledged) {
    const int slice = std::get<2>(GetParam());
    int tried = 0;
    for (bool goesOn = true; goesOn; ++tried) {
        const int call = 1 + (slice + slices * tried) * stride;
        SCOPED_TRACE("call " + std::to_string(call));
        runWithFault(call);
        goesOn = hasFailed && !HasFailure();
    }
    EXPECT_GT(tried * slices * stride, 20);
    RecordProperty("tried", tried);
}

std::string nameOf(const ::testing::TestParamInfo<CallFaultsTest::ParamType>& info) {
    const auto [kind, isForGood, slice] = info.param;
    const char* const kinds[] = {"", "Calls", "Reads", "Allocations"};
    return std::string(kinds[static_cast<int>(kind)]) + (isForGood ? "ForGood" : "Once") + std::to_string(slice);
}

INSTANTIATE_TEST_SUITE_P(Of, CallFaultsTest,
                         ::testing::Combine(::testing::Values(CallFaults::Kind::Call, CallFaults::Kind::Read,
                                                              CallFaults::Kind::Allocation),
                                            ::testing::Bool(), ::testing::Range(0, slices)),
                         nameOf);

}  // namespace
}  // namespace vrx::host
