// Texts that several parts of the command use: mode names, times, counts and errors.
#ifndef TAVO_CLI_WRITE_VALUE_TEXT_H
#define TAVO_CLI_WRITE_VALUE_TEXT_H

#include <cstdint>
#include <string>

// Formats like printf and returns at most 95 characters.
std::string formatted(const char *format, ...) __attribute__((format(printf, 1, 2)));

// Convert between a TAVO_MODE_* and its word: highlight, beats or both.
const char *mode_word(int32_t mode);
int32_t mode_of(const std::string &word);

// Format a time as m:ss.t, or as h:mm:ss.t if it is an hour or longer. whole_clock_text omits the
// tenths.
std::string clock_text(double ms);
std::string whole_clock_text(double ms);

// Returns "1 file", "2 files".
std::string count_text(size_t count, const char *noun);

// Returns "subject: reason." with the system's text for an errno value as the reason.
std::string system_sentence(const std::string &subject, int code);

#endif
