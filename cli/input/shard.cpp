#include "cli/input/shard.h"

#include <algorithm>
#include <charconv>
#include <cstdlib>

namespace {

using number = std::optional<int64_t>;

number read_environment(const char *name) {
    const char *text = getenv(name);
    return text == nullptr ? std::nullopt : read_number(text);
}

void read_engine(number &index, number &count) {
    if ((index = read_environment("SLURM_ARRAY_TASK_ID"))) {
        // The task numbers of a Slurm array may start at any number and have any step.
        const int64_t first = read_environment("SLURM_ARRAY_TASK_MIN").value_or(0);
        const int64_t step = read_environment("SLURM_ARRAY_TASK_STEP").value_or(1);
        index = step > 0 ? (*index - first) / step : -1;
        count = read_environment("SLURM_ARRAY_TASK_COUNT");
    } else if ((index = read_environment("AWS_BATCH_JOB_ARRAY_INDEX"))) {
        count = read_environment("AWS_BATCH_JOB_ARRAY_SIZE");
    } else {
        index = read_environment("JOB_COMPLETION_INDEX");
    }
    if (!count) count = read_environment("TAVO_SHARDS");
}

}  // namespace

number read_number(std::string_view text) {
    int64_t value = 0;
    const char *end = text.data() + text.size();
    const auto [stop, error] = std::from_chars(text.data(), end, value);
    return error == std::errc() && stop == end ? number(value) : std::nullopt;
}

failure read_shard(const std::string &words, shard &out) {
    number index;
    number count;
    if (words == "auto") {
        read_engine(index, count);
        if (!index || !count) {
            return {
                "--shard auto finds no array in the environment (Slurm, Kubernetes with "
                "TAVO_SHARDS, AWS Batch)."};
        }
    } else {
        const size_t slash = std::min(words.find('/'), words.size());
        index = read_number(words.substr(0, slash));
        if (slash < words.size()) count = read_number(words.substr(slash + 1));
        if (!index || !count) return {"--shard takes I/N, as in 3/10, or auto."};
        --*index;
    }
    out = {*index, *count};
    if (out.index >= 0 && out.index < out.count) return {};
    return {"--shard: the share must be from 1 to the number of shares."};
}

bool in_shard(const shard &of, const std::string &path) {
    uint64_t hash = 0xcbf29ce484222325;  // FNV-1a, 64 bits
    for (const char c : path) hash = (hash ^ static_cast<uint8_t>(c)) * 0x100000001b3;
    return static_cast<int64_t>(hash % static_cast<uint64_t>(of.count)) == of.index;
}
