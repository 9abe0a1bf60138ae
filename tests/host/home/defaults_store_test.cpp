#include "vrx/host/home/defaults_store.h"

#include <fcntl.h>
#include <gmock/gmock.h>
#include <sys/stat.h>
#include <sys/wait.h>
#include <unistd.h>

#include <csignal>
#include <limits>
#include <thread>

#include "host/support.h"

namespace vrx::host {
namespace {

using platform::Array;
using platform::Data;
using platform::Dictionary;
using platform::MaybeError;
using platform::Value;
using ::testing::ElementsAre;
using ::testing::HasSubstr;

constexpr auto append = [](const Value& element) {
    return [element](const Value& list) {
        Array longer = list.asArray() ? *list.asArray() : Array();
        longer.push_back(element);
        return Value(longer);
    };
};

// A child process that does the work and ends without any clean-up. It must be made before this process has threads.
template <class F>
pid_t inChild(F work) {
    const pid_t child = fork();
    if (child == 0) {
        work();
        _exit(0);
    }
    return child;
}

class DefaultsStoreTest : public ::testing::Test {
protected:
    std::string path() const { return folder / "host.db"; }
    MaybeError execute(Database& database, const char* sql) {
        return database.write([&](Connection& connection) { connection.execute(sql); });
    }

    LogRecorder log;
    TemporaryFolder folder;
};

TEST_F(DefaultsStoreTest, KeepsEveryKindOfValueForTheNextProcess) {
    const Dictionary values = {
        {"yes", true},
        {"no", false},
        {"integer", std::numeric_limits<std::int64_t>::min()},
        {"whole", 3.0},
        {"double", 0.1},
        {"infinity", std::numeric_limits<double>::infinity()},
        {"text", std::string("a\0ö", 4)},
        {"empty", ""},
        {"date", platform::dateFromEpoch(1.5e9)},
        {"data", Data{0, 255}},
        {"array", Array{1, "two", Array{}}},
        {"dictionary", Dictionary{{"a", Dictionary{{"b", 0.5}}}}},
    };
    {
        Database database(path());
        DefaultsStore store(database);
        for (const auto& [key, value] : values) store.set(key, value);
        store.set("nan", std::numeric_limits<double>::quiet_NaN());
    }
    Database database(path());
    DefaultsStore store(database);
    for (const auto& [key, value] : values) {
        EXPECT_EQ(store.get(key), value) << key;
        EXPECT_EQ(store.get(key).type(), value.type()) << key;
    }
    EXPECT_TRUE(std::isnan(store.get("nan").asNumber().value_or(0)));
    store.remove("nan");
    EXPECT_EQ(Value(store.dictionaryRepresentation()), Value(values));
    struct stat status;
    for (const char* suffix : {"", "-wal", "-shm"}) {
        ASSERT_EQ(stat((path() + suffix).c_str(), &status), 0);
        EXPECT_EQ(status.st_mode & 0777, 0600u);
    }
    EXPECT_THAT(log.lines(), ElementsAre());
}

TEST_F(DefaultsStoreTest, StoredValuesWinOverRegisteredOnesAndRemovingBringsThemBack) {
    Database database(path());
    DefaultsStore store(database);
    store.registerDefaults({{"a", 1}, {"b", 2}});
    store.registerDefaults({{"b", 3}});
    store.set("a", 10);
    store.update("b", [](const Value& present) { return Value(*present.asInteger() + 1); });
    EXPECT_EQ(Value(store.dictionaryRepresentation()), Value(Dictionary{{"a", 10}, {"b", 4}}));
    store.remove("a");
    store.set("b", nullptr);
    EXPECT_EQ(Value(store.dictionaryRepresentation()), Value(Dictionary{{"a", 1}, {"b", 3}}));
    EXPECT_EQ(store.get("c"), Value());
}

TEST_F(DefaultsStoreTest, UpdatesOfProcessesAndThreadsAtOnceLoseNothing) {
    constexpr int each = 40;
    std::vector<pid_t> children;
    for (int process = 0; process < 2; ++process) {
        children.push_back(inChild([&] {
            Database database(path());
            DefaultsStore store(database);
            for (int i = 0; i < each; ++i) store.update("list", append(Value(1000 * process + i)));
        }));
    }
    Database database(path());
    DefaultsStore store(database);
    std::vector<std::thread> threads;
    for (int thread = 2; thread < 4; ++thread) {
        threads.emplace_back([&, thread] {
            for (int i = 0; i < each; ++i) {
                store.update("list", append(Value(1000 * thread + i)));
                EXPECT_TRUE(store.get("list").asArray());  // own writes are seen at once
            }
        });
    }
    for (std::thread& thread : threads) thread.join();
    for (pid_t child : children) waitpid(child, nullptr, 0);

    std::set<std::int64_t> seen;
    const Value list = store.get("list");  // and those of other processes
    ASSERT_TRUE(list.asArray());
    for (const Value& element : *list.asArray()) seen.insert(element.asInteger().value());
    EXPECT_EQ(seen.size(), 4u * each);
    EXPECT_EQ(list.asArray()->size(), 4u * each);
    EXPECT_THAT(log.lines(), ElementsAre());
}

TEST_F(DefaultsStoreTest, WhatWasWrittenSurvivesAKilledProcess) {
    int ends[2];
    ASSERT_EQ(pipe(ends), 0);
    const pid_t child = inChild([&] {
        Database database(path());
        DefaultsStore store(database);
        for (std::int64_t i = 1;; ++i) {
            store.set("count", i);
            store.update("list", append(Value(i)));
            if (::write(ends[1], &i, sizeof i) != sizeof i) return;
        }
    });
    std::int64_t acknowledged = 0;
    while (acknowledged < 50)
        ASSERT_EQ(::read(ends[0], &acknowledged, sizeof acknowledged), ssize_t{sizeof acknowledged});
    kill(child, SIGKILL);
    waitpid(child, nullptr, 0);
    ::close(ends[1]);
    for (std::int64_t more; ::read(ends[0], &more, sizeof more) == sizeof more;) acknowledged = more;
    ::close(ends[0]);

    Database database(path());
    DefaultsStore store(database);
    EXPECT_GE(store.integer("count"), acknowledged);
    EXPECT_GE(store.get("list").asArray()->size(), static_cast<std::size_t>(acknowledged));
    EXPECT_THAT(log.lines(), ElementsAre());
}

TEST_F(DefaultsStoreTest, AFailedWriteIsLoggedAndLeavesTheEarlierValue) {
    Database database(path());
    DefaultsStore store(database);
    store.set("key", "before");
    // A disk without room for another page.
    ASSERT_FALSE(execute(database, "PRAGMA max_page_count = 1"));
    store.set("key", std::string(100'000, 'x'));
    ASSERT_EQ(log.lines().size(), 1u);
    EXPECT_THAT(log.lines()[0], HasSubstr("Cannot write the setting key: "));
    EXPECT_THAT(log.lines()[0], HasSubstr("full"));
    EXPECT_EQ(store.get("key"), Value("before"));
    ASSERT_FALSE(execute(database, "PRAGMA max_page_count = 1000"));
    store.set("key", Array{1, nullptr});  // no property list
    EXPECT_EQ(log.lines().size(), 2u);
    EXPECT_EQ(store.get("key"), Value("before"));
    store.set("key", std::string(100'000, 'x'));
    EXPECT_EQ(store.string("key")->size(), 100'000u);
}

TEST_F(DefaultsStoreTest, SetsADamagedFileAsideAndBeginsAfresh) {
    {
        Database database(path());
        DefaultsStore store(database);
        for (int i = 0; i < 100; ++i) store.set("key" + std::to_string(i), std::string(500, 'x'));
    }
    const std::string sound = fileText(path());
    const std::string randomLike(sound.size(), '\xa5');
    std::string damagedInside = sound;
    damagedInside.replace(4096, 4096, std::string(4096, '\xa5'));
    for (const std::string& content :
         {randomLike, sound.substr(0, sound.size() / 2), sound.substr(0, 50), damagedInside}) {
        TemporaryFolder home;
        writeFile(home / "host.db", content);
        writeFile(home / "host.db-wal", "remains of a log");
        LogRecorder lines;
        Database database(home / "host.db");
        DefaultsStore store(database);
        store.set("key", 1);
        EXPECT_EQ(store.integer("key"), 1);
        ASSERT_EQ(lines.lines().size(), 1u);
        EXPECT_THAT(lines.lines()[0], HasSubstr("host.db is damaged ("));
        std::size_t kept = 0;
        for (const std::string& name : home.names()) {
            if (!name.starts_with("host.db.damaged-")) continue;
            if (name.ends_with("-shm")) continue;
            ++kept;
            EXPECT_EQ(fileText(home / name), name.ends_with("-wal") ? "remains of a log" : content);
        }
        EXPECT_EQ(kept, 2u);
    }
}

TEST_F(DefaultsStoreTest, RefusesAFileOfANewerVersionAndLeavesItAlone) {
    {
        Database database(path());
        ASSERT_FALSE(execute(database, "PRAGMA user_version = 1000"));
    }
    const std::string content = fileText(path());
    Database database(path());
    const MaybeError error = database.open();
    ASSERT_TRUE(error);
    EXPECT_THAT(error->text, HasSubstr(path()));
    EXPECT_THAT(error->text, HasSubstr("newer version"));
    EXPECT_TRUE(database.open());
    EXPECT_EQ(fileText(path()), content);
    EXPECT_EQ(log.lines().size(), 1u);  // said once
}

// Beside an agent that runs, after one that was killed, and after one that ended.
TEST_F(DefaultsStoreTest, LookingReadsWhatIsThereAndChangesNothing) {
    auto contents = [&] {
        Dictionary files;
        for (const std::string& name : folder.names())
            if (!name.ends_with("-shm")) files[name] = fileText(folder / name);
        return files;
    };
    auto expectLook = [&](const char* when) {
        const Dictionary before = contents();
        Database database = Database::readOnly(path());
        DefaultsStore store(database);
        EXPECT_EQ(store.get("key"), Value(when));
        store.set("key", "looked");
        EXPECT_EQ(store.get("key"), Value(when));
        EXPECT_EQ(contents(), before) << when;
    };
    std::array<int, 2> ends{};
    ASSERT_EQ(pipe2(ends.data(), O_CLOEXEC), 0);
    const pid_t agent = inChild([&] {
        Database database(path());
        DefaultsStore(database).set("key", "running");
        if (::write(ends[1], "!", 1) == 1) pause();
    });
    ::close(ends[1]);
    char written = 0;
    ASSERT_EQ(::read(ends[0], &written, 1), 1);
    ::close(ends[0]);
    expectLook("running");
    kill(agent, SIGKILL);
    waitpid(agent, nullptr, 0);
    expectLook("running");
    {
        Database database(path());
        DefaultsStore(database).set("key", "ended");
    }
    EXPECT_THAT(folder.names(), ElementsAre("host.db"));
    expectLook("ended");
    EXPECT_THAT(folder.names(), ElementsAre("host.db"));

    std::vector<const char*> next(Database::currentSchema.begin(), Database::currentSchema.end());
    next.push_back("CREATE TABLE more (x)");
    EXPECT_THAT(Database::readOnly(path(), next).open()->text, HasSubstr("older version"));
    writeFile(folder / "damaged 1%?#.db", std::string(8192, 'x'));
    for (const char* name : {"absent.db", "damaged 1%?#.db"})
        EXPECT_TRUE(Database::readOnly(folder / name).open()) << name;
    EXPECT_THAT(folder.names(), ElementsAre("damaged 1%?#.db", "host.db"));
}

TEST_F(DefaultsStoreTest, ChangesTheSchemaAsAWholeOrNotAtAll) {
    const char* const broken[] = {Database::currentSchema[0], "CREATE TABLE more (x)", "nonsense"};
    const Database::Schema older(broken, 1);
    {
        Database first(path(), older);
        DefaultsStore(first).set("key", 1);
    }
    EXPECT_TRUE(Database(path(), broken).open());
    Database next(path(), Database::Schema(broken, 2));
    EXPECT_FALSE(next.open()) << next.open()->text;
    EXPECT_EQ(DefaultsStore(next).integer("key"), 1);
    EXPECT_FALSE(execute(next, "INSERT INTO more VALUES (1)"));
    EXPECT_TRUE(Database(path(), older).open());
}

TEST_F(DefaultsStoreTest, OpensAReplacedFileAgainAndKeepsItsOwnLogOutOfIt) {
    {
        Database other(folder / "other.db");
        DefaultsStore store(other);
        store.set("whose", "other");
        for (int i = 0; i < 50; ++i) store.set("key" + std::to_string(i), std::string(500, 'x'));
    }
    Database database(path());
    DefaultsStore store(database);
    store.set("whose", "first");
    std::filesystem::rename(folder / "other.db", path());
    EXPECT_EQ(store.get("whose"), Value("other"));
    store.set("whose", "written");
    EXPECT_EQ(store.get("whose"), Value("written"));
    EXPECT_THAT(log.lines(), ElementsAre(path() + " was replaced and is opened again"));

    Database reader(path());
    EXPECT_EQ(DefaultsStore(reader).get("whose"), Value("written"));
    // One that was removed is made anew, empty.
    std::filesystem::remove(path());
    EXPECT_EQ(store.get("whose"), Value());
    store.set("whose", "again");
    EXPECT_EQ(store.get("whose"), Value("again"));
}

TEST_F(DefaultsStoreTest, ReadsAsEmptyWhereThereIsNoFolderAndRecoversWhenThereIs) {
    Database database(folder / "absent/host.db");
    DefaultsStore store(database);
    store.registerDefaults({{"key", 1}});
    EXPECT_EQ(store.get("key"), Value(1));
    store.set("key", 2);
    EXPECT_EQ(store.get("key"), Value(1));
    std::filesystem::create_directory(folder / "absent");
    store.set("key", 3);
    EXPECT_EQ(store.get("key"), Value(3));
}

}  // namespace
}  // namespace vrx::host
