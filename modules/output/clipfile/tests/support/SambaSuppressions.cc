// What the sanitizers are told of the libraries that libsmbclient brings: they know nothing of sanitizers,
// and nothing of ours is named here.

// Declared by the sanitizers alone, and not in all versions.
extern "C" {
const char* __lsan_default_suppressions();
const char* __lsan_default_suppressions() {
    // Its stack of memory frames, 160 octets for each thread that was in it, has no end.
    return "leak:libsamba-util.so\n";
}
const char* __lsan_default_options();
const char* __lsan_default_options() {
    // Tests read what programs say.
    return "print_suppressions=0";
}
}
