// What an AppStream metainfo document says of an application for people to read. Any thread may call.
#pragma once

#include <optional>
#include <string>
#include <string_view>

#include "vrx/platform/error.h"
#include "vrx/platform/value.h"

namespace vrx::codec {

struct Metainfo {
    std::optional<std::string> name{};
    std::optional<std::string> developer{};
};

// The texts nearest to the language, as TranslatedText chooses them. An error, with a text for people, when the
// document is no well-formed component or declares entities, which can make a small document a huge one.
platform::Result<Metainfo> parseMetainfo(const platform::Data& document, std::string_view language);

}  // namespace vrx::codec
