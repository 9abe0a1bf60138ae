// The settings that apply until others are written.
// A leading "vrx_" is spelled so on purpose; "Names" in docs/architecture.md says why.
#pragma once

namespace vrx::platform {
class DefaultsStore;
}

namespace vrx {

// Registers all of them with the store. Call this at every start, before anything reads the store.
void vrx_registerDefaults(platform::DefaultsStore& defaults);

}  // namespace vrx
