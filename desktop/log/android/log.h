/* The Android log's writing function, for a desktop: lines go to standard error with priority
 * letter and tag, from priority 6 (error) up unless the environment variable TAVO_LOG names a lower
 * one ("verbose", "debug"). On Android the platform's own header and library replace these.
 */
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

/* printf-like. Returns 1 when the line was written, 0 when its priority is below the limit. */
__attribute__((format(printf, 3, 4))) int __android_log_print(int prio, const char *tag,
                                                              const char *fmt, ...);

#ifdef __cplusplus
}
#endif

#endif
