// What kind of system the agent runs on.
#pragma once

namespace vrx {

class VRXUtilities {
public:
    VRXUtilities() = delete;
    // Whether the OS is an internal build, which honours the overrides of testers. Any thread may ask.
    static bool isInternal();
};

}  // namespace vrx
