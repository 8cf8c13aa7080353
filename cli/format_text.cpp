#include "cli/format.h"
#include "cli/names.h"

namespace {

std::string highlight_line(const record &what) {
    std::string line = "  highlight  " + clock_text(what.hl_pos_ms);
    if (what.length_s > 0) line += " to " + clock_text(what.hl_pos_ms + 1000.0 * what.length_s);
    return line + "\n";
}

std::string beats_lines(const record &what) {
    std::string lines = "  tempo      " + std::to_string(what.bpm) + " BPM\n";
    lines += "  beats      " + std::to_string(what.beats_ms.size());
    if (!what.beats_ms.empty()) {
        lines += ", from " + clock_text(static_cast<double>(what.beats_ms.front())) + " to " +
                 clock_text(static_cast<double>(what.beats_ms.back()));
    }
    return lines + "\n";
}

}  // namespace

std::string text_record(const record &what) {
    if (what.status != outcome::ok) return "";  // the message on standard error says it
    std::string text = shown(what.file) + "\n  stream     " +
                       clock_text(static_cast<double>(what.duration_ms)) + ", " +
                       std::to_string(what.sample_rate) + " Hz, " + std::to_string(what.channels) +
                       (what.channels == 1 ? " channel\n" : " channels\n");
    if (what.has_highlight) text += highlight_line(what);
    if (what.has_beats) text += beats_lines(what);
    return text;
}
