/* analyze_file FILE [SECONDS]: prints the format of a song, the start of its highlight, and the
 * tempo and the beats from there on. Times are in milliseconds. SECONDS is the requested
 * length of the highlight, 30 by default.
 *
 * cc analyze_file.c -o analyze_file $(pkg-config --cflags --libs tavo)
 */
#include <pthread.h>
#include <stdio.h>
#include <stdlib.h>
#include <tavo.h>

/* Passes the result from the library's thread to the main thread. */
struct result {
    pthread_mutex_t lock;
    pthread_cond_t changed;
    TAVO_INFO *info; /* null until the job has ended; valid until tavo_deinit */
};

/* Runs on a thread of the library, where tavo_deinit is not allowed. */
static void on_result(TAVO_INFO *info, void *user) {
    struct result *result = user;
    pthread_mutex_lock(&result->lock);
    result->info = info;
    pthread_cond_signal(&result->changed);
    pthread_mutex_unlock(&result->lock);
}

static const TAVO_INFO *wait_for_result(struct result *result) {
    pthread_mutex_lock(&result->lock);
    while (result->info == NULL) pthread_cond_wait(&result->changed, &result->lock);
    pthread_mutex_unlock(&result->lock);
    return result->info;
}

/* tavo_init returns the same code for every unusable file; tavo_probe returns the reason. */
static int print_reason(const char *path) {
    int32_t code = tavo_probe(path, NULL);
    if (code == TAVO_OK) code = TAVO_ERR_MEMORY;
    fprintf(stderr, "analyze_file: %s: %s (%d)\n", path, tavo_error_text(code), (int)code);
    return EXIT_FAILURE;
}

static int print_result(const TAVO_CTX *tavo, const TAVO_INFO *info) {
    int32_t rate = 0;
    int32_t channels = 0;
    int64_t duration_ms = 0;
    tavo_get_stream(tavo, &rate, &channels, &duration_ms);
    printf("stream %d Hz, channels %d, %lld ms\n", (int)rate, (int)channels,
           (long long)duration_ms);
    if (!tavo_is_complete(tavo)) {
        fputs("analyze_file: the file could not be read to its end\n", stderr);
        return EXIT_FAILURE;
    }
    if (info->status != 0) {
        fputs(tavo_has_audio(tavo) ? "analyze_file: no beats were found\n"
                                   : "analyze_file: no audio could be decoded\n",
              stderr);
        return EXIT_FAILURE;
    }
    printf("highlight %d\ntempo %d\n", (int)info->hl_pos, (int)tavo_get_tempo(tavo));
    for (int32_t i = 0; i < info->beat_count; ++i) printf("beat %.3f\n", info->beat_times[i]);
    return fflush(stdout) == 0 ? EXIT_SUCCESS : EXIT_FAILURE;
}

int main(int argc, char **argv) {
    if (argc < 2 || argc > 3) {
        fputs("usage: analyze_file FILE [SECONDS]\n", stderr);
        return 2;
    }
    const int32_t seconds = argc > 2 ? (int32_t)strtol(argv[2], NULL, 10) : 30;

    fnamedec = ""; /* write no click track: the default path is in the working directory */
    const TAVO_PARAM param = {argv[1], TAVO_MODE_BOTH};
    int32_t err = TAVO_OK;
    TAVO_CTX *tavo = tavo_init(&param, &err);
    if (tavo == NULL) return print_reason(argv[1]);
    struct result result = {PTHREAD_MUTEX_INITIALIZER, PTHREAD_COND_INITIALIZER, NULL};
    tavo_set_listener(tavo, on_result, &result);
    int status = EXIT_FAILURE;
    err = tavo_analyze(tavo, seconds, 0, 0);
    if (err == TAVO_OK) {
        status = print_result(tavo, wait_for_result(&result));
    } else { /* no callback will come */
        fprintf(stderr, "analyze_file: the analysis could not be started: %s\n",
                tavo_error_text(err));
    }
    tavo_deinit(tavo); /* releases the result as well */
    return status;
}
