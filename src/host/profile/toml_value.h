// TOML, read within bounds. Any thread may call.
#pragma once

// The parser's own assertion fails for some headers of tables, before it reports them as errors.
#define TOML_ASSERT(expression) static_cast<void>(0)
#include <toml++/toml.h>

#include <cstddef>
#include <string>
#include <string_view>

#include "vrx/platform/error.h"
#include "vrx/platform/value.h"

namespace vrx::host {

inline constexpr std::size_t mostTomlBytes = 64 * 1024;

// The document of the file at the path. A failure is the one given, with a text for people that begins with file and
// line. A document of more than mostTomlBytes, or nested beyond limits::documentDepth, is not parsed at all: the parser
// takes a level of the stack for each part of a dotted key.
platform::Result<toml::table> parseToml(std::string_view document, const std::string& path, platform::Error failure);

// As a property value: booleans, numbers, texts, lists and tables as such, dates and times as their text.
platform::Value valueOf(const toml::node& node);

}  // namespace vrx::host
