// The settings that apply until someone writes others.
#pragma once

namespace vrx::platform {
class DefaultsStore;
}

namespace vrx {

// Registers all of them with the store; to be done at every start, before anything reads it.
void vrx_registerDefaults(platform::DefaultsStore& defaults);

}  // namespace vrx
