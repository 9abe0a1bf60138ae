#include "vrx/codec/metainfo.h"

#include <array>
#include <cerrno>
#include <utility>

#include "vrx/codec/expat.h"
#include "vrx/codec/translated_text.h"

namespace vrx::codec {

using platform::Error;
using platform::Result;

namespace {

Error invalidMetainfo(const std::string& reason) {
    return {platform::error_domain::bundle, EBADMSG, "invalid metainfo: " + reason};
}

// Reads a document by the events of expat. The first complaint ends the parse.
class MetainfoReader {
public:
    explicit MetainfoReader(std::string_view language)
        : texts_{TranslatedText(language), TranslatedText(language), TranslatedText(language)},
          parser_(expat().parserCreate(nullptr)) {
        expat().setUserData(parser_.get(), this);
        expat().setElementHandler(
            parser_.get(),
            [](void* self, const char* name, const char** attributes) { of(self).begin(name, attributes); },
            [](void* self, const char*) { of(self).end(); });
        expat().setCharacterDataHandler(parser_.get(), [](void* self, const char* text, int length) {
            of(self).characters({text, static_cast<std::size_t>(length)});
        });
        expat().setEntityDeclHandler(
            parser_.get(), [](void* self, const char*, int, const char*, int, const char*, const char*, const char*,
                              const char*) { of(self).complain("entities are not supported"); });
        expat().setSkippedEntityHandler(
            parser_.get(), [](void* self, const char*, int) { of(self).complain("entities are not supported"); });
    }

    Result<Metainfo> read(const platform::Data& document) {
        const auto* bytes = reinterpret_cast<const char*>(document.data());
        const bool parsed =
            expat().parse(parser_.get(), bytes, static_cast<int>(document.size()), XML_TRUE) == XML_STATUS_OK;
        if (!complaint_.empty()) return invalidMetainfo(complaint_);
        if (!parsed) return invalidMetainfo(expat().errorString(expat().getErrorCode(parser_.get())));
        const auto& [name, developer, formerDeveloper] = texts_;
        return Metainfo{name.nearest(), developer.nearest() ? developer.nearest() : formerDeveloper.nearest()};
    }

private:
    // Where the texts stand, below the root. Other elements have names as well, such as a release's artifacts.
    static constexpr std::array<std::string_view, 3> places = {"/name", "/developer/name", "/developer_name"};

    static MetainfoReader& of(void* self) { return *static_cast<MetainfoReader*>(self); }

    void complain(const char* complaint) {
        if (!complaint_.empty()) return;
        complaint_ = complaint;
        expat().stopParser(parser_.get(), XML_FALSE);
    }

    // Expat may still report an event or two after the parse was stopped.
    void begin(std::string_view name, const char** attributes) {
        if (!complaint_.empty()) return;
        if (depth_++ == 0) {
            // <application> is the root's former name.
            if (name != "component" && name != "application") complain("the root is not <component>");
            return;
        }
        if (depth_ <= deepest) (path_ += '/') += name;
        if (!wanted()) return;
        offered_.clear();
        language_.clear();
        for (; attributes[0]; attributes += 2)
            if (attributes[0] == std::string_view("xml:lang")) language_ = attributes[1];
    }

    void end() {
        if (!complaint_.empty()) return;
        if (TranslatedText* text = wanted()) text->offer(language_, offered_);
        if (--depth_ > 0 && depth_ < deepest) path_.resize(path_.rfind('/'));
    }

    void characters(std::string_view text) {
        if (complaint_.empty() && wanted()) offered_ += text;
    }

    // The text that the present element gives; null when it gives none.
    TranslatedText* wanted() {
        if (depth_ > deepest) return nullptr;
        for (std::size_t i = 0; i < places.size(); ++i)
            if (path_ == places[i]) return &texts_[i];
        return nullptr;
    }

    static constexpr std::size_t deepest = 3;  // elements within each other, as far as they are told apart
    std::array<TranslatedText, 3> texts_;      // of `places`
    XmlParser parser_;
    std::size_t depth_ = 0;
    std::string path_;  // of the present element, without the root
    std::string language_;
    std::string offered_;
    std::string complaint_;
};

}  // namespace

Result<Metainfo> parseMetainfo(const platform::Data& document, std::string_view language) {
    if (const std::string missing = expat().library.missing(); !missing.empty()) return invalidMetainfo(missing);
    return MetainfoReader(language).read(document);
}

}  // namespace vrx::codec
