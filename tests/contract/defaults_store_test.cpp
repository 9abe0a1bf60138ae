// What every store of settings does, simulated or real.
#include "vrx/platform/defaults_store.h"

#include <gmock/gmock.h>

#include <cmath>
#include <limits>

#include "host/support.h"
#include "vrx/host/home/defaults_store.h"
#include "vrx/sim/host.h"

namespace vrx {
namespace {

using platform::Array;
using platform::Data;
using platform::Date;
using platform::Dictionary;
using platform::Value;

class SimulatedStore {
public:
    platform::DefaultsStore& store() { return host_.defaults; }
    // What the next process finds.
    void restart() { host_.defaults.forgetRegistered(); }
    std::size_t loggedLines() const { return host_.log.messages(platform::Level::Default).size(); }

private:
    sim::Host host_;
};

class RealStore {
public:
    platform::DefaultsStore& store() { return *store_; }
    void restart() { store_.emplace(database_.emplace(folder_ / "host.db")); }
    std::size_t loggedLines() const { return log_.lines().size(); }

private:
    host::LogRecorder log_;
    host::TemporaryFolder folder_;
    std::optional<host::Database> database_{folder_ / "host.db"};
    std::optional<host::DefaultsStore> store_{*database_};
};

template <class Subject>
class DefaultsStoreContract : public testing::Test {
protected:
    Subject subject;
};

struct Names {
    template <class Subject>
    static std::string GetName(int) {
        return std::is_same_v<Subject, SimulatedStore> ? "Simulated" : "Real";
    }
};
using Subjects = testing::Types<SimulatedStore, RealStore>;
TYPED_TEST_SUITE(DefaultsStoreContract, Subjects, Names);

TYPED_TEST(DefaultsStoreContract, KeepsEveryKindOfValueAcrossProcesses) {
    const Dictionary values{
        {"bool", true},
        {"integer", std::numeric_limits<std::int64_t>::min()},
        {"whole double", 3.0},
        {"double", 0.1},
        {"infinite", std::numeric_limits<double>::infinity()},
        {"string", std::string("a\0ü", 4)},
        {"empty string", ""},
        {"date", platform::dateFromEpoch(1769860800.25)},
        {"data", Data{0, 255}},
        {"empty array", Array{}},
        {"dictionary", Dictionary{{"list", Array{1, "two", 3.5}}, {"", Dictionary{}}}},
        {"", "the empty key"},
    };
    for (const auto& [key, value] : values) this->subject.store().set(key, value);
    this->subject.restart();
    for (const auto& [key, value] : values) {
        Value read = this->subject.store().get(key);
        EXPECT_EQ(read, value) << key;
        EXPECT_EQ(read.type(), value.type()) << key;
    }
    EXPECT_EQ(this->subject.store().dictionaryRepresentation(), values);
    EXPECT_EQ(this->subject.loggedLines(), 0u);
}

TYPED_TEST(DefaultsStoreContract, PutsStoredValuesBeforeRegisteredOnes) {
    platform::DefaultsStore& store = this->subject.store();
    store.registerDefaults({{"a", 1}, {"b", 1}});
    store.registerDefaults({{"b", 2}, {"c", 2}});
    store.set("a", "stored");
    EXPECT_EQ(store.dictionaryRepresentation(), (Dictionary{{"a", "stored"}, {"b", 2}, {"c", 2}}));
    EXPECT_EQ(store.get("a"), Value("stored"));
    EXPECT_EQ(store.get("b"), Value(2));
    EXPECT_TRUE(store.get("d").isNull());

    store.set("a", nullptr);
    EXPECT_EQ(store.get("a"), Value(1)) << "null takes the stored value away";
    store.remove("c");
    EXPECT_EQ(store.get("c"), Value(2)) << "there was none to remove";

    store.set("b", false);
    this->subject.restart();
    EXPECT_EQ(this->subject.store().dictionaryRepresentation(), (Dictionary{{"b", false}}));
}

TYPED_TEST(DefaultsStoreContract, UpdatesWhatIsThere) {
    platform::DefaultsStore& store = this->subject.store();
    store.registerDefaults({{"list", Array{0}}});
    auto append = [&](const char* key, int number) {
        store.update(key, [number](const Value& value) {
            Array list = value.asArray() ? *value.asArray() : Array{};
            list.push_back(number);
            return Value(list);
        });
    };
    append("list", 1);
    append("list", 2);
    append("new", 3);
    EXPECT_EQ(store.get("list"), Value(Array{0, 1, 2}));
    EXPECT_EQ(store.get("new"), Value(Array{3}));
    store.update("list", [](const Value&) { return Value(); });
    EXPECT_EQ(store.get("list"), Value(Array{0}));
}

TYPED_TEST(DefaultsStoreContract, LogsAWriteThatFailsAndKeepsTheEarlierValue) {
    platform::DefaultsStore& store = this->subject.store();
    store.set("key", "earlier");
    store.set("key", Dictionary{{"null", nullptr}});
    EXPECT_EQ(this->subject.loggedLines(), 1u);
    store.update("key", [](const Value&) { return Value(Array{Value()}); });
    EXPECT_EQ(this->subject.loggedLines(), 2u);
    EXPECT_EQ(store.get("key"), Value("earlier"));
}

TYPED_TEST(DefaultsStoreContract, ReadsByType) {
    platform::DefaultsStore& store = this->subject.store();
    store.set("number", 86400.9);
    store.set("text", "12 days");
    store.set("true", true);
    store.set("date", platform::dateFromEpoch(5));
    store.set("dictionary", Dictionary{{"a", 1}});

    EXPECT_EQ(store.integer("number"), 86400);
    EXPECT_EQ(store.integer("text"), 12);
    EXPECT_EQ(store.integer("true"), 1);
    EXPECT_EQ(store.integer("date"), 0);
    EXPECT_EQ(store.integer("absent"), 0);
    EXPECT_EQ(store.number("number"), 86400.9);
    EXPECT_EQ(store.string("text"), "12 days");
    EXPECT_EQ(store.string("number"), std::nullopt);
    EXPECT_EQ(store.date("date"), platform::dateFromEpoch(5));
    EXPECT_EQ(store.date("number"), std::nullopt);
    EXPECT_EQ(store.dictionary("dictionary"), Value(Dictionary{{"a", 1}}));
    EXPECT_TRUE(store.dictionary("text").isNull());
}

}  // namespace
}  // namespace vrx
