/* The Android log's writing function for a desktop. It writes priority letter, tag and message
 * to standard error. By default it writes errors (priority 6) only; the environment variable
 * TAVO_LOG selects a lower priority ("verbose", "debug"). On Android the platform's own header
 * and library replace this. */
#ifndef TAVO_DESKTOP_LOG_ANDROID_LOG_H
#define TAVO_DESKTOP_LOG_ANDROID_LOG_H

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

/* printf-like. Returns 1 if the line was written, 0 if its priority is too low. */
__attribute__((format(printf, 3, 4))) int __android_log_print(int prio, const char *tag,
                                                              const char *fmt, ...);

#ifdef __cplusplus
}
#endif

#endif
