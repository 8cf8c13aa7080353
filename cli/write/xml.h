// XML as text, for markers_fcpxml.cpp.
#ifndef TAVO_CLI_WRITE_XML_H
#define TAVO_CLI_WRITE_XML_H

#include <string>
#include <utility>
#include <vector>

typedef std::vector<std::pair<const char *, std::string>> attributes;  // values already escaped

// Escapes an attribute's value. Characters that XML forbids and bytes that are not UTF-8 become
// U+FFFD.
std::string xml_attribute(const std::string &bytes);

// A start tag without its closing bracket.
std::string opened(const char *name, const attributes &values);

// An element without content, and a newline.
std::string element(const char *name, const attributes &values);

#endif
