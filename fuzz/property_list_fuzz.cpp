// Whatever parses, in either form, is written in the binary form, and in XML if XML can hold it; read and written again
// it gives the same document. Documents are compared because not every value equals itself.
#include "require.h"
#include "vrx/codec/property_list.h"
#include "vrx/platform/limits.h"

using namespace vrx;
using platform::PropertyListFormat;

extern "C" int LLVMFuzzerTestOneInput(const std::uint8_t* bytes, std::size_t size) {
    const auto value = codec::parsePropertyList(platform::Data(bytes, bytes + size));
    if (!value) return 0;
    for (PropertyListFormat form : {PropertyListFormat::Binary, PropertyListFormat::Xml}) {
        const auto written = codec::serializePropertyList(*value, form);
        require(written || form != PropertyListFormat::Binary);
        // What objects shared may be too much when it is written out.
        if (!written || written->size() > platform::limits::documentBytes) continue;
        const auto again = codec::parsePropertyList(*written);
        require(again && *codec::serializePropertyList(*again, form) == *written);
    }
    return 0;
}
