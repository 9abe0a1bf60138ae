// As much of a URL as the agent needs: its scheme, and for a file URL the file it names.
#pragma once

#include <optional>
#include <string>
#include <string_view>

namespace vrx::platform {

class Url {
public:
    // Nothing for a text that has no scheme.
    static std::optional<Url> parse(std::string_view text);
    static Url forFile(std::string_view path);

    bool isFile() const;
    // The path of a file URL, its percent escapes resolved; nothing when it names no local file. An escaped slash or
    // NUL, which no file name holds, makes it name none.
    std::optional<std::string> filePath() const;
    // What follows the last dot of the last path component, its percent escapes resolved; empty when there is none.
    std::string pathExtension() const;
    // The same URL with another extension, added if it had none; the extension is given unescaped.
    Url withPathExtension(std::string_view extension) const;

    const std::string& text() const { return text_; }
    std::string description() const { return text_; }

private:
    explicit Url(std::string text) : text_(std::move(text)) {}
    // Where the dot of the path extension stands, or the end of the path, and the end of the path.
    std::pair<std::size_t, std::size_t> extensionRange() const;

    std::string text_;
};

}  // namespace vrx::platform
