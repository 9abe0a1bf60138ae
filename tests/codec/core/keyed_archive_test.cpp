// Keyed archives: what is left out, escaped and shared, and what rejects an archive.
#include "vrx/codec/core/keyed_archive.h"

#include "support/values.h"
#include "vrx/platform/limits.h"

namespace vrx::codec {
namespace {

using platform::AllowedKinds;

constexpr AllowedKinds everyKind = {AllowedKinds::Strings, AllowedKinds::Numbers, AllowedKinds::Dates,
                                    AllowedKinds::Arrays, AllowedKinds::Dictionaries};

struct Part final : platform::Archivable {
    static constexpr std::string_view archiveClassName = "Part";
    explicit Part(Value content) : content(std::move(content)) {}
    std::string_view className() const override { return archiveClassName; }
    void encodeWithCoder(platform::KeyedEncoder& coder) const override { coder.encodeObject("content", content); }
    // Like a record, there is none without its content.
    static std::shared_ptr<Part> initWithCoder(platform::KeyedDecoder& coder) {
        const Value content = coder.decodeValue("content", everyKind);
        return content.isNull() ? nullptr : std::make_shared<Part>(content);
    }
    Value content;
};

struct Whole final : platform::Archivable {
    static constexpr std::string_view archiveClassName = "Whole";
    std::string_view className() const override { return archiveClassName; }
    void encodeWithCoder(platform::KeyedEncoder& coder) const override {
        coder.encodeObject("name", name);
        coder.encodeInteger("number", number);
        coder.encodeObject("part", part.get());
    }
    static std::shared_ptr<Whole> initWithCoder(platform::KeyedDecoder& coder) {
        auto whole = std::make_shared<Whole>();
        whole->name = coder.decodeValue("name", {AllowedKinds::Strings});
        whole->number = coder.decodeInteger("number");
        whole->part = coder.decodeObject<Part>("part");
        return whole;
    }
    Value name;
    std::int64_t number = 0;
    std::shared_ptr<Part> part;
};

TEST(KeyedArchive, RestoresObjectsAndLists) {
    auto whole = std::make_shared<Whole>();
    whole->name = "n";
    whole->number = -7;
    whole->part = std::make_shared<Part>(Dictionary{{"a", Array{1, 2.5, true, dateFromEpoch(3.5)}}});
    const auto restored = valueOf(unarchive<Whole>(archive(*whole)));
    EXPECT_EQ(restored->name, whole->name);
    EXPECT_EQ(restored->number, -7);
    EXPECT_EQ(restored->part->content, whole->part->content);

    const auto list = valueOf(unarchiveList<Whole>(archive(std::vector{whole, std::make_shared<Whole>()})));
    ASSERT_EQ(list.size(), 2u);
    EXPECT_EQ(list[0]->name, whole->name);
    EXPECT_EQ(list[1]->part, nullptr);
    EXPECT_EQ(archive(Whole()), Value(Dictionary{{"$class", "Whole"}, {"number", 0}}));
}

TEST(KeyedArchive, EscapesAndLeavesOut) {
    const std::tuple<Value, Value, Value> cases[] = {
        {nullptr, nullptr, nullptr},
        {Data{1}, nullptr, nullptr},
        {Array{nullptr, 1, Data{}, Array{nullptr}}, Array{1, Array{}}, Array{1, Array{}}},
        {Dictionary{{"a", nullptr}, {"b", Dictionary{{"c", Data{}}}}}, Dictionary{{"b", Dictionary{}}},
         Dictionary{{"b", Dictionary{}}}},
        {Dictionary{{"$class", "Part"}, {"$", 1}, {"$$x", 2}, {"x$", 3}},
         Dictionary{{"$$class", "Part"}, {"$$", 1}, {"$$$x", 2}, {"x$", 3}},
         Dictionary{{"$class", "Part"}, {"$", 1}, {"$$x", 2}, {"x$", 3}}},
    };
    for (const auto& [value, archived, restored] : cases) {
        EXPECT_EQ(archiveValue(value), archived) << value.description();
        EXPECT_EQ(archive(Part(value))["content"], archived) << value.description();
        if (archived.isNull()) continue;
        EXPECT_EQ(valueOf(unarchiveValue(archived, everyKind)), restored);
    }
}

TEST(KeyedArchive, SharesWhatNeedsNoChange) {
    const Value value = Dictionary{{"list", Array{1, Dictionary{{"k", "v"}}}}};
    const Value archived = archiveValue(value);
    EXPECT_EQ(archived.asDictionary(), value.asDictionary());
    EXPECT_EQ(unarchiveValue(archived, everyKind)->asDictionary(), value.asDictionary());
    // Beside what changes, the rest is still shared.
    EXPECT_EQ(archiveValue(Array{nullptr, value}).asArray()->at(0).asDictionary(), value.asDictionary());
}

TEST(KeyedArchive, RejectsWhatTheClassDoesNotAdmit) {
    auto whole = [](const char* key, const Value& value) { return Dictionary{{"$class", "Whole"}, {key, value}}; };
    auto part = [](const Value& content) { return Dictionary{{"$class", "Part"}, {"content", content}}; };
    auto wholeOf = [&](const Value& content) { return whole("part", part(content)); };
    const std::pair<Value, const char*> archives[] = {
        {nullptr, "the root: a null where Whole is expected"},
        {Array{}, "the root: a list where Whole is expected"},
        {Dictionary{}, "the root: a dictionary where Whole is expected"},
        {part(1), "the root: Part where Whole is expected"},
        {Dictionary{{"$class", 1}}, "the root: a dictionary where Whole is expected"},
        {whole("name", 1), "key \"name\": a number that is not"},
        {whole("name", part(1)), "key \"name\": Part where a plain value is expected"},
        {whole("number", "1"), "key \"number\": a string where an integer is expected"},
        {whole("part", "x"), "key \"part\": a string where Part is expected"},
        {whole("part", Dictionary{{"content", 1}}), "key \"part\": a dictionary where Part"},
        {whole("part", Dictionary{{"$class", "Whole"}}), "key \"part\": Whole where Part"},
        {wholeOf(Data{}), "key \"part.content\": data that is not"},
        {wholeOf(Array{part(1)}), "key \"part.content\": an object within a list"},
        {wholeOf(Array{nullptr}), "key \"part.content\": a list that is not, or holds"},
        {wholeOf(Dictionary{{"$x", 1}}), "key \"part.content\""},
    };
    for (const auto& [archived, complaint] : archives) {
        EXPECT_THAT(errorOf(unarchive<Whole>(archived)), HasSubstr(complaint));
        EXPECT_FALSE(unarchiveList<Whole>(Array{archive(Whole()), archived})) << complaint;
    }
    EXPECT_FALSE(unarchiveList<Whole>(archive(Whole())));
    EXPECT_FALSE(unarchiveList<Part>(Array{Dictionary{{"$class", "Part"}}}));  // makes no object
    EXPECT_EQ(*unarchive<Part>(Dictionary{{"$class", "Part"}}), nullptr);
    EXPECT_FALSE(unarchiveValue(part(1), everyKind));
    const AllowedKinds plain{AllowedKinds::Strings, AllowedKinds::Numbers, AllowedKinds::Dictionaries};
    EXPECT_TRUE(unarchiveValue(Dictionary{{"a", true}, {"b", Dictionary{{"c", "d"}}}}, plain));
    for (const Value& other : {Value(Date()), Value(Array{}), Value(Data{}), Value()})
        EXPECT_FALSE(unarchiveValue(Dictionary{{"b", Dictionary{{"c", other}}}}, plain)) << other.description();
    EXPECT_FALSE(unarchiveValue(Array{"text"}, {AllowedKinds::Strings}));
}

TEST(KeyedArchive, AdmitsTheDeepestDocumentInAListButNoDeeper) {
    auto nested = [](int depth) {
        Value value = 1;
        for (int i = 0; i < depth; ++i) value = Array{value};
        return value;
    };
    Whole whole;
    whole.part = std::make_shared<Part>(nested(platform::limits::documentDepth));
    EXPECT_TRUE(unarchiveList<Whole>(Array{archive(whole)}));
    EXPECT_TRUE(unarchiveValue(nested(20), everyKind));
    EXPECT_FALSE(unarchiveValue(nested(21), everyKind));
    EXPECT_FALSE(unarchive<Whole>(Dictionary{{"$class", "Whole"}, {"unknown", nested(20)}}));
}

}  // namespace
}  // namespace vrx::codec
