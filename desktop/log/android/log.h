/* Android's log function for desktops. It writes the priority letter, the tag and the message to
 * standard error. By default it writes only errors (priority 6 and above); set the environment
 * variable TAVO_LOG to "verbose" or "debug" for more. On Android the platform's own header and
 * library are used instead. */
#pragma once

#ifdef __cplusplus
extern "C" {
#endif

enum {
    ANDROID_LOG_VERBOSE = 2,
    ANDROID_LOG_DEBUG = 3,
    ANDROID_LOG_INFO = 4,
    ANDROID_LOG_WARN = 5,
    ANDROID_LOG_ERROR = 6,
    ANDROID_LOG_FATAL = 7
};

/* Formats like printf. Returns 1 if the line was written, 0 if its priority is too low. */
__attribute__((format(printf, 3, 4))) int __android_log_print(int prio, const char *tag,
                                                              const char *fmt, ...);

#ifdef __cplusplus
}
#endif
