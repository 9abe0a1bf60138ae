// What every store of settings does, simulated or real.
#include "vrx/platform/defaults_store.h"

#include <limits>

#include "contract/hosts.h"

namespace vrx {
namespace {

template <class Host>
using DefaultsStoreContract = ContractTest<Host>;
TYPED_TEST_SUITE(DefaultsStoreContract, Hosts, HostNames);

TYPED_TEST(DefaultsStoreContract, KeepsEveryKindOfValueAcrossProcesses) {
    const Dictionary values{
        {"bool", true},
        {"integer", std::numeric_limits<std::int64_t>::min()},
        {"whole double", 3.0},
        {"double", 0.1},
        {"infinite", std::numeric_limits<double>::infinity()},
        {"string", std::string("a\0ü", 4)},
        {"empty string", ""},
        {"date", dateFromEpoch(1769860800.25)},
        {"data", Data{0, 255}},
        {"empty array", Array{}},
        {"dictionary", Dictionary{{"list", Array{1, "two", 3.5}}, {"", Dictionary{}}}},
        {"", "the empty key"},
    };
    for (const auto& [key, value] : values) this->host.defaults().set(key, value);
    this->host.restart();
    for (const auto& [key, value] : values) {
        Value read = this->host.defaults().get(key);
        EXPECT_EQ(read, value) << key;
        EXPECT_EQ(read.type(), value.type()) << key;
    }
    EXPECT_EQ(this->host.defaults().dictionaryRepresentation(), values);
    EXPECT_EQ(this->host.loggedLines(), 0u);
}

TYPED_TEST(DefaultsStoreContract, PutsStoredValuesBeforeRegisteredOnes) {
    platform::DefaultsStore& store = this->host.defaults();
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
    this->host.restart();
    EXPECT_EQ(this->host.defaults().dictionaryRepresentation(), (Dictionary{{"b", false}}));
}

TYPED_TEST(DefaultsStoreContract, UpdatesWhatIsThere) {
    platform::DefaultsStore& store = this->host.defaults();
    store.registerDefaults({{"list", Array{Value(0)}}});
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
    EXPECT_EQ(store.get("new"), Value(Array{Value(3)}));
    store.update("list", [](const Value&) { return Value(); });
    EXPECT_EQ(store.get("list"), Value(Array{Value(0)}));
}

TYPED_TEST(DefaultsStoreContract, LogsAWriteThatFailsAndKeepsTheEarlierValue) {
    platform::DefaultsStore& store = this->host.defaults();
    store.set("key", "earlier");
    store.set("key", Dictionary{{"null", nullptr}});
    EXPECT_EQ(this->host.loggedLines(), 1u);
    store.update("key", [](const Value&) { return Value(Array{Value()}); });
    EXPECT_EQ(this->host.loggedLines(), 2u);
    EXPECT_EQ(store.get("key"), Value("earlier"));
}

TYPED_TEST(DefaultsStoreContract, ReadsByType) {
    platform::DefaultsStore& store = this->host.defaults();
    for (const auto& [key, value] : Dictionary{{"number", 86400.9},
                                               {"text", "12 days"},
                                               {"true", true},
                                               {"date", dateFromEpoch(5)},
                                               {"dictionary", Dictionary{{"a", 1}}}})
        store.set(key, value);
    for (auto [key, number] : {std::pair("number", 86400), {"text", 12}, {"true", 1}, {"date", 0}, {"absent", 0}})
        EXPECT_EQ(store.integer(key), number) << key;
    EXPECT_EQ(store.number("number"), 86400.9);
    EXPECT_EQ(store.string("text"), "12 days");
    EXPECT_EQ(store.string("number"), std::nullopt);
    EXPECT_EQ(store.date("date"), dateFromEpoch(5));
    EXPECT_EQ(store.date("number"), std::nullopt);
    EXPECT_EQ(store.dictionary("dictionary"), Value(Dictionary{{"a", 1}}));
    EXPECT_TRUE(store.dictionary("text").isNull());
}

}  // namespace
}  // namespace vrx
