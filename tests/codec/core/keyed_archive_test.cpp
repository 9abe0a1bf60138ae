// Keyed archives: what is left out, escaped and shared, and what rejects an archive.
#include "vrx/codec/core/keyed_archive.h"

#include <gtest/gtest.h>

#include "vrx/platform/limits.h"

namespace vrx::codec {
namespace {

using platform::AllowedKinds;
using platform::Array;
using platform::Data;
using platform::dateFromEpoch;
using platform::Dictionary;
using platform::Value;

struct Part final : platform::Archivable {
    static constexpr std::string_view archiveClassName = "Part";
    explicit Part(Value content) : content(std::move(content)) {}
    std::string_view className() const override { return archiveClassName; }
    void encodeWithCoder(platform::KeyedEncoder& coder) const override { coder.encodeObject("content", content); }
    // Like a record, there is none without its content.
    static std::shared_ptr<Part> initWithCoder(platform::KeyedDecoder& coder) {
        using enum AllowedKinds::Kind;
        const Value content = coder.decodeValue("content", {Strings, Numbers, Dates, Arrays, Dictionaries});
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

constexpr AllowedKinds everyKind = {AllowedKinds::Strings, AllowedKinds::Numbers, AllowedKinds::Dates,
                                    AllowedKinds::Arrays, AllowedKinds::Dictionaries};

TEST(KeyedArchive, RestoresObjectsAndLists) {
    auto whole = std::make_shared<Whole>();
    whole->name = "n";
    whole->number = -7;
    whole->part = std::make_shared<Part>(Dictionary{{"a", Array{1, 2.5, true, dateFromEpoch(3.5)}}});
    const auto restored = unarchive<Whole>(archive(*whole));
    ASSERT_TRUE(restored) << restored.error().text;
    EXPECT_EQ((*restored)->name, whole->name);
    EXPECT_EQ((*restored)->number, -7);
    EXPECT_EQ((*restored)->part->content, whole->part->content);

    const auto list = unarchiveList<Whole>(archive(std::vector{whole, std::make_shared<Whole>()}));
    ASSERT_TRUE(list);
    ASSERT_EQ(list->size(), 2u);
    EXPECT_EQ((*list)[0]->name, whole->name);
    EXPECT_EQ((*list)[1]->part, nullptr);
    EXPECT_EQ(archive(Whole()), Value(Dictionary{{"$class", "Whole"}, {"number", 0}}));
}

TEST(KeyedArchive, EscapesAndLeavesOut) {
    struct {
        Value value, archived, restored;
    } const cases[] = {
        {nullptr, nullptr, nullptr},
        {Data{1}, nullptr, nullptr},
        {Array{nullptr, 1, Data{}, Array{nullptr}}, Array{1, Array{}}, Array{1, Array{}}},
        {Dictionary{{"a", nullptr}, {"b", Dictionary{{"c", Data{}}}}}, Dictionary{{"b", Dictionary{}}},
         Dictionary{{"b", Dictionary{}}}},
        {Dictionary{{"$class", "Part"}, {"$", 1}, {"$$x", 2}, {"x$", 3}},
         Dictionary{{"$$class", "Part"}, {"$$", 1}, {"$$$x", 2}, {"x$", 3}},
         Dictionary{{"$class", "Part"}, {"$", 1}, {"$$x", 2}, {"x$", 3}}},
    };
    for (const auto& c : cases) {
        EXPECT_EQ(archiveValue(c.value), c.archived) << c.value.description();
        EXPECT_EQ(archive(Part(c.value))["content"], c.archived) << c.value.description();
        if (c.archived.isNull()) continue;
        const auto restored = unarchiveValue(c.archived, everyKind);
        ASSERT_TRUE(restored) << restored.error().text;
        EXPECT_EQ(*restored, c.restored) << c.value.description();
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
    const Dictionary part = {{"$class", "Part"}, {"content", 1}};
    struct {
        Value archive;
        const char* error;
    } const cases[] = {
        {nullptr, "the root: a null where Whole is expected"},
        {Array{}, "the root: a list where Whole is expected"},
        {Dictionary{}, "the root: a dictionary where Whole is expected"},
        {part, "the root: Part where Whole is expected"},
        {Dictionary{{"$class", 1}}, "the root: a dictionary where Whole is expected"},
        {Dictionary{{"$class", "Whole"}, {"name", 1}}, "key \"name\": a number that is not"},
        {Dictionary{{"$class", "Whole"}, {"name", part}}, "key \"name\": Part where a plain value is expected"},
        {Dictionary{{"$class", "Whole"}, {"number", "1"}}, "key \"number\": a string where an integer is expected"},
        {Dictionary{{"$class", "Whole"}, {"part", "x"}}, "key \"part\": a string where Part is expected"},
        {Dictionary{{"$class", "Whole"}, {"part", Dictionary{{"content", 1}}}},
         "key \"part\": a dictionary where Part"},
        {Dictionary{{"$class", "Whole"}, {"part", Dictionary{{"$class", "Whole"}}}}, "key \"part\": Whole where Part"},
        {Dictionary{{"$class", "Whole"}, {"part", Dictionary{{"$class", "Part"}, {"content", Data{}}}}},
         "key \"part.content\": data that is not"},
        {Dictionary{{"$class", "Whole"}, {"part", Dictionary{{"$class", "Part"}, {"content", Array{part}}}}},
         "key \"part.content\": an object within a list"},
        {Dictionary{{"$class", "Whole"}, {"part", Dictionary{{"$class", "Part"}, {"content", Array{nullptr}}}}},
         "key \"part.content\": a list that is not, or holds"},
        {Dictionary{{"$class", "Whole"}, {"part", Dictionary{{"$class", "Part"}, {"content", Dictionary{{"$x", 1}}}}}},
         "key \"part.content\""},
    };
    for (const auto& c : cases) {
        const auto whole = unarchive<Whole>(c.archive);
        ASSERT_FALSE(whole) << c.error;
        EXPECT_NE(whole.error().text.find(c.error), std::string::npos) << c.error << " / " << whole.error().text;
        EXPECT_FALSE(unarchiveList<Whole>(Array{archive(Whole()), c.archive})) << c.error;
    }
    EXPECT_FALSE(unarchiveList<Whole>(archive(Whole())));
    EXPECT_FALSE(unarchiveList<Part>(Array{Dictionary{{"$class", "Part"}}}));  // makes no object
    EXPECT_EQ(*unarchive<Part>(Dictionary{{"$class", "Part"}}), nullptr);
    EXPECT_FALSE(unarchiveValue(part, everyKind));
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
