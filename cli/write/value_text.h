// Words and sentences that several parts of the command use.
#ifndef TAVO_CLI_WRITE_VALUE_TEXT_H
#define TAVO_CLI_WRITE_VALUE_TEXT_H

#include <cstdint>
#include <string>

#include "cli/run/record.h"

// Formats like printf into a string of at most 95 characters.
std::string formatted(const char *format, ...) __attribute__((format(printf, 1, 2)));

// Words of the interface: highlight, beats, both; ok, failed, stopped.
const char *mode_word(int32_t mode);
int32_t mode_of(const std::string &word);  // TAVO_MODE_*; the inverse of mode_word
const char *status_word(outcome status);

// Formats a time as m:ss.t, or as h:mm:ss.t if it is an hour or longer. whole_clock_text omits the
// tenths.
std::string clock_text(double ms);
std::string whole_clock_text(double ms);

// "1 file", "2 files".
std::string count_text(size_t count, const char *noun);

// "subject: reason.", with the system's text for an errno value.
std::string system_sentence(const std::string &subject, int code);

#endif
