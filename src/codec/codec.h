// The codecs as facilities of a platform, the same on every host. Any thread may use them.
#pragma once

#include "vrx/codec/digest.h"
#include "vrx/codec/json.h"
#include "vrx/codec/property_list.h"
#include "vrx/platform/digest.h"
#include "vrx/platform/json.h"
#include "vrx/platform/property_list.h"

namespace vrx::codec {

class Json final : public platform::Json {
public:
    platform::Result<platform::Value> parse(std::string_view document) const override { return parseJson(document); }
    platform::Result<std::string> serialize(const platform::Value& root) const override { return serializeJson(root); }
};

class PropertyList final : public platform::PropertyList {
public:
    platform::Result<platform::Value> parse(const platform::Data& document) const override {
        return parsePropertyList(document);
    }
    platform::Result<platform::Data> serialize(const platform::Value& root,
                                               platform::PropertyListFormat format) const override {
        return serializePropertyList(root, format);
    }
};

class Digest final : public platform::Digest {
public:
    std::array<std::uint8_t, 32> sha256(std::string_view bytes) const override { return codec::sha256(bytes); }
};

}  // namespace vrx::codec
