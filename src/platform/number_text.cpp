#include "platform/number_text.h"

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

}  // namespace

double leadingDecimal(std::string_view text) {
    text = withoutLead(text);
    if (!beginsWithDigits(text)) return 0;  // "inf" and "nan" are words here
    double number = 0;
    auto [end, error] = std::from_chars(text.data(), text.data() + text.size(), number);
    if (error != std::errc::result_out_of_range) return number;
    // from_chars leaves the number alone: too large, or too close to zero.
    std::string_view digits = text.substr(0, static_cast<std::size_t>(end - text.data()));
    std::size_t exponent = digits.find_first_of("eE");
    bool tiny =
        exponent == std::string_view::npos ? digits.find('.') <= 1 : digits.substr(exponent + 1).starts_with('-');
    double magnitude = tiny ? 0.0 : std::numeric_limits<double>::max();
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
