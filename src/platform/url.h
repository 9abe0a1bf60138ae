// As much of a URL as the agent needs: its scheme, and for a file URL the file it names.
#pragma once

#include <optional>
#include <string>
#include <string_view>

namespace vrx::platform {

class Url {
public:
    // Null for a text that has no scheme or holds a control character.
    static std::optional<Url> parse(std::string_view text);
    static Url forFile(std::string_view path);

    bool isFile() const;
    // The path of a file URL, with its percent escapes resolved. Null when the URL does not name a local file; an
    // escaped slash or NUL, which no file name can hold, makes it name none.
    std::optional<std::string> filePath() const;
    // What follows the last dot of the last path component, with its percent escapes resolved; empty without a dot.
    std::string pathExtension() const;
    // The same URL with another extension, added if it had none; the extension is given unescaped.
    Url withPathExtension(std::string_view extension) const;

    const std::string& text() const { return text_; }
    std::string description() const { return text_; }

private:
    explicit Url(std::string text) : text_(std::move(text)) {}
    // The position of the extension's dot, or of the path's end when there is no extension, and the position of the
    // path's end.
    std::pair<std::size_t, std::size_t> extensionRange() const;

    std::string text_;
};

}  // namespace vrx::platform
