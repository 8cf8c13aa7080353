// Elements of SVG as text, for plot_svg.cpp. Attributes alone: every viewer shows the same,
// whatever it makes of the style sheet for dark grounds that plot_svg.cpp adds.
#ifndef TAVO_CLI_REPORT_SVG_H
#define TAVO_CLI_REPORT_SVG_H

#include <string>
#include <utility>
#include <vector>

typedef std::vector<std::pair<const char *, std::string>> attributes;  // values are escaped already

// With a point, whatever the locale of the user.
std::string decimal(double value, int digits);
std::string point(double x, double y);

// Escapes the text of an element. Characters that XML forbids and bytes that are not UTF-8 become
// U+FFFD.
std::string xml(const std::string &bytes);
std::string xml_attribute(const std::string &bytes);

// The start of an element, up to before its closing bracket; a whole one without content.
std::string opened(const char *name, const attributes &with);
std::string element(const char *name, const attributes &with);

// anchor: start, middle or end. content: from xml().
std::string text_at(double x, double y, const char *anchor, const std::string &content);

// A path that is not filled.
std::string stroke(const char *id, const char *colour, double width, const std::string &path);

// dashes: lengths on and off, "none" for a solid line.
attributes line(double x1, double y1, double x2, double y2, const char *colour, double width,
                const char *dashes);

// A line element with an id.
std::string named_line(const char *id, attributes with);

#endif
