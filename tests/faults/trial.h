// Counted trials: what goes wrong is injected at every place in turn, and the counts are printed.
//
// A trial program runs in one of two tiers. The quick one, for every day, takes a sample of the
// places; the full one (environment TAVO_TRIALS=full) takes all of them. Either prints its counts
// as lines "figure SET name=value ...", one line a row; all rows of a set have the same names.
// Values have no spaces. scripts/reliability.py makes docs/RELIABILITY.md of the lines of the full
// tier.
#ifndef TAVO_TESTS_FAULTS_TRIAL_H
#define TAVO_TESTS_FAULTS_TRIAL_H

#include <cstdint>
#include <string>
#include <utility>
#include <vector>

namespace trial {

bool full();

// Of count places, those that this tier tries: every one in the full tier, about quick of them,
// spread evenly, in the quick one. Always some.
std::vector<int64_t> places(int64_t count, int64_t quick);

// One row of a set's figures.
void figure(const char *set, const std::vector<std::pair<std::string, std::string>> &row);

}  // namespace trial

#endif
