// What the thread sanitizer is to pass over, in a build that has it. libsystemd makes the key of a hash table that
// grows in one static buffer and copies it from there, whatever the thread: two at a time get a key that is none the
// worse.
extern "C" const char* __tsan_default_suppressions();
extern "C" const char* __tsan_default_suppressions() {
    return "race:libsystemd.so\n";
}
