// Explains why a file cannot be analysed. tavo_init returns the same code for every such file, so
// the reason comes from the system or from tavo_probe.
//
// Input: the path that was passed to the library. Output: a sentence. Used by run/analyse.h.
#ifndef TAVO_CLI_INPUT_EXPLAIN_H
#define TAVO_CLI_INPUT_EXPLAIN_H

#include <cstdint>
#include <string>

#include "include/tavo.h"

// Returns the reason for `code`: what tavo_probe returned with `stream`, or TAVO_ERR_MEMORY.
std::string explain_refusal(const std::string &path, int32_t code, const TAVO_STREAM &stream);

// Returns the reason why an analysis received no audio, or (has_audio) only the beginning.
std::string explain_lost_audio(const std::string &path, bool has_audio);

#endif
