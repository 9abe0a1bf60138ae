// What only a registry that is stored does; what every registry does is in tests/contract.
#include "vrx/host/activities/background_activities.h"

#include <chrono>

#include "host/activities/real_activities.h"

namespace vrx::host {
namespace {

using platform::BackgroundActivityResult;
using platform::OnceCallback;
using ::testing::SizeIs;
using enum BackgroundActivityResult;

class StoredActivities : public ::testing::Test {
protected:
    void SetUp() override { subject.restart(); }
    void schedule(const std::string& identifier, std::int64_t delay) {
        subject.activities().schedule({.identifier = identifier, .criteria{{.delay = delay}}},
                                      [this, identifier](OnceCallback<BackgroundActivityResult> completion) {
                                          firings.push_back(identifier);
                                          completions.push_back(std::move(completion));
                                      });
    }
    std::vector<std::string> firingsAfter(Duration time) {
        subject.pass(time);
        return std::exchange(firings, {});
    }
    void execute(const std::string& sql) {
        EXPECT_FALSE(tool.write([&](Connection& connection) { connection.execute(sql.c_str()); }));
    }
    // What the agent answers a tester.
    FiringAnswer request(const std::string& identifier) {
        execute("INSERT INTO activity_requests (identifier) VALUES ('" + identifier + "')");
        subject.registry().reconsider();
        subject.pass(0s);
        std::int64_t answer = 0;
        EXPECT_FALSE(tool.read([&](Connection& connection) {
            answer = connection.integer("SELECT answer FROM activity_requests ORDER BY number DESC");
        }));
        return static_cast<FiringAnswer>(answer);
    }
    // Besides the upgrade and the boot activity, which nobody runs here.
    std::vector<std::string> scheduled() {
        std::vector<std::string> identifiers;
        for (const ScheduledActivity& activity : subject.scheduled()) identifiers.push_back(activity.identifier);
        return {identifiers.begin() + 2, identifiers.end()};
    }

    RealActivities subject;
    Database tool{subject.databasePath()};
    std::vector<std::string> firings;
    std::vector<OnceCallback<BackgroundActivityResult>> completions;
};

// A database that refuses, then works again, as one on a disk that was full.
TEST_F(StoredActivities, KeepWhatCannotBeStoredAndFireNothingMeanwhile) {
    schedule("due", 9);
    schedule("running", 0);
    EXPECT_THAT(firingsAfter(1s), ElementsAre("running"));
    execute("CREATE TRIGGER a BEFORE INSERT ON activities BEGIN SELECT RAISE(ABORT, 'full'); END");
    execute("CREATE TRIGGER b BEFORE UPDATE ON activity_runs BEGIN SELECT RAISE(ABORT, 'full'); END");
    schedule("new", 9);
    completions[0](Finished);
    schedule("new", 99);
    EXPECT_THAT(firingsAfter(10min), IsEmpty());
    execute("DROP TRIGGER a; DROP TRIGGER b");
    EXPECT_THAT(firingsAfter(1min), ElementsAre("due", "new")) << "and the run that ended meanwhile has ended";
    EXPECT_THAT(scheduled(), ElementsAre("due", "new"));
    EXPECT_THAT(subject.logged(), SizeIs(1));
    completions[1](Finished);
    completions[2](Finished);
    subject.pass(1s);
    const int wakeUps = subject.wakeUps();
    schedule("late", 30 * 86400);
    EXPECT_THAT(firingsAfter(30 * 24h), IsEmpty());
    EXPECT_EQ(subject.wakeUps(), wakeUps) << "nothing was due meanwhile";
}

TEST_F(StoredActivities, KeepTheLastRunsOfEach) {
    schedule("once", 0);
    EXPECT_THAT(firingsAfter(1s), ElementsAre("once"));
    completions.back()(Finished);
    for (int run = 0; run < 60; ++run) {
        schedule("often", 0);
        subject.pass(1s);
        completions.back()(run % 2 == 0 ? Finished : Deferred);
        subject.pass(0s);
    }
    const std::vector<ActivityRun> history = listActivities(tool)->history;
    ASSERT_EQ(history.size(), 51u);
    EXPECT_EQ(history[0].identifier, "once");
    for (std::size_t i = 1; i < history.size(); ++i) {
        EXPECT_EQ(history[i].outcome, i % 2 == 1 ? RunOutcome::Finished : RunOutcome::Deferred);
        EXPECT_LE(history[i - 1].began, history[i].began);
    }
    EXPECT_EQ(listActivities(tool)->runs.size(), 2u);
}

TEST_F(StoredActivities, FollowTheFileWhenAnotherTakesItsPlace) {
    schedule("running", 0);
    schedule("due here only", 59);
    subject.pass(1s);
    const std::string path = subject.databasePath();
    ASSERT_FALSE(tool.peek([&](Connection& connection, const Database::Stamp&) {
        connection.execute(("VACUUM INTO '" + path + ".copy'").c_str());
    }));
    schedule("lost", 59);
    std::filesystem::rename(path + ".copy", path);
    subject.registry().reconsider();
    subject.pass(1s);
    EXPECT_THAT(scheduled(), ElementsAre("running", "due here only")) << "the run under way is not taken for cut off";

    // A run of one file's registration ends no other file's.
    std::filesystem::remove(path);
    subject.registry().reconsider();
    schedule("running", 59);
    completions[0](Finished);
    subject.pass(1s);
    EXPECT_THAT(scheduled(), ElementsAre("running"));
    EXPECT_THAT(subject.logged(), ElementsAre(HasSubstr("was replaced"), HasSubstr("was replaced")));
    firings.clear();
    EXPECT_THAT(firingsAfter(1h), ElementsAre("running"));
    completions.back()(Finished);
}

TEST_F(StoredActivities, FireAtATestersRequestAsTheSystemWould) {
    EXPECT_EQ(request("a"), FiringAnswer::Unknown);
    schedule("a", 3599);
    EXPECT_EQ(request("a"), FiringAnswer::Fired);
    EXPECT_EQ(request("a"), FiringAnswer::AlreadyRunning);
    completions[0](Deferred);  // its time has not come: it has the same due time as before
    EXPECT_THAT(firingsAfter(59min), ElementsAre("a"));
    EXPECT_THAT(firingsAfter(1min), ElementsAre("a"));
    completions[1](Finished);
    subject.pass(1s);
    EXPECT_THAT(scheduled(), IsEmpty());
    EXPECT_EQ(request("a"), FiringAnswer::Fired) << "what is not scheduled";
    completions[2](Finished);
    subject.pass(24h);
    EXPECT_THAT(firings, ElementsAre("a"));

    execute("INSERT INTO activity_requests (identifier) VALUES ('a')");
    subject.restart();
    subject.pass(1h);
    EXPECT_THAT(firings, ElementsAre("a")) << "who asked an earlier process has gone";
}

}  // namespace
}  // namespace vrx::host
