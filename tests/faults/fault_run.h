// One job under a plan of failures, from its creation to its release, and the verdict on it.
#ifndef TAVO_TESTS_FAULTS_FAULT_RUN_H
#define TAVO_TESTS_FAULTS_FAULT_RUN_H

#include <string>
#include <utility>
#include <vector>

#include "tests/faults/fault_plan.h"
#include "tests/support/job_harness.h"

namespace fault {

struct subject {
    std::string path;
    int32_t mode;
    bool second_decoding = false;  // the landing point in mode 2 is not found
    bool analysed = true;          // or created and released only
};

// What a run came to.
struct outcome {
    bool created = false;
    int32_t created_code = 99;
    int32_t started = 99;       // what tavo_analyze answered
    int32_t started_again = 0;  // and once more, undisturbed, when that was a failure
    int32_t state = 0;          // behind the callback
    int32_t released = 0;
    double song_ms = 0;
    job::result result;
    int64_t calls = 0;     // of the plan's kind
    int64_t refusals = 0;  // of them
    int64_t early = 0;     // of these, before the analysis
    int64_t plans = 0;     // second ones
    holdings left = {};
};

outcome run(const subject &of, const plan &by);

// Columns of a row of figures.
struct tally {
    int64_t places = 0, runs = 0, ended = 0;
    int64_t refused = 0, failed = 0, differing = 0, complete = 0;  // the runs by their end
    int64_t leaked = 0, callbacks_wrong = 0, wrong = 0;            // must be 0

    std::vector<std::pair<std::string, std::string>> columns() const;
};

// A run, its verdict counted; what is wrong with it fails the test. equal: nothing may change the
// result.
outcome judged(const subject &of, const plan &by, const outcome &undisturbed, bool equal,
               tally *sum);

// The undisturbed run, then one for each place of this tier where a call of the kind can fail; in
// the full tier all of them, until three in a row meet none.
void at_every_place(const subject &of, plan by, bool equal, int64_t quick, tally *sum);

}  // namespace fault

#endif
