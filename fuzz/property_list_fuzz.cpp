// Whatever parses, in either form, is written in the binary form, and in XML if XML can hold it; read and written again
// it gives the same document. Documents are compared because not every value equals itself.
#include <cstdlib>

#include "vrx/codec/property_list.h"
#include "vrx/platform/limits.h"

using namespace vrx;
using platform::PropertyListFormat;

extern "C" int LLVMFuzzerTestOneInput(const std::uint8_t* bytes, std::size_t size) {
    const auto value = codec::parsePropertyList(platform::Data(bytes, bytes + size));
    if (!value) return 0;
    for (PropertyListFormat form : {PropertyListFormat::Binary, PropertyListFormat::Xml}) {
        const auto written = codec::serializePropertyList(*value, form);
        if (!written && form == PropertyListFormat::Binary) std::abort();
        // What objects shared may be too much when it is written out.
        if (!written || written->size() > platform::limits::documentBytes) continue;
        const auto again = codec::parsePropertyList(*written);
        if (!again || *codec::serializePropertyList(*again, form) != *written) std::abort();
    }
    return 0;
}
