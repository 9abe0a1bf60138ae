// JSON: what is read and refused, where an error says it lies, and the two ways of writing.
#include "vrx/codec/json.h"

#include <limits>

#include "support/values.h"
#include "vrx/platform/limits.h"

namespace vrx::codec {
namespace {

std::string nested(std::size_t depth) {
    return std::string(depth, '[') + std::string(depth, ']');
}

TEST(Json, ReadsEveryKindOfValue) {
    const std::pair<const char*, Value> documents[] = {
        {R"(  {"a" : [null, true, false], "b": {}} )",
         Dictionary{{"a", Array{nullptr, true, false}}, {"b", Dictionary{}}}},
        {R"("\"\\\/\b\f\n\r\t\u00e9 \ud83d\ude00 é 😀 \u0000")", std::string("\"\\/\b\f\n\r\té 😀 é 😀 \0", 25)},
        {"\xEF\xBB\xBF[]", Array{}},
        {R"({"k": 1, "K": 2, "k": 3})", Dictionary{{"k", 3}, {"K", 2}}},
        {"[9223372036854775807, -9223372036854775808]",
         Array{std::numeric_limits<std::int64_t>::max(), std::numeric_limits<std::int64_t>::min()}},
        {"[0.5, -1e3, 1e-999]", Array{0.5, -1000.0, 0.0}},
        {"9223372036854775808", 9223372036854775808.0},  // what int64 does not hold
        {"18446744073709551616", 18446744073709551616.0},
        {"-9223372036854775809", -9223372036854775808.0},
    };
    for (const auto& [document, expected] : documents) {
        EXPECT_EQ(valueOf(parseJson(document)), expected) << document;
        EXPECT_EQ(valueOf(parseJson(document)).type(), expected.type()) << document;
    }
}

TEST(Json, RefusesWhatIsNotJsonAndSaysWhere) {
    const std::pair<std::string, const char*> documents[] = {
        {"", "byte 0: unexpected end of input"},
        {R"({"a": 1,})", "byte 9"},
        {"[1] x", "byte 5"},
        {std::string("[1]\0[", 5), "byte 3: NUL"},
        {"\"\xC0\xAF\"", "byte 2: invalid string: ill-formed UTF-8"},
        {"\"\xED\xA0\x80\"", "ill-formed UTF-8"},
        {R"("\ud800x")", "surrogate"},
        {R"("\udc00")", "surrogate"},
        {"[1e999]", "number out of range"},
        {std::string(400, '9'), "number out of range"},
        {"[NaN]", "byte 2"},
        {"{1: 2}", "byte 3"},
        {"// comment\n1", "byte 1"},
        {nested(17), "byte 17: nested too deeply"},
    };
    for (const auto& [document, complaint] : documents)
        EXPECT_THAT(errorOf(parseJson(document)), HasSubstr(complaint)) << document;
}

TEST(Json, HoldsDocumentsToTheLimits) {
    using namespace platform::limits;
    EXPECT_TRUE(parseJson(nested(documentDepth)));
    auto listOf = [](std::size_t values) {
        std::string list = "[0";
        for (std::size_t i = 2; i < values; ++i) list += ",0";
        return list + "]";
    };
    EXPECT_TRUE(parseJson(listOf(documentValues)));
    EXPECT_FALSE(parseJson(listOf(documentValues + 1)));
    EXPECT_TRUE(parseJson('"' + std::string(documentBytes - 2, 'x') + '"'));
    EXPECT_FALSE(parseJson('"' + std::string(documentBytes - 1, 'x') + '"'));
}

TEST(Json, RefusesADocumentCutAtAnyByte) {
    const std::string document = R"({"text": "é\ud83d\ude00", "list": [1, -2.5e3, true, null], "object": {"k": {}}})";
    ASSERT_TRUE(parseJson(document));
    for (std::size_t length = 0; length < document.size(); ++length)
        EXPECT_FALSE(parseJson(std::string_view(document).substr(0, length))) << length;
}

TEST(Json, WritesCompactlyWhatItReads) {
    const std::string document =
        R"({"":"\"\\\n\u0001é😀","a":[-1,2.5,1e+300,true,false,null,[],{}],"b":9223372036854775807})";
    EXPECT_EQ(valueOf(serializeJson(*parseJson(document))), document);
    for (double number : {0.1, -1.0 / 3, 5e-324, std::numeric_limits<double>::max(), 4e18})
        EXPECT_EQ(*parseJson(*serializeJson(number)), Value(number)) << number;
}

TEST(Json, ProgramsPrintEveryValueButSerializingIsStrict) {
    const double infinity = std::numeric_limits<double>::infinity();
    const std::pair<Value, const char*> values[] = {
        {dateFromEpoch(1769860800.75), R"("2026-01-31T12:00:00Z")"},
        {dateFromEpoch(-1), R"("1969-12-31T23:59:59Z")"},
        {dateFromEpoch(1e15), R"("1e+15 s from 1970-01-01 00:00:00 +0000")"},
        {Data{0, 1, 255}, R"("AAH/")"},
        {Data{7}, R"("Bw==")"},
        {infinity, "null"},
        {-std::numeric_limits<double>::quiet_NaN(), "null"},
        {"a\xFF\xC3", "\"a\xEF\xBF\xBD\xEF\xBF\xBD\""},
    };
    for (const auto& [value, text] : values) {
        EXPECT_EQ(printedJson(value, JsonLayout::OneLine), text);
        EXPECT_FALSE(serializeJson(Dictionary{{"key", Array{value}}})) << text;
    }
    EXPECT_FALSE(serializeJson(Dictionary{{"\x80", 1}}));
    EXPECT_EQ(printedJson(Dictionary{{"a", Array{1, Array{}}}, {"b", true}}, JsonLayout::Indented),
              "{\n  \"a\": [\n    1,\n    []\n  ],\n  \"b\": true\n}");
}

}  // namespace
}  // namespace vrx::codec
