// JSON as the command writes it: keys in the order they are set, numbers as the single-precision
// values that results are.
#ifndef TAVO_CLI_WRITE_JSON_H
#define TAVO_CLI_WRITE_JSON_H

#include <cstdint>
#include <nlohmann/json.hpp>
#include <string>
#include <vector>

using result_json = nlohmann::basic_json<nlohmann::ordered_map, std::vector, std::string, bool,
                                         int64_t, uint64_t, float>;

#endif
