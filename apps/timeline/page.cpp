#include "timeline/page.h"

#include <cerrno>
#include <cstring>
#include <fstream>

#include "timeline/document.h"
#include "timeline/page_source.h"
#include "vrx/codec/base64.h"
#include "vrx/codec/digest.h"
#include "vrx/codec/json.h"

namespace vrx::timeline {

namespace {

// JSON that stands in a script element: what could end the element, or begin a comment there, is escaped, and so are
// the line ends that scripts know and JSON does not.
std::string embedded(const std::string& json) {
    std::string text;
    for (std::size_t at = 0; at < json.size(); ++at) {
        const char character = json[at];
        const std::string_view rest = std::string_view(json).substr(at);
        if (character == '<' || character == '>' || character == '&') {
            text += character == '<' ? "\\u003c" : character == '>' ? "\\u003e" : "\\u0026";
        } else if (rest.starts_with("\u2028") || rest.starts_with("\u2029")) {
            text += rest.starts_with("\u2028") ? "\\u2028" : "\\u2029";
            at += 2;
        } else {
            text += character;
        }
    }
    return text;
}

void replace(std::string& text, std::string_view mark, const std::string& content) {
    if (const std::size_t at = text.find(mark); at != text.npos) text.replace(at, mark.size(), content);
}

// Of what stands between the two tags, as a content security policy names a script or a style.
std::string hashBetween(const std::string& page, std::string_view begin, std::string_view end) {
    const std::size_t first = page.find(begin) + begin.size();
    const auto digest = codec::sha256(page.substr(first, page.find(end, first) - first));
    return "sha256-" + codec::base64FromData({digest.begin(), digest.end()});
}

}  // namespace

std::string pageOf(const Chronicle& chronicle, const std::string& title) {
    std::string page = pageSource;
    replace(page, "{{style}}", hashBetween(page, "<style>", "</style>"));
    replace(page, "{{script}}", hashBetween(page, "<script>", "</script>"));
    platform::Dictionary data = documentOf(chronicle);
    data["title"] = title;
    replace(page, "{{data}}", embedded(codec::printedJson(data, codec::JsonLayout::OneLine)));
    return page;
}

std::string writePage(const std::string& file, const Chronicle& chronicle, const std::string& title) {
    std::ofstream stream(file, std::ios::binary | std::ios::trunc);
    stream << pageOf(chronicle, title);
    return stream.flush() ? "" : file + ": " + std::strerror(errno);
}

}  // namespace vrx::timeline
