// Makes calls of the library and its codec library fail by plan, and counts what they obtain. The
// program is linked with --wrap for all of them: only the calls of our own objects are caught, on
// every thread.
#ifndef TAVO_TESTS_FAULTS_FAULT_PLAN_H
#define TAVO_TESTS_FAULTS_FAULT_PLAN_H

#include <cstdint>

namespace fault {

enum class call {
    none,
    allocation,  // malloc and its like, and what libavcodec, libavformat and libogg allocate for us
    thread,      // pthread_create
    mutex,       // pthread_mutex_init
    condition,   // pthread_cond_init
    open,
    dup,
    read,
    seek,
    close,        // closes and then fails
    click_track,  // fopen, fwrite, fclose
    count
};

struct plan {
    call what = call::none;
    int64_t place = 0;     // the call that fails, from 0, all threads counted together
    bool forever = false;  // and all later ones
    int error = 5;         // errno of a failed file call: EIO
};

// From now on by this plan; the counts of calls start anew.
void arm(const plan &next);
void disarm();
int64_t calls(call what);  // since arm
int64_t refusals();        // since arm

// What was obtained and not yet given back.
struct holdings {
    int64_t blocks;       // of memory, and the codec libraries' objects
    int64_t locks;        // mutexes and conditions
    int64_t descriptors;  // open files
};
holdings held();

// The seek that follows next is one whose landing point is not found in the decoded PCM.
void hide_landing(bool hide);
int64_t second_plans();  // since arm

// A job does not begin to decode before a thread was refused, so that it surely runs until then.
void hold_decoding(bool hold);

}  // namespace fault

#endif
