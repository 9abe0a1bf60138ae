// A device profile and a bundle's file: whatever they hold, reading them ends, and says a line where it fails. What
// else describes applications: reading it ends, and a text that it gives is one line.
#include "require.h"
#include "vrx/codec/key_file.h"
#include "vrx/codec/metainfo.h"
#include "vrx/codec/translated_text.h"
#include "vrx/host/base/text.h"
#include "vrx/host/profile/bundle_file.h"
#include "vrx/host/profile/profile_reader.h"

using namespace vrx;

extern "C" int LLVMFuzzerTestOneInput(const std::uint8_t* bytes, std::size_t size) {
    const std::string_view document(reinterpret_cast<const char*>(bytes), size);
    const auto profile = host::parseProfile(document, "device.toml");
    require(profile || profile.error().text.starts_with("device.toml:"));
    const auto bundle = host::parseBundleFile(document, "folder");
    require(bundle || bundle.error().text.starts_with("folder/bundle.toml:"));
    const auto metainfo = codec::parseMetainfo(platform::Data(bytes, bytes + size), "zh_Hant_TW");
    require(!metainfo || host::isOneLine(metainfo->name.value_or("") + metainfo->developer.value_or("")));
    codec::TranslatedText text("sr-Latn");
    codec::readKeyFile(document, "Desktop Entry", [&](auto key, auto value) { text.offer(key, value); });
    require(host::isOneLine(text.nearest().value_or("")));
    return 0;
}
