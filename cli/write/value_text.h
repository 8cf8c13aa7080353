// Converts names, which may contain any bytes, and other values to text for people, JSON, XML and
// URLs.
#pragma once

#include <cstdint>
#include <map>
#include <string>

// Formats like printf.
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

// Returns one line of text. Control characters, line separators and bidirectional marks become \n,
// \t or \xNN; a backslash is doubled; bytes that are not UTF-8 become \xNN.
std::string shown(const std::string &bytes);

// Returns JSON text on one line: control characters, line separators and bidirectional marks become
// \uNNNN. The meaning of the JSON stays the same.
std::string json_text(const std::string &utf8);

// Returns valid UTF-8: each byte that is not part of a character becomes U+FFFD.
std::string as_utf8(const std::string &bytes);

// Replaces each character that has a replacement.
std::string replaced(const std::string &text, const std::map<char, const char *> &replacements);

// Returns valid UTF-8 with entities for the characters & < > and ", and with U+FFFD in place of
// characters that XML forbids.
std::string xml_text(const std::string &bytes);

// Encodes every byte except A-Z a-z 0-9 - . _ ~ / as %NN.
std::string percent_encoded(const std::string &bytes);

// Returns a path without its folders.
std::string base_name(const std::string &path);

// Returns a name without its extension.
std::string stem(const std::string &name);

// Returns the absolute path, with links resolved, as a URL.
std::string file_url(const std::string &path);

// Returns the name followed by the suffix. If the result is too long for a file system, the name is
// cut, and a hash of the whole name is put before the suffix.
std::string fitting_name(const std::string &name, const std::string &suffix);
