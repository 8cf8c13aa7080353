#include "cli/write/format.h"

#include "cli/write/file_names.h"
#include "cli/write/json.h"
#include "cli/write/value_text.h"

namespace {

// Mean square of -10 dBFS, full scale 1: the library refines louder passages.
constexpr double kRefinedPower = 0.1;

std::string beats_lines(const record &result) {
    std::string lines = "  tempo      " + tempo_text(result) + "\n";
    lines += "  beats      " + std::to_string(result.beats_ms.size());
    if (!result.beats_ms.empty()) {
        lines += ", from " + clock_text(static_cast<double>(result.beats_ms.front())) + " to " +
                 clock_text(static_cast<double>(result.beats_ms.back()));
    }
    return lines + "\n";
}

std::string text_record(const record &result) {
    if (result.status != outcome::ok) return "";  // standard error has the message
    std::string text = shown(result.file) + "\n  stream     " +
                       clock_text(static_cast<double>(result.duration_ms)) + ", " +
                       std::to_string(result.sample_rate) + " Hz, " +
                       count_text(static_cast<size_t>(result.channels), "channel") + "\n";
    if (result.has_highlight) {
        const bool is_quiet = result.loudest > 0.0 && result.loudest < kRefinedPower;
        const bool is_coarse = has_refinement(result) && !is_refined(result) && !result.raised;
        text += "  highlight  " + highlight_text(result);
        text += is_coarse && is_quiet ? " (--normalize refines)\n" : "\n";
    }
    if (result.has_beats) text += beats_lines(result);
    return text;
}

}  // namespace

std::string format_head(result_format format) {
    return format == result_format::csv ? csv_head() : "";
}

std::string format_record(const options &opts, const record &result) {
    std::string filled;
    switch (opts.format) {
        case result_format::text:
            return text_record(result);
        case result_format::json:
            return json_record(result);
        case result_format::csv:
            return csv_record(result);
        case result_format::print:
            if (result.status != outcome::ok) return "";
            // The template was checked with the options.
            return fill_template(opts.print, result, filled) ? "" : filled;
        case result_format::markers:  // name of the written file
            return result.written.empty() ? "" : shown(result.written) + "\n";
        default:
            return "";
    }
}
