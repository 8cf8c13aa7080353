// A part of the inputs, for schedulers that run one command many times: --shard.
#pragma once

#include <cstdint>
#include <optional>
#include <string>
#include <string_view>

#include "cli/failure.h"

struct shard {
    int64_t index = 0;  // 0 to count - 1
    int64_t count = 1;
};

// Parses a whole number. Returns nothing if the text contains anything else.
std::optional<int64_t> read_number(std::string_view text);

// Parses "I/N", with I from 1 to N, or "auto", which reads the environment of a Slurm array
// (SLURM_ARRAY_TASK_*), a Kubernetes indexed job (JOB_COMPLETION_INDEX) or an AWS Batch array
// (AWS_BATCH_JOB_ARRAY_*). If the scheduler does not state N, TAVO_SHARDS must.
failure read_shard(const std::string &words, shard &out);

// True if the file belongs to the part. A hash of the path's bytes decides, so every machine gets
// the same answer.
bool in_shard(const shard &of, const std::string &path);
