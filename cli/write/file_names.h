// File names are bytes. These functions convert them to text for people, JSON and URLs.
#ifndef TAVO_CLI_WRITE_FILE_NAMES_H
#define TAVO_CLI_WRITE_FILE_NAMES_H

#include <map>
#include <string>

// Returns one line of text. Control characters, line separators and marks of the writing direction
// become \n, \t or \xNN; a backslash is doubled; bytes that are not UTF-8 become \xNN.
std::string shown(const std::string &bytes);

// Returns JSON without line breaks, with the same characters as \uNNNN, which means the same to a
// program.
std::string json_text(const std::string &utf8);

// Returns valid UTF-8: each byte that is not part of a character becomes U+FFFD.
std::string as_utf8(const std::string &bytes);

// Returns the text with some characters replaced.
std::string replaced(const std::string &text, const std::map<char, const char *> &replacements);

// The same, with & < > and " as entities. In XML, characters that XML forbids also become U+FFFD.
std::string html_text(const std::string &bytes);
std::string xml_text(const std::string &bytes);

// Returns the text with every byte except A-Z a-z 0-9 - . _ ~ / as %NN.
std::string percent_encoded(const std::string &bytes);

std::string base_name(const std::string &path);

// Returns name without its extension.
std::string stem(const std::string &name);

// Returns the absolute path, with links resolved, as a URL.
std::string file_url(const std::string &path);

// Returns name and suffix as one file name. A name that is too long for a file system is cut and
// gets a number computed from the whole name.
std::string fitting_name(const std::string &name, const std::string &suffix);

#endif
