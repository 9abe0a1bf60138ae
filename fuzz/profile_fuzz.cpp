// A device profile and a bundle's file: whatever they hold, reading them ends, and says a line where it fails.
#include "require.h"
#include "vrx/host/profile/bundle_file.h"
#include "vrx/host/profile/profile_reader.h"

using namespace vrx;

extern "C" int LLVMFuzzerTestOneInput(const std::uint8_t* bytes, std::size_t size) {
    const std::string_view document(reinterpret_cast<const char*>(bytes), size);
    const auto profile = host::parseProfile(document, "device.toml");
    require(profile || profile.error().text.starts_with("device.toml:"));
    const auto bundle = host::parseBundleFile(document, "folder");
    require(bundle || bundle.error().text.starts_with("folder/bundle.toml:"));
    return 0;
}
