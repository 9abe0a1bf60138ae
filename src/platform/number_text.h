// Reads numbers and flags from the beginning of a text, as property values do. Independent of the locale.
#pragma once

#include <cstdint>
#include <string_view>

#include "vrx/platform/value.h"

namespace vrx::platform {

// The number that the text begins with, after leading blanks; 0 when it begins with none. A magnitude out of range
// becomes the nearest value.
double leadingDecimal(std::string_view text);
std::int64_t leadingInteger(std::string_view text);
// Whether the text says yes: after leading blanks, a sign and zeros it begins with Y, y, T, t or a digit from 1 to 9.
bool leadingFlag(std::string_view text);

// A value as a number: a number as it is, true as 1, a string by the number that it begins with, anything else as 0.
// integerFromValue() cuts off the fraction and clamps to the range of int64; NaN is 0.
double numberFromValue(const Value& value);
std::int64_t integerFromValue(const Value& value);
// A value as a flag: a boolean as it is, a number as true unless it is 0, a string by leadingFlag(), anything else as
// false.
bool flagFromValue(const Value& value);

// The double without its fraction, clamped to the range of int64; NaN is 0.
std::int64_t clampedInteger(double value);

}  // namespace vrx::platform
