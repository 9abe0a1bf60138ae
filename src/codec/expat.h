// Expat, opened when the first XML document is read: the agent's own files are binary. Any thread may call; a parser is
// one thread's at a time.
#pragma once

#include <expat.h>

#include <cstdint>
#include <memory>
#include <type_traits>

#include "vrx/codec/core/lazy_library.h"

namespace vrx::codec {

// Tells a line or a column. Newer releases of expat deprecate the name without a width; older ones have only that name.
class PlaceFunction {
public:
    PlaceFunction(const LazyLibrary& library, const char* wide, const char* narrow)
        : wide_(library.optionalFunction(wide)) {
        if (!wide_) narrow_ = library.function(narrow);
    }

    std::uint64_t operator()(XML_Parser parser) const { return wide_ ? wide_(parser) : narrow_(parser); }

private:
    std::uint64_t (*wide_)(XML_Parser);
    XML_Size (*narrow_)(XML_Parser) = nullptr;
};

// Its functions by their names there.
struct Expat {
    const LazyLibrary library{"libexpat.so.1"};
    decltype(&::XML_ParserCreate) parserCreate = library.function("XML_ParserCreate");
    decltype(&::XML_SetUserData) setUserData = library.function("XML_SetUserData");
    decltype(&::XML_SetElementHandler) setElementHandler = library.function("XML_SetElementHandler");
    decltype(&::XML_SetCharacterDataHandler) setCharacterDataHandler = library.function("XML_SetCharacterDataHandler");
    decltype(&::XML_SetEntityDeclHandler) setEntityDeclHandler = library.function("XML_SetEntityDeclHandler");
    decltype(&::XML_SetSkippedEntityHandler) setSkippedEntityHandler = library.function("XML_SetSkippedEntityHandler");
    decltype(&::XML_Parse) parse = library.function("XML_Parse");
    decltype(&::XML_ErrorString) errorString = library.function("XML_ErrorString");
    decltype(&::XML_GetErrorCode) getErrorCode = library.function("XML_GetErrorCode");
    const PlaceFunction currentLine{library, "XML_GetCurrentLineNumber64", "XML_GetCurrentLineNumber"};
    const PlaceFunction currentColumn{library, "XML_GetCurrentColumnNumber64", "XML_GetCurrentColumnNumber"};
    decltype(&::XML_StopParser) stopParser = library.function("XML_StopParser");
    decltype(&::XML_ParserFree) parserFree = library.function("XML_ParserFree");
};

// The first call opens the library.
inline const Expat& expat() {
    static const Expat expat;
    return expat;
}

struct FreeXmlParser {
    void operator()(XML_Parser parser) const { expat().parserFree(parser); }
};
using XmlParser = std::unique_ptr<std::remove_pointer_t<XML_Parser>, FreeXmlParser>;

}  // namespace vrx::codec
