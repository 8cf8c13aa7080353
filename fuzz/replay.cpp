// replay RUNS DIR...: runs the fuzzer on every file in each DIR, then on RUNS generated inputs,
// which are the same each time. After a failure, the file PROGRAM.last contains the failing input.
#include <fcntl.h>

#include <ctime>

#include "fuzz/fuzz.h"
#include "tests/support/bytes.h"

namespace {

using bytes = std::vector<uint8_t>;

std::mt19937 random_numbers(2024);

size_t below(size_t limit) {
    return limit == 0 ? 0 : random_numbers() % limit;
}

// Returns random bytes or a variation of a kept input. A variation may be truncated. Its last
// bytes, which determine the fuzzer's choices, are random, and a few other bytes are changed.
bytes next_input(const std::vector<bytes> &kept) {
    const auto random_byte = [] { return static_cast<uint8_t>(random_numbers()); };
    const bool random_only = below(2) == 0;
    bytes input = random_only ? bytes(below(2000)) : kept[below(kept.size())];
    if (below(8) == 0) input.resize(below(input.size() + 1));
    const size_t range = below(2) == 0 ? std::min<size_t>(input.size(), 256) : input.size();
    for (size_t i = range > 0 ? below(16) : 0; i > 0; --i) input[below(range)] = random_byte();
    const size_t tail = std::min(input.size(), random_only ? SIZE_MAX : 1 + below(64));
    std::generate(input.end() - static_cast<ptrdiff_t>(tail), input.end(), random_byte);
    return input;
}

void run(int last, const bytes &input) {
    fuzz::replace_contents(last, input);
    const clock_t start = clock();
    LLVMFuzzerTestOneInput(input.data(), input.size());
    fuzz::must(clock() - start <= RUN_SECONDS * CLOCKS_PER_SEC, "a run takes too long");
}

}  // namespace

int main(int argc, char **argv) {
    if (argc < 3) return 2;
    const int last = creat((std::string(argv[0]) + ".last").c_str(), 0644);
    std::vector<std::filesystem::path> paths;
    for (int i = 2; i < argc; ++i) {
        for (const auto &entry : std::filesystem::directory_iterator(argv[i]))
            paths.push_back(entry.path());
    }
    std::sort(paths.begin(), paths.end());
    std::vector<bytes> kept;
    for (const auto &path : paths) {
        const std::string contents = support::contents_of(path);
        kept.emplace_back(contents.begin(), contents.end());
        run(last, kept.back());
    }
    fuzz::must(!kept.empty(), "there are kept inputs");
    for (long i = 0; i < atol(argv[1]); ++i) run(last, next_input(kept));
    printf("%zu kept inputs, %s variations\n", kept.size(), argv[1]);
    return 0;
}
