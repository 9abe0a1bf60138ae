// A text for people that a file has in several languages, such as an application's name: of the translations that are
// offered the nearest to one language is kept. One thread at a time.
#pragma once

#include <cstddef>
#include <optional>
#include <string>
#include <string_view>
#include <vector>

namespace vrx::codec {

class TranslatedText {
public:
    // The language that is wanted: "de", "de_AT", "zh-Hant_TW".
    explicit TranslatedText(std::string_view language);

    // The language as files write it, "pt-BR", "sr@latin", "de_DE.UTF-8"; empty for the text that is not translated.
    // White space within the text counts as one blank. A text that is empty, too long, no UTF-8 or has control
    // characters is passed over.
    void offer(std::string_view language, std::string_view text);

    // First in the language with its script and region, then with one of them, then without both, then not translated;
    // of several the first one offered. Null when none of them was.
    const std::optional<std::string>& nearest() const { return nearest_; }

private:
    std::vector<std::string> wanted_;  // the nearest first
    std::size_t rank_;                 // in `wanted_`, of what is kept
    std::optional<std::string> nearest_;
};

}  // namespace vrx::codec
