// Whatever parses is written and read back equal, in every layout.
#include "require.h"
#include "vrx/codec/json.h"

using namespace vrx;

extern "C" int LLVMFuzzerTestOneInput(const std::uint8_t* bytes, std::size_t size) {
    const auto value = codec::parseJson({reinterpret_cast<const char*>(bytes), size});
    if (!value) return 0;
    const auto written = codec::serializeJson(*value);
    require(static_cast<bool>(written));
    for (const std::string& text : {*written, codec::printedJson(*value, codec::JsonLayout::OneLine),
                                    codec::printedJson(*value, codec::JsonLayout::Indented)}) {
        const auto again = codec::parseJson(text);
        require(again && *again == *value);
    }
    return 0;
}
