#include "vrx/host/home/defaults_store.h"

#include <cmath>
#include <csignal>
#include <limits>

#include "host/support.h"

namespace vrx::host {
namespace {

// The database and what is in it, as a process has them open.
struct Opened {
    explicit Opened(const std::string& path, const Database::Schema& schema = Database::currentSchema)
        : database(path, schema) {}
    MaybeError execute(const char* sql) {
        return database.write([&](Connection& connection) { connection.execute(sql); });
    }
    // With more than one page.
    void fill() {
        for (int i = 0; i < 100; ++i) store.set("key" + std::to_string(i), std::string(500, 'x'));
    }
    Database database;
    DefaultsStore store{database};
};

class DefaultsStoreTest : public InFolder {
protected:
    std::string path() const { return folder / "host.db"; }
};

TEST_F(DefaultsStoreTest, KeepsItsFilesForItsUserAndWhatIsNotANumber) {
    Opened(path()).store.set("nan", std::numeric_limits<double>::quiet_NaN());
    Opened opened(path());
    EXPECT_TRUE(std::isnan(opened.store.get("nan").asNumber().value_or(0)));
    for (const char* suffix : {"", "-wal", "-shm"}) EXPECT_EQ(modeOf(path() + suffix), 0600u) << suffix;
    EXPECT_THAT(log.lines(), ElementsAre());
}

TEST_F(DefaultsStoreTest, PresetsStandBetweenWhatIsWrittenAndWhatIsRegistered) {
    Opened opened(path());
    Dictionary presets{{"a", "preset"}, {"b", "preset"}};
    opened.store.setPresets([&] { return std::make_shared<const Dictionary>(presets); });  // read anew each time
    opened.store.registerDefaults({{"b", "registered"}, {"c", "registered"}});
    opened.store.set("a", "written");
    EXPECT_EQ(opened.store.dictionaryRepresentation(),
              (Dictionary{{"a", "written"}, {"b", "preset"}, {"c", "registered"}}));
    for (const auto& [key, value] : opened.store.dictionaryRepresentation())
        EXPECT_EQ(opened.store.get(key), value) << key;
    opened.store.update("b", [](const Value& present) { return Value(present.asString()->substr(1)); });
    EXPECT_EQ(opened.store.get("b"), Value("reset"));
    opened.store.remove("a");
    presets = {{"a", "another"}};
    EXPECT_EQ(opened.store.get("a"), Value("another"));
}

TEST_F(DefaultsStoreTest, SetsADamagedFileAsideAndBeginsAfresh) {
    Opened(path()).fill();
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
        Opened opened(home / "host.db");
        opened.store.set("key", 1);
        EXPECT_EQ(opened.store.integer("key"), 1);
        EXPECT_THAT(lines.lines(), ElementsAre(HasSubstr("host.db is damaged (")));
        std::size_t kept = 0;
        for (const std::string& name : home.names()) {
            if (!name.starts_with("host.db.damaged-") || name.ends_with("-shm")) continue;
            ++kept;
            EXPECT_EQ(fileText(home / name), name.ends_with("-wal") ? "remains of a log" : content);
        }
        EXPECT_EQ(kept, 2u);
    }
}

TEST_F(DefaultsStoreTest, RefusesAFileOfANewerVersionAndLeavesItAlone) {
    ASSERT_FALSE(Opened(path()).execute("PRAGMA user_version = 1000"));
    const std::string content = fileText(path());
    Database database(path());
    const MaybeError error = database.open();
    ASSERT_TRUE(error);
    EXPECT_THAT(error->text, AllOf(HasSubstr(path()), HasSubstr("newer version")));
    EXPECT_TRUE(database.open());
    EXPECT_EQ(fileText(path()), content);
    EXPECT_EQ(log.lines().size(), 1u);  // said once
}

// Beside an agent that runs, after one that was killed, and after one that ended.
TEST_F(DefaultsStoreTest, LookingReadsWhatIsThereAndChangesNothing) {
    auto expectLook = [&](const char* when) {
        const Dictionary before = contentsOf(folder.path());
        Database database = Database::readOnly(path());
        DefaultsStore store(database);
        EXPECT_EQ(store.get("key"), Value(when));
        store.set("key", "looked");
        EXPECT_EQ(store.get("key"), Value(when));
        EXPECT_EQ(contentsOf(folder.path()), before) << when;
    };
    Pipe pipe;
    const pid_t agent = inChild([&] {
        Opened opened(path());
        opened.store.set("key", "running");
        pipe.writer = Descriptor();
        pause();
    });
    EXPECT_EQ(pipe.rest(), "") << "it has written";
    expectLook("running");
    kill(agent, SIGKILL);
    EXPECT_EQ(endOf(agent), -SIGKILL);
    expectLook("running");
    Opened(path()).store.set("key", "ended");
    EXPECT_THAT(folder.names(), ElementsAre("host.db"));
    expectLook("ended");
    EXPECT_THAT(folder.names(), ElementsAre("host.db"));
    writeFile(path() + "-wal", "");  // as a process leaves it that is killed while it opens the database
    expectLook("ended");
    writeFile(path() + "-wal", std::string(32, 'x'));  // or before its first page is in the log
    expectLook("ended");
    std::filesystem::remove(path() + "-wal");

    std::vector<const char*> next(Database::currentSchema.begin(), Database::currentSchema.end());
    next.push_back("CREATE TABLE more (x)");
    EXPECT_THAT(Database::readOnly(path(), next).open()->text, HasSubstr("older version"));
    writeFile(folder / "damaged 1%?#.db", std::string(8192, 'x'));
    for (const char* name : {"absent.db", "damaged 1%?#.db"})
        EXPECT_TRUE(Database::readOnly(folder / name).open()) << name;
    EXPECT_THAT(folder.names(), ElementsAre("damaged 1%?#.db", "host.db"));
}

// The shared index comes and goes with the last process that writes, and is not valid at every moment.
TEST_F(DefaultsStoreTest, LookingIsDoneBesideProcessesThatOpenAndClose) {
    Opened(path()).store.set("key", "kept");
    std::vector<pid_t> others;
    for (int process = 0; process < 2; ++process)
        others.push_back(inChild([&] {
            while (true) Opened(path()).store.set("other", "changed");
        }));
    others.push_back(inChild([&] {
        Opened opened(path());
        for (int count = 0;; ++count) opened.store.set("other", count);
    }));
    for (int look = 0; look < (isSanitized ? 100 : 300) && !HasFailure(); ++look) {
        Database database = Database::readOnly(path());
        const MaybeError error = database.open();
        EXPECT_FALSE(error) << look << ": " << error->text << " " << error->code;
        EXPECT_EQ(DefaultsStore(database).get("key"), Value("kept")) << look;
    }
    for (const pid_t other : others) {
        kill(other, SIGKILL);
        endOf(other);
    }
}

TEST_F(DefaultsStoreTest, ChangesTheSchemaAsAWholeOrNotAtAll) {
    const char* const broken[] = {Database::currentSchema[0], "CREATE TABLE more (x)", "nonsense"};
    const Database::Schema older(broken, 1);
    Opened(path(), older).store.set("key", 1);
    EXPECT_TRUE(Database(path(), broken).open());
    Opened next(path(), Database::Schema(broken, 2));
    EXPECT_FALSE(next.database.open()) << next.database.open()->text;
    EXPECT_EQ(next.store.integer("key"), 1);
    EXPECT_FALSE(next.execute("INSERT INTO more VALUES (1)"));
    EXPECT_TRUE(Database(path(), older).open());
}

TEST_F(DefaultsStoreTest, OpensAReplacedFileAgainAndKeepsItsOwnLogOutOfIt) {
    {
        Opened other(folder / "other.db");
        other.store.set("whose", "other");
        other.fill();
    }
    Opened opened(path());
    DefaultsStore& store = opened.store;
    store.set("whose", "first");
    std::filesystem::rename(folder / "other.db", path());
    EXPECT_EQ(store.get("whose"), Value("other"));
    store.set("whose", "written");
    EXPECT_EQ(store.get("whose"), Value("written"));
    EXPECT_THAT(log.lines(), ElementsAre(path() + " was replaced and is opened again"));

    EXPECT_EQ(Opened(path()).store.get("whose"), Value("written"));
    // One that was removed is made anew, empty.
    std::filesystem::remove(path());
    EXPECT_EQ(store.get("whose"), Value());
    store.set("whose", "again");
    EXPECT_EQ(store.get("whose"), Value("again"));
    // A request looks once, and yet writes to no file that is gone.
    const RequestScope request;
    EXPECT_EQ(store.get("whose"), Value("again"));
    std::filesystem::remove(path());
    store.set("whose", "request");
    EXPECT_EQ(Opened(path()).store.get("whose"), Value("request"));
}

TEST_F(DefaultsStoreTest, TakesNoFailedLookForAReplacedFile) {
    Opened opened(path());
    opened.store.set("key", 1);
    std::filesystem::rename(path(), folder / "kept");
    std::filesystem::create_symlink("host.db", path());  // a look at it fails: it leads to itself
    opened.store.set("key", 2);
    std::filesystem::remove(path());
    std::filesystem::rename(folder / "kept", path());
    EXPECT_EQ(opened.store.get("key"), Value(2));
    EXPECT_EQ(Opened(path()).store.get("key"), Value(2));
    EXPECT_THAT(folder.names(), ElementsAre("host.db", "host.db-shm", "host.db-wal"));
    EXPECT_THAT(log.lines(), ElementsAre());
}

TEST_F(DefaultsStoreTest, ReadsAsEmptyWhereThereIsNoFolderAndRecoversWhenThereIs) {
    Opened opened(folder / "absent/host.db");
    DefaultsStore& store = opened.store;
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
