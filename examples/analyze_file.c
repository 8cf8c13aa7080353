/* analyze_file FILE [SECONDS]: prints where the highlight of a song starts and where its beats from
 * there on are, in milliseconds. SECONDS is the length of the highlight wanted, 30 unless given.
 *
 * cc analyze_file.c -o analyze_file $(pkg-config --cflags --libs tavo) -pthread
 */
#include <pthread.h>
#include <stdio.h>
#include <stdlib.h>
#include <tavo.h>

/* What the library's thread tells the main thread. The library passes no pointer of ours, so that
 * there is one for the process, as there is one analysis. */
static struct {
    pthread_mutex_t lock;
    pthread_cond_t changed;
    TAVO_INFO *info; /* null until the result is there; the library's until tavo_deinit */
} result = {PTHREAD_MUTEX_INITIALIZER, PTHREAD_COND_INITIALIZER, NULL};

/* On a thread of the library's own. tavo_deinit is not for here. */
static void on_result(TAVO_INFO *info) {
    pthread_mutex_lock(&result.lock);
    result.info = info;
    pthread_cond_signal(&result.changed);
    pthread_mutex_unlock(&result.lock);
}

static const TAVO_INFO *wait_for_result(void) {
    pthread_mutex_lock(&result.lock);
    while (result.info == NULL) pthread_cond_wait(&result.changed, &result.lock);
    pthread_mutex_unlock(&result.lock);
    return result.info;
}

static int print_result(const TAVO_INFO *info) {
    if (info->status != 0) {
        fputs("analyze_file: the analysis failed\n", stderr);
        return EXIT_FAILURE;
    }
    printf("highlight %d\n", (int)info->hl_pos);
    for (int32_t i = 0; i < info->beat_count; ++i) printf("beat %.3f\n", info->beat_times[i]);
    return fflush(stdout) == 0 ? EXIT_SUCCESS : EXIT_FAILURE;
}

int main(int argc, char **argv) {
    if (argc < 2 || argc > 3) {
        fputs("usage: analyze_file FILE [SECONDS]\n", stderr);
        return 2;
    }
    const int32_t seconds = argc > 2 ? (int32_t)strtol(argv[2], NULL, 10) : 30;

    fnamedec = ""; /* no click track: it would be written into the working directory */
    const TAVO_PARAM param = {argv[1], TAVO_MODE_BOTH};
    int32_t err = TAVO_OK;
    TAVO_CTX *tavo = tavo_init(&param, &err);
    if (tavo == NULL) {
        fprintf(stderr, "analyze_file: %s cannot be analysed (%d)\n", argv[1], (int)err);
        return EXIT_FAILURE;
    }
    tavo_setcallback(tavo, on_result);
    int status = EXIT_FAILURE;
    err = tavo_analyze(tavo, seconds, 0, 0);
    if (err == TAVO_OK) {
        status = print_result(wait_for_result());
    } else { /* no callback will come */
        fprintf(stderr, "analyze_file: the analysis could not be started (%d)\n", (int)err);
    }
    tavo_deinit(tavo); /* the result ends here */
    return status;
}
