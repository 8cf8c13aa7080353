#include "cli/input/shard.h"

#include <charconv>
#include <cstdlib>

namespace {

bool read_number(const char *begin, const char *end, int64_t &number) {
    const auto [stop, error] = std::from_chars(begin, end, number);
    return error == std::errc() && stop == end;
}

bool read_environment(const char *name, int64_t &number) {
    const char *text = getenv(name);
    return text != nullptr &&
           read_number(text, text + std::char_traits<char>::length(text), number);
}

// Task numbers of a Slurm array begin anywhere and go in steps.
bool read_slurm(shard &out) {
    int64_t first = 0;
    int64_t step = 1;
    if (!read_environment("SLURM_ARRAY_TASK_ID", out.index)) return false;
    read_environment("SLURM_ARRAY_TASK_MIN", first);
    read_environment("SLURM_ARRAY_TASK_STEP", step);
    out.index = step > 0 ? (out.index - first) / step : -1;
    return read_environment("SLURM_ARRAY_TASK_COUNT", out.count);
}

bool read_engine(shard &out) {
    if (read_slurm(out)) return true;
    if (read_environment("AWS_BATCH_JOB_ARRAY_INDEX", out.index)) {
        if (read_environment("AWS_BATCH_JOB_ARRAY_SIZE", out.count)) return true;
    } else if (!read_environment("JOB_COMPLETION_INDEX", out.index)) {
        return false;
    }
    return read_environment("TAVO_SHARDS", out.count);
}

}  // namespace

failure read_shard(const std::string &words, shard &out) {
    if (words == "auto") {
        if (!read_engine(out)) {
            return {
                "--shard auto finds no array in the environment (Slurm, Kubernetes with "
                "TAVO_SHARDS, AWS Batch)."};
        }
    } else {
        const size_t slash = words.find('/');
        const char *text = words.data();
        if (slash == std::string::npos || !read_number(text, text + slash, out.index) ||
            !read_number(text + slash + 1, text + words.size(), out.count)) {
            return {"--shard takes I/N, as in 3/10, or auto."};
        }
        --out.index;
    }
    const bool inside = out.count >= 1 && out.index >= 0 && out.index < out.count;
    if (inside) return {};
    return {"--shard: the share must be from 1 to the number of shares."};
}

bool in_shard(const shard &of, const std::string &path) {
    uint64_t hash = 0xcbf29ce484222325;  // FNV-1a, 64 bits
    for (const char c : path) hash = (hash ^ static_cast<uint8_t>(c)) * 0x100000001b3;
    return static_cast<int64_t>(hash % static_cast<uint64_t>(of.count)) == of.index;
}
