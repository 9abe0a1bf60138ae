// Lets calls fail on the thread that asks for it: those of the host's code to the system, and SQLite's to the system
// and to its allocator. The host's are wrapped by the linker; SQLite's fail by its own means, a VFS in front of the
// real one and an allocator in front of its own.
#pragma once

namespace vrx {

class CallFaults {
public:
    enum class Kind { None, Call, Read, Allocation };  // a read is a call as well

    // Before this process uses SQLite.
    static void install();
    // From now on the number-th of the kind fails, counted from 1, and all after it if that is for good.
    static void fail(Kind kind, int number, bool isForGood);
    // Nothing fails any more. Returns whether something has failed.
    static bool end();
};

}  // namespace vrx
