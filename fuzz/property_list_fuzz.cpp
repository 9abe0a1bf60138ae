// Whatever parses, in either form, is written in the binary form and read back equal; so it is in XML, if XML can hold
// it.
#include <cmath>
#include <cstdlib>

#include "codec/property_list.h"
#include "platform/limits.h"

using namespace vrx;
using platform::PropertyListFormat;
using platform::Value;

namespace {

bool equal(const Value& a, const Value& b, PropertyListFormat form) {
    if (const auto* elements = a.asArray()) {
        const auto* others = b.asArray();
        if (!others || others->size() != elements->size()) return false;
        for (std::size_t i = 0; i < elements->size(); ++i)
            if (!equal((*elements)[i], (*others)[i], form)) return false;
        return true;
    }
    if (const auto* entries = a.asDictionary()) {
        if (!b.asDictionary() || b.asDictionary()->size() != entries->size()) return false;
        for (const auto& [key, element] : *entries)
            if (!b.asDictionary()->contains(key) || !equal(element, b[key], form)) return false;
        return true;
    }
    if (a.asDate() && b.asDate()) {
        // Counting from another year rounds dates that are very far off; XML drops the fraction.
        const double left = platform::epochSeconds(*a.asDate()), right = platform::epochSeconds(*b.asDate());
        return form == PropertyListFormat::Xml ? std::floor(left) == right
                                               : std::abs(left - right) <= std::abs(left) * 1e-15;
    }
    if (a.asNumber() && b.asNumber() && std::isnan(*a.asNumber())) return std::isnan(*b.asNumber());
    return a == b;
}

}  // namespace

extern "C" int LLVMFuzzerTestOneInput(const std::uint8_t* bytes, std::size_t size) {
    const auto value = codec::parsePropertyList(platform::Data(bytes, bytes + size));
    if (!value) return 0;
    for (PropertyListFormat form : {PropertyListFormat::Binary, PropertyListFormat::Xml}) {
        const auto written = codec::serializePropertyList(*value, form);
        if (!written && form == PropertyListFormat::Binary) std::abort();
        // What objects shared may be too much when it is written out.
        if (!written || written->size() > platform::limits::documentBytes) continue;
        const auto again = codec::parsePropertyList(*written);
        if (!again || !equal(*value, *again, form)) std::abort();
    }
    return 0;
}
