#include "cli/format.h"
#include "cli/names.h"
#include "cli/words.h"

namespace {

std::string highlight_line(const record &result) {
    std::string line = "  highlight  " + clock_text(result.hl_pos_ms);
    if (result.length_s > 0) {
        line += " to " + clock_text(result.hl_pos_ms + 1000.0 * result.length_s);
    }
    return line + "\n";
}

std::string beats_lines(const record &result) {
    std::string lines = "  tempo      " + std::to_string(result.bpm) + " BPM\n";
    lines += "  beats      " + std::to_string(result.beats_ms.size());
    if (!result.beats_ms.empty()) {
        lines += ", from " + clock_text(static_cast<double>(result.beats_ms.front())) + " to " +
                 clock_text(static_cast<double>(result.beats_ms.back()));
    }
    return lines + "\n";
}

}  // namespace

std::string text_record(const record &result) {
    if (result.status != outcome::ok) return "";  // the message on standard error says it
    std::string text = shown(result.file) + "\n  stream     " +
                       clock_text(static_cast<double>(result.duration_ms)) + ", " +
                       std::to_string(result.sample_rate) + " Hz, " +
                       std::to_string(result.channels) +
                       (result.channels == 1 ? " channel\n" : " channels\n");
    if (result.has_highlight) text += highlight_line(result);
    if (result.has_beats) text += beats_lines(result);
    return text;
}
