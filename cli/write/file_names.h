// File names are bytes. These functions turn them into text for people, for JSON, XML and URLs.
#ifndef TAVO_CLI_WRITE_FILE_NAMES_H
#define TAVO_CLI_WRITE_FILE_NAMES_H

#include <string>

bool is_utf8(const std::string &bytes);

// One line, whatever the bytes: control characters, line separators and marks of the writing
// direction as \n, \t or \xNN, a backslash doubled, bytes that are not UTF-8 as \xNN.
std::string shown(const std::string &bytes);

// JSON without line breaks, with the same characters as \uNNNN: it means the same to a program.
std::string json_text(const std::string &utf8);

// Valid UTF-8: each byte that is not part of a character becomes U+FFFD.
std::string as_utf8(const std::string &bytes);

// The same with & < > and " as entities; in XML the characters that it forbids are U+FFFD too.
std::string html_text(const std::string &bytes);
std::string xml_text(const std::string &bytes);

// Every byte outside A-Z a-z 0-9 - . _ ~ / as %NN.
std::string percent_encoded(const std::string &bytes);

std::string base_name(const std::string &path);

// name without the ending after its last period.
std::string stem(const std::string &name);

// The absolute path with its links resolved, as a URL.
std::string file_url(const std::string &path);

// name and suffix as one file's name. One that would get too long for a file system ends in a
// number made from the whole name instead.
std::string fitting_name(const std::string &name, const std::string &suffix);

#endif
