#include "vrx/platform/number_text.h"

#include <algorithm>
#include <charconv>
#include <cmath>
#include <limits>

namespace vrx::platform {

namespace {

// The text behind leading blanks and one "+", which from_chars does not take.
std::string_view withoutLead(std::string_view text) {
    std::size_t start = text.find_first_not_of(" \t\n\v\f\r");
    if (start == std::string_view::npos) return {};
    text.remove_prefix(start);
    if (text.size() > 1 && text[0] == '+' && text[1] != '-') text.remove_prefix(1);
    return text;
}

bool beginsWithDigits(std::string_view text) {
    if (text.starts_with('-')) text.remove_prefix(1);
    if (text.starts_with('.')) text.remove_prefix(1);
    return !text.empty() && text[0] >= '0' && text[0] <= '9';
}

// Whether a number that is not 0 is below 1 in magnitude: with the exponent applied, its first digit other than 0
// stands behind the decimal point.
bool isBelowOne(std::string_view number) {
    std::size_t exponentMark = std::min(number.find_first_of("eE"), number.size());
    std::string_view digits = number.substr(0, exponentMark);
    auto first = static_cast<std::int64_t>(std::min(digits.find_first_of("123456789"), digits.size()));
    auto point = static_cast<std::int64_t>(std::min(digits.find('.'), digits.size()));
    std::int64_t exponent = leadingInteger(number.substr(std::min(exponentMark + 1, number.size())));
    return exponent < first - point + (first < point ? 1 : 0);
}

}  // namespace

double leadingDecimal(std::string_view text) {
    text = withoutLead(text);
    if (!beginsWithDigits(text)) return 0;  // "inf" and "nan" are words here
    double number = 0;
    auto [end, error] = std::from_chars(text.data(), text.data() + text.size(), number);
    if (error != std::errc::result_out_of_range) return number;
    // Out of range: from_chars does not say whether the number is too large or too close to zero.
    std::string_view digits = text.substr(0, static_cast<std::size_t>(end - text.data()));
    double magnitude = isBelowOne(digits) ? 0.0 : std::numeric_limits<double>::max();
    return digits.starts_with('-') ? -magnitude : magnitude;
}

std::int64_t leadingInteger(std::string_view text) {
    text = withoutLead(text);
    std::int64_t number = 0;
    auto [end, error] = std::from_chars(text.data(), text.data() + text.size(), number);
    if (error != std::errc::result_out_of_range) return number;
    return text.starts_with('-') ? std::numeric_limits<std::int64_t>::min() : std::numeric_limits<std::int64_t>::max();
}

std::int64_t clampedInteger(double value) {
    constexpr double bound = 9223372036854775808.0;  // 2^63
    if (std::isnan(value)) return 0;
    if (value >= bound) return std::numeric_limits<std::int64_t>::max();
    if (value < -bound) return std::numeric_limits<std::int64_t>::min();
    return static_cast<std::int64_t>(value);
}

bool leadingFlag(std::string_view text) {
    text.remove_prefix(std::min(text.find_first_not_of(" \t\n\v\f\r"), text.size()));
    if (text.starts_with('+') || text.starts_with('-')) text.remove_prefix(1);
    text.remove_prefix(std::min(text.find_first_not_of('0'), text.size()));
    constexpr std::string_view yes = "YyTt123456789";
    return !text.empty() && yes.find(text.front()) != std::string_view::npos;
}

bool flagFromValue(const Value& value) {
    if (const std::string* text = value.asString()) return leadingFlag(*text);
    return numberFromValue(value) != 0;
}

double numberFromValue(const Value& value) {
    if (auto number = value.asNumber()) return *number;
    if (auto flag = value.asBool()) return *flag ? 1 : 0;
    if (const std::string* text = value.asString()) return leadingDecimal(*text);
    return 0;
}

std::int64_t integerFromValue(const Value& value) {
    if (auto integer = value.asInteger()) return *integer;
    if (const std::string* text = value.asString()) return leadingInteger(*text);
    return clampedInteger(numberFromValue(value));
}

}  // namespace vrx::platform
