#include "tests/faults/trial.h"

#include <algorithm>
#include <cstdio>
#include <cstdlib>
#include <cstring>

namespace trial {

bool full() {
    const char *tier = getenv("TAVO_TRIALS");
    return tier != nullptr && strcmp(tier, "full") == 0;
}

std::vector<int64_t> places(int64_t count, int64_t quick) {
    const int64_t step = full() ? 1 : std::max<int64_t>(1, count / quick);
    std::vector<int64_t> chosen;
    for (int64_t place = 0; place < count; place += step) chosen.push_back(place);
    return chosen;
}

void figure(const char *set, const std::vector<std::pair<std::string, std::string>> &row) {
    std::string line = std::string("figure ") + set;
    for (const auto &[name, value] : row) line += " " + name + "=" + value;
    puts(line.c_str());
    fflush(stdout);
}

}  // namespace trial
