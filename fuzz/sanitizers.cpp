// How the sanitizers of the fuzzers are set. More memory than a song of an input's size can need is
// not there: the failure is handled like any other. A short quarantine makes thousands of runs a
// second possible.
extern "C" const char *__asan_default_options();
extern "C" const char *__asan_default_options() {
    return "allocator_may_return_null=1:max_allocation_size_mb=1024:quarantine_size_mb=8";
}
extern "C" const char *__tsan_default_options();
extern "C" const char *__tsan_default_options() {
    return "allocator_may_return_null=1:max_allocation_size_mb=1024";
}
extern "C" const char *__ubsan_default_options();
extern "C" const char *__ubsan_default_options() {
    return "print_stacktrace=1";
}
