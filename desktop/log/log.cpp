#include "android/log.h"

#include <cstdarg>
#include <cstdio>
#include <cstdlib>
#include <cstring>

namespace {

int lowest_priority() {
    const char *name = getenv("TAVO_LOG");
    if (name != nullptr && strcmp(name, "verbose") == 0) return ANDROID_LOG_VERBOSE;
    if (name != nullptr && strcmp(name, "debug") == 0) return ANDROID_LOG_DEBUG;
    return ANDROID_LOG_ERROR;
}

char priority_letter(int prio) {
    constexpr char kLetters[] = "??VDIWEF";
    return prio >= ANDROID_LOG_VERBOSE && prio <= ANDROID_LOG_FATAL ? kLetters[prio] : '?';
}

}  // namespace

extern "C" int __android_log_print(int prio, const char *tag, const char *fmt, ...) {
    if (prio < lowest_priority()) return 0;

    char text[1024];  // longer messages are cut off, as on a device
    va_list args;
    va_start(args, fmt);
    vsnprintf(text, sizeof(text), fmt, args);
    va_end(args);

    // Drops the newlines at the end of a message so that each message is one line.
    size_t length = strlen(text);
    while (length > 0 && text[length - 1] == '\n') --length;
    fprintf(stderr, "%c/%s: %.*s\n", priority_letter(prio), tag, static_cast<int>(length), text);
    return 1;
}
