// replay RUNS DIR...: gives a fuzzer's function every file in DIRs, then RUNS inputs made of their
// pieces and of random bytes, the same ones each time. For compilers without libFuzzer, and for
// every test run. The input of a failure is left in fuzz_last_input.
#include <csignal>
#include <filesystem>
#include <fstream>
#include <iterator>
#include <random>

#include "fuzz/fuzz.h"

namespace {

using bytes = std::vector<uint8_t>;

std::mt19937 random_numbers(2024);

size_t below(size_t limit) {
    return limit == 0 ? 0 : random_numbers() % limit;
}

// A kept input with some bytes changed and random choices at its end, or random bytes alone.
bytes next_input(const std::vector<bytes> &kept) {
    bytes input = below(2) == 0 ? kept[below(kept.size())] : bytes(below(2000));
    const size_t changed = input.empty() || below(4) == 0 ? 0 : below(16);
    for (size_t i = 0; i < changed; ++i)
        input[below(input.size())] = static_cast<uint8_t>(random_numbers());
    const size_t tail = std::min(input.size(), 1 + below(64));
    const bool all =
        std::all_of(input.begin(), input.end(), [](uint8_t byte) { return byte == 0; });
    const auto from = all ? input.begin() : input.end() - static_cast<ptrdiff_t>(tail);
    std::generate(from, input.end(), [] { return static_cast<uint8_t>(random_numbers()); });
    return input;
}

bytes last;

void keep_last() {
    std::ofstream("fuzz_last_input", std::ios::binary)
        .write(reinterpret_cast<const char *>(last.data()),
               static_cast<std::streamsize>(last.size()));
}

void stop(int number) {
    keep_last();
    signal(number, SIG_DFL);
    raise(number);
}

void run(bytes input) {
    last = std::move(input);
    LLVMFuzzerTestOneInput(last.data(), last.size());
}

}  // namespace

extern "C" void __sanitizer_set_death_callback(void (*callback)()) __attribute__((weak));

int main(int argc, char **argv) {
    if (argc < 3) return 2;
    if (__sanitizer_set_death_callback != nullptr) __sanitizer_set_death_callback(keep_last);
    for (const int number : {SIGABRT, SIGSEGV}) signal(number, stop);
    std::vector<std::filesystem::path> paths;
    for (int i = 2; i < argc; ++i) {
        for (const auto &entry : std::filesystem::directory_iterator(argv[i]))
            paths.push_back(entry.path());
    }
    std::sort(paths.begin(), paths.end());
    std::vector<bytes> kept;
    for (const auto &path : paths) {
        std::ifstream in(path, std::ios::binary);
        kept.emplace_back(std::istreambuf_iterator<char>(in), std::istreambuf_iterator<char>());
        run(kept.back());
    }
    fuzz::must(!kept.empty(), "there are kept inputs");
    for (long i = 0; i < atol(argv[1]); ++i) run(next_input(kept));
    printf("%zu kept inputs, %s made ones\n", kept.size(), argv[1]);
    return 0;
}
