// Property values: equality, types and depth; numbers out of texts.
#include "vrx/platform/value.h"

#include <gtest/gtest.h>

#include <cmath>
#include <limits>

#include "vrx/platform/number_text.h"

namespace vrx::platform {
namespace {

using namespace std::string_literals;

constexpr std::int64_t largest = std::numeric_limits<std::int64_t>::max();
constexpr std::int64_t smallest = std::numeric_limits<std::int64_t>::min();
constexpr double largestDouble = std::numeric_limits<double>::max();

TEST(Value, ComparesNumbersByTheirExactValue) {
    EXPECT_EQ(Value(2), Value(2.0));
    EXPECT_EQ(Value(0), Value(-0.0));
    EXPECT_NE(Value(2), Value(2.5));
    EXPECT_NE(Value(1), Value(true));
    EXPECT_NE(Value(0), Value());
    EXPECT_NE(Value("1"), Value(1));
    // Integers that doubles cannot tell apart.
    EXPECT_NE(Value((std::int64_t{1} << 53) + 1), Value(9007199254740992.0));
    EXPECT_NE(Value(largest), Value(9223372036854775808.0));
    EXPECT_EQ(Value(smallest), Value(-9223372036854775808.0));
    EXPECT_NE(Value(0), Value(std::nan("")));
    EXPECT_NE(Value(largest), Value(std::numeric_limits<double>::infinity()));
    EXPECT_EQ(Value(Dictionary{{"a", Array{1, Dictionary{{"b", 2.0}}}}}),
              Value(Dictionary{{"a", Array{1.0, Dictionary{{"b", 2}}}}}));
    EXPECT_NE(Value(Array{1}), Value(Array{1, 1}));
    EXPECT_NE(Value(Data{'a'}), Value("a"));
}

TEST(Value, TakesEachCppTypeForWhatItIs) {
    EXPECT_EQ(Value("text").type(), Value::Type::String);
    EXPECT_EQ(Value(static_cast<const char*>("text")).type(), Value::Type::String) << "no pointer becomes a bool";
    EXPECT_EQ(Value(std::uint32_t{4'000'000'000}).asInteger(), 4'000'000'000);
    EXPECT_EQ(Value(std::uint64_t{1} << 62).asInteger(), std::int64_t{1} << 62);
    EXPECT_EQ(Value(std::uint64_t{1} << 63).asNumber(), 9223372036854775808.0);
    EXPECT_EQ(Value(std::uint64_t{1} << 63).type(), Value::Type::Double);
    EXPECT_EQ(Value(1.0).asInteger(), std::nullopt);
    EXPECT_EQ(Value(1).asNumber(), 1.0);
    EXPECT_EQ(Value(true).asNumber(), std::nullopt);
}

TEST(Value, FindsEntriesOfDictionariesOnly) {
    Value value = Dictionary{{"a", Dictionary{{"b", 1}}}};
    EXPECT_EQ(value["a"]["b"], Value(1));
    EXPECT_TRUE(value["a"]["missing"]["deeper"].isNull());
    EXPECT_TRUE(Value(Array{1})["a"].isNull());
}

TEST(Value, CountsContainersUpToALimit) {
    EXPECT_EQ(nestingDepth(1, 16), 0);
    EXPECT_EQ(nestingDepth(Array{}, 16), 1);
    EXPECT_EQ(nestingDepth(Array{1, Dictionary{{"a", Array{}}}, Array{}}, 16), 3);
    Value deep;
    for (int i = 0; i < 1000; ++i) deep = Array{deep};
    EXPECT_EQ(nestingDepth(deep, 16), 17);
    EXPECT_EQ(nestingDepth(deep, 1000), 1000);
}

TEST(NumberText, ReadsWhatATextBeginsWithAndValuesAsNumbers) {
    const std::string zeros(400, '0');
    const std::tuple<Value, double, std::int64_t> cases[] = {
        {"3", 3, 3},
        {" \t\n12.75 days", 12.75, 12},
        {"+5", 5, 5},
        {"-7.5e1x", -75, -7},
        {".5", 0.5, 0},
        {"-.5", -0.5, 0},
        {"1e", 1, 1},
        {"9223372036854775807", 9223372036854775807.0, largest},
        {"9223372036854775808", 9223372036854775808.0, largest},
        {"-9223372036854775809", -9223372036854775808.0, smallest},
        {"1e999", largestDouble, 1},
        {"-1e999", -largestDouble, -1},
        {"1e99999999999999999999", largestDouble, 1},
        {"1e-999", 0, 1},
        {"-1e-99999999999999999999", 0, -1},
        {"1" + zeros, largestDouble, largest},
        {"-1" + zeros + ".5", -largestDouble, smallest},
        {"1" + zeros + "e-5", largestDouble, largest},
        {Value(), 0, 0},
        {true, 1, 1},
        {largest, 9223372036854775807.0, largest},
        {-2.9, -2.9, -2},
        {1e300, 1e300, largest},
        {-1e300, -1e300, smallest},
        {9223372036854775808.0, 9223372036854775808.0, largest},
        {Array{1}, 0, 0},
        {Date(), 0, 0},
    };
    for (const auto& [value, decimal, integer] : cases) {
        EXPECT_EQ(numberFromValue(value), decimal) << value.description();
        EXPECT_EQ(integerFromValue(value), integer) << value.description();
        if (const std::string* text = value.asString()) {
            EXPECT_EQ(leadingDecimal(*text), decimal) << *text;
            EXPECT_EQ(leadingInteger(*text), integer) << *text;
        }
    }
    EXPECT_EQ(integerFromValue(std::nan("")), 0);
    for (const std::string& zero : {""s, "- 5"s, "+-5"s, "-+5"s, "0x10"s, "inf"s, "nan"s, "abc1"s, "0." + zeros + "1",
                                    "-0." + zeros + "1", "00." + zeros + "1e+5"}) {
        EXPECT_EQ(leadingDecimal(zero), 0) << zero;
        EXPECT_EQ(leadingInteger(zero), 0) << zero;
    }
}

}  // namespace
}  // namespace vrx::platform
