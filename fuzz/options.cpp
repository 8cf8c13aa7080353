// How the sanitizers of every fuzzer are set, so that a program run by hand behaves as in the
// script.

extern "C" const char *__asan_default_options();
extern "C" const char *__ubsan_default_options();

// More memory than a song of an input's size can need is not there: the failure is handled like any
// other. A short quarantine and no waiting for pages make ten thousand runs a second possible.
extern "C" const char *__asan_default_options() {
    return "allocator_may_return_null=1:max_allocation_size_mb=1024:quarantine_size_mb=8";
}

extern "C" const char *__ubsan_default_options() {
    return "print_stacktrace=1";
}
