#include "cli/run/forecast.h"

#include <poll.h>

#include <algorithm>
#include <cctype>
#include <cmath>
#include <cstdio>
#include <map>
#include <nlohmann/json.hpp>
#include <random>

#include "cli/input/list_reader.h"
#include "cli/run/stop.h"
#include "cli/run/workers.h"
#include "cli/store/store.h"
#include "cli/write/file_names.h"
#include "cli/write/value_text.h"

namespace {

constexpr double kNormal95 = 1.96;  // standard deviations on each side of a 95 % interval
constexpr size_t kLongestExtension = 8;
constexpr double kSecondsPerHour = 3600.0;
constexpr double kHoursPerDay = 24.0;

// What is measured of a file, in the order in which it is printed.
enum measure { cpu_seconds, file_bytes, row_bytes, failures, measure_count };

// Files of one kind: the ending of their names and the power of two below their size.
struct stratum {
    int64_t files = 0;
    std::vector<std::string> reservoir;  // a random sample of them
    int64_t measured = 0;
    double sum[measure_count] = {};
    double squares[measure_count] = {};
};

struct catalogue {
    std::map<std::string, stratum> strata;
    std::mt19937_64 random{1};  // the same sample of the same list
    int64_t files = 0;
    int64_t missing = 0;  // listed files that are not there
};

std::string stratum_of(const std::string &path, int64_t size) {
    const std::string name = base_name(path);
    const size_t dot = name.rfind('.');
    std::string kind = dot == std::string::npos ? "" : name.substr(dot, kLongestExtension);
    for (char &c : kind) c = static_cast<char>(tolower(static_cast<unsigned char>(c)));
    return kind + " " + std::to_string(std::ilogb(static_cast<double>(size) + 1.0));
}

// Every file of a stratum is as likely as any other to be in its reservoir.
void add_file(catalogue &all, const std::string &path, size_t most) {
    file_state state;
    if (read_file_state(path, state) != 0) {
        ++all.missing;
        return;
    }
    stratum &kind = all.strata[stratum_of(path, state.size)];
    ++all.files;
    ++kind.files;
    if (kind.reservoir.size() < most) {
        kind.reservoir.push_back(path);
        return;
    }
    const auto place =
        static_cast<size_t>(std::uniform_int_distribution<int64_t>(0, kind.files - 1)(all.random));
    if (place < most) kind.reservoir[place] = path;
}

// Returns an empty string or a sentence.
std::string read_catalogue(const options &opts, catalogue &all) {
    list_reader list;
    failure failed = open_list(list, opts.forecast);
    if (failed) return failed.sentence;
    std::string name;
    while (!stop_requested()) {
        const list_state state = next_name(list, opts.list_separator, name, failed);
        if (state == list_state::name) add_file(all, name, static_cast<size_t>(opts.sample));
        if (state == list_state::ended || state == list_state::failed) break;
        if (state != list_state::waiting) continue;
        pollfd watched[2] = {{list.fd, POLLIN, 0}, {stop_fd(), POLLIN, 0}};
        poll(watched, 2, -1);
    }
    close_list(list);
    if (failed) return failed.sentence;
    return all.files > 0 ? "" : "The list names no files that are there.";
}

// Each stratum's share of the sample follows its share of the files; two files tell of its spread.
std::vector<std::string> choose(catalogue &all, int32_t sample) {
    std::vector<std::string> chosen;
    for (auto &[name, kind] : all.strata) {
        const double share = static_cast<double>(kind.files) / static_cast<double>(all.files);
        const auto wanted = static_cast<size_t>(std::max(2LL, std::llround(share * sample)));
        std::shuffle(kind.reservoir.begin(), kind.reservoir.end(), all.random);
        kind.reservoir.resize(std::min(wanted, kind.reservoir.size()));
        chosen.insert(chosen.end(), kind.reservoir.begin(), kind.reservoir.end());
    }
    return chosen;
}

void add_result(catalogue &all, const std::string &path, const reply &made) {
    file_state state;
    if (made.json.empty() || read_file_state(path, state) != 0) return;
    stratum &kind = all.strata[stratum_of(path, state.size)];
    const int64_t cpu_ms = nlohmann::json::parse(made.json).value("cpu_ms", int64_t{0});
    const double values[measure_count] = {
        static_cast<double>(cpu_ms) / 1000.0, static_cast<double>(state.size),
        static_cast<double>(made.json.size()), made.status == outcome::ok ? 0.0 : 1.0};
    ++kind.measured;
    for (int i = 0; i < measure_count; ++i) {
        kind.sum[i] += values[i];
        kind.squares[i] += values[i] * values[i];
    }
}

struct estimate {
    double mean;
    double half_width;  // of the 95 % interval
};

// The mean over all files, each stratum weighted by its files; strata that gave nothing are left
// out.
estimate estimate_of(const catalogue &all, int which) {
    double files = 0.0;
    for (const auto &[name, kind] : all.strata) {
        if (kind.measured > 0) files += static_cast<double>(kind.files);
    }
    estimate out = {0.0, 0.0};
    double variance = 0.0;
    for (const auto &[name, kind] : all.strata) {
        if (kind.measured == 0) continue;
        const auto n = static_cast<double>(kind.measured);
        const double weight = static_cast<double>(kind.files) / files;
        const double mean = kind.sum[which] / n;
        out.mean += weight * mean;
        if (n < 2.0) continue;
        const double spread = std::max(kind.squares[which] / n - mean * mean, 0.0) * n / (n - 1.0);
        variance += weight * weight * spread / n * (1.0 - n / static_cast<double>(kind.files));
    }
    out.half_width = kNormal95 * std::sqrt(std::max(variance, 0.0));
    return out;
}

void print_line(const char *name, const estimate &value, double scale, const char *unit) {
    printf("  %-24s %10.3f ± %.3f %s\n", name, value.mean * scale, value.half_width * scale, unit);
}

// Returns the exit status.
int print_forecast(const options &opts, const catalogue &all, size_t sampled) {
    const estimate cpu = estimate_of(all, cpu_seconds);
    const estimate size = estimate_of(all, file_bytes);
    const estimate stored = estimate_of(all, row_bytes);
    printf("%s: %s, %s analysed in %s\n", shown(opts.forecast).c_str(),
           count_text(static_cast<size_t>(all.files), "file").c_str(),
           std::to_string(sampled).c_str(), count_text(all.strata.size(), "kind").c_str());
    if (all.missing > 0) {
        printf("  %lld listed and not there\n", static_cast<long long>(all.missing));
    }
    printf("a file, with 95 %% intervals\n");
    print_line("processor", cpu, 1.0, "s");
    print_line("read", size, 1e-6, "MB");
    print_line("row in the store", stored, 1.0, "bytes");
    print_line("failures", estimate_of(all, failures), 100.0, "%");

    const auto files =
        static_cast<double>(opts.forecast_files > 0 ? opts.forecast_files : all.files);
    const double cpu_hours = cpu.mean * files / kSecondsPerHour;
    const double computing = cpu_hours / opts.cores;
    const double reading = size.mean * files / (1e6 * opts.bandwidth) / kSecondsPerHour;
    printf("all %.0f files\n", files);
    printf("  %-24s %10.3f core-days\n", "processor", cpu_hours / kHoursPerDay);
    printf("  %-24s %10.3f TB\n", "read", size.mean * files / 1e12);
    printf("  %-24s %10.3f GB\n", "rows in the store", stored.mean * files / 1e9);
    printf("  %-24s %10.3f h on %d cores, %.3f h to read at %d MB/s: %.3f h\n", "time", computing,
           opts.cores, reading, opts.bandwidth, std::max(computing, reading));
    return fflush(stdout) == 0 ? kExitOk : kExitFailed;
}

}  // namespace

int run_forecast(const options &opts) {
    catalogue all;
    const std::string error = read_catalogue(opts, all);
    if (!error.empty()) {
        fprintf(stderr, "tavo: %s\n", error.c_str());
        return kExitFailed;
    }
    options sample = opts;
    sample.inputs = choose(all, opts.sample);
    sample.format = result_format::none;
    sample.redo = true;
    const int status = run_workers(
        sample, [&](const std::string &path, const reply &made) { add_result(all, path, made); });
    if (stop_requested()) return status;
    // Files that fail are part of what a catalogue needs.
    return print_forecast(opts, all, sample.inputs.size());
}
