#include "vrx/codec/property_list.h"

#include "vrx/codec/binary_property_list.h"
#include "vrx/codec/property_list_error.h"
#include "vrx/codec/xml_property_list.h"
#include "vrx/platform/limits.h"

namespace vrx::codec {

using platform::Data;
using platform::Result;
using platform::Value;

Result<Value> parsePropertyList(const Data& document) {
    if (document.size() > platform::limits::fileBytes)
        return invalidPropertyList("byte " + std::to_string(platform::limits::fileBytes), "document too large");
    return isBinaryPropertyList(document) ? parseBinaryPropertyList(document) : parseXmlPropertyList(document);
}

Result<Data> serializePropertyList(const Value& root, platform::PropertyListFormat format) {
    if (platform::nestingDepth(root, platform::limits::documentDepth) > platform::limits::documentDepth)
        return unwritablePropertyList("containers nested so deeply");
    Result<Data> document = format == platform::PropertyListFormat::Binary ? serializeBinaryPropertyList(root)
                                                                           : serializeXmlPropertyList(root);
    if (document && document->size() > platform::limits::fileBytes) return unwritablePropertyList("so much");
    return document;
}

}  // namespace vrx::codec
