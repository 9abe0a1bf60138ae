// JSON documents as values. Any thread may call.
#pragma once

#include <string>
#include <string_view>

#include "vrx/platform/error.h"
#include "vrx/platform/value.h"

namespace vrx::codec {

// Strict: UTF-8 throughout, no comments, nothing after the root. Integers beyond int64 become doubles, numbers beyond
// double are errors, and of members with the same name the last counts. The error's text tells the byte at which
// reading ended, and quotes nothing of the document.
platform::Result<platform::Value> parseJson(std::string_view document);

// Compact. Fails for what JSON does not have: dates, data, numbers that are not finite, text that is not UTF-8.
platform::Result<std::string> serializeJson(const platform::Value& root);

// The JSON that programs print; every value has one. Dates are ISO 8601 text, data is base64 text, a number that is not
// finite is null, and bytes that are not UTF-8 are replaced. The text does not end with a line break; OneLine holds
// none at all.
enum class JsonLayout { OneLine, Indented };
std::string printedJson(const platform::Value& root, JsonLayout layout);

}  // namespace vrx::codec
