// The simulated facilities: the faults that a test scripts, what is reported of wrong use, and what the end of a
// process takes.
#include "vrx/sim/host.h"

#include <cerrno>

#include "support/values.h"

namespace vrx::sim {
namespace {

TEST(SimFiles, FailAsScriptedAndKeepTheOldContent) {
    Host host;
    std::string path = host.files.homeDirectory() + "/a";
    host.files.put(path, "old");
    host.files.fail(Files::Operation::Replace, ENOSPC, 2);
    host.files.fail(Files::Operation::Read, EIO);
    EXPECT_EQ(host.files.replace(path, Data{'1'})->code, ENOSPC);
    EXPECT_EQ(host.files.replace(path, Data{'2'})->code, ENOSPC);
    EXPECT_EQ(host.files.read(path).error().code, EIO);

    host.files.crashNextReplace();
    EXPECT_TRUE(host.files.replace(path, Data{'3'}));
    EXPECT_EQ(host.files.content(path), "old");
    EXPECT_EQ(host.files.paths().size(), 2u) << "what was to replace it lies beside it";
    EXPECT_THAT(host.files.written(), IsEmpty());

    EXPECT_FALSE(host.files.replace(path, Data{'4'}));
    EXPECT_EQ(host.files.content(path), "4");
    EXPECT_THAT(host.files.written(), ElementsAre(path));
}

TEST(SimDefaults, FailAndInterfereAsScripted) {
    Host host;
    host.defaults.set("key", 1);
    host.defaults.failWrites(2);
    host.defaults.set("key", 2);
    host.defaults.update("key", [](const Value&) { return 3; });
    EXPECT_EQ(host.defaults.get("key"), Value(1));
    EXPECT_EQ(host.log.messages(platform::Level::Error).size(), 2u);

    host.defaults.interfereWithNextUpdate(10);
    host.defaults.update("key", [](const Value& value) { return *value.asInteger() + 1; });
    EXPECT_EQ(host.defaults.get("key"), Value(11));
    EXPECT_THAT(host.defaults.writes(), ElementsAre("key", "key", "key", "key"));

    std::vector<std::string> failures;
    host.failures.handler = [&](const std::string& text) { failures.push_back(text); };
    host.defaults.update("key", [&](const Value&) { return host.defaults.get("other"); });
    EXPECT_EQ(failures.size(), 1u) << "the function uses the store";
}

TEST(SimProcess, TakesItsMemoryAlongWhenItEnds) {
    std::vector<std::string> notes;
    const auto note = [&](const char* text) { return [&notes, text] { notes.push_back(text); }; };
    Host host;
    host.process.launch([&] {
        host.notifications.registerForNotification("com.orvane.n", host.queues.mainQueue(), note("notified"));
        return std::shared_ptr<void>(nullptr, [gone = note("gone")](void*) { gone(); });
    });
    host.defaults.set("stored", 1);
    host.defaults.registerDefaults({{"registered", 1}});
    auto& worker = host.queues.workers(platform::Priority::Background);
    worker.post([&] {
        std::shared_ptr<void> unwound(nullptr, [unwind = note("unwound")](void*) { unwind(); });
        host.queues.makeEvent()->wait();
    });
    worker.postAfter(1s, note("never"));
    host.notifications.raise(".n");
    host.run();
    host.notifications.raise(".n");  // delivered, but not yet taken
    host.process.kill();
    host.runFor(2s);
    EXPECT_THAT(notes, ElementsAre("notified", "unwound", "gone"));
    EXPECT_EQ(host.defaults.dictionaryRepresentation(), (Dictionary{{"stored", 1}}));
    host.notifications.raise(".n");
    host.process.relaunch();
    host.run();
    EXPECT_EQ(notes.back(), "notified") << "what was missed is heard of";
}

}  // namespace
}  // namespace vrx::sim
