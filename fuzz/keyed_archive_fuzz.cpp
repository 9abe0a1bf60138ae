// A document, taken once for what a record holds and once for the archive that a peer sends.
#include "require.h"
#include "vrx/codec/core/keyed_archive.h"
#include "vrx/codec/json.h"
#include "vrx/codec/property_list.h"

using namespace vrx;
using platform::AllowedKinds;
using platform::Value;

namespace {

constexpr AllowedKinds everyKind = {AllowedKinds::Strings, AllowedKinds::Numbers, AllowedKinds::Dates,
                                    AllowedKinds::Arrays, AllowedKinds::Dictionaries};

struct Node final : platform::Archivable {
    static constexpr std::string_view archiveClassName = "Node";
    std::string_view className() const override { return archiveClassName; }
    void encodeWithCoder(platform::KeyedEncoder& coder) const override {
        coder.encodeObject("value", value);
        coder.encodeInteger("number", number);
        coder.encodeObject("next", next.get());
    }
    static std::shared_ptr<Node> initWithCoder(platform::KeyedDecoder& coder) {
        auto node = std::make_shared<Node>();
        node->value = coder.decodeValue("value", everyKind);
        node->number = coder.decodeInteger("number");
        node->next = coder.decodeObject<Node>("next");
        return node;
    }
    Value value;
    std::int64_t number = 0;
    std::shared_ptr<Node> next;
};

// Texts tell apart what does not equal itself.
bool same(const Value& a, const Value& b) {
    return a == b || a.description() == b.description();
}

}  // namespace

extern "C" int LLVMFuzzerTestOneInput(const std::uint8_t* bytes, std::size_t size) {
    auto document = codec::parseJson({reinterpret_cast<const char*>(bytes), size});
    if (!document) document = codec::parsePropertyList(platform::Data(bytes, bytes + size));
    if (!document) return 0;
    const Value& value = *document;

    Node node;
    node.value = value;
    const auto restored = codec::unarchive<Node>(codec::archive(node));
    require(restored && same(codec::archiveValue((*restored)->value), codec::archiveValue(value)));

    if (const auto sent = codec::unarchive<Node>(value)) {
        const auto again = codec::unarchive<Node>(codec::archive(**sent));
        require(again && same((*again)->value, (*sent)->value) && (*again)->number == (*sent)->number);
    }
    if (const auto plain = codec::unarchiveValue(value, everyKind)) require(same(codec::archiveValue(*plain), value));
    static_cast<void>(codec::unarchiveList<Node>(value));
    return 0;
}
