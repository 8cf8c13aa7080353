#include "cli/write/format.h"

#include "cli/write/file_names.h"

std::string format_head(result_format format) {
    return format == result_format::csv ? csv_head() : "";
}

std::string format_record(const options &opts, const record &result) {
    std::string filled;
    switch (opts.format) {
        case result_format::none:
            return "";
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
        default:  // marker files: the name of the file written
            return result.written.empty() ? "" : shown(result.written) + "\n";
    }
}
