#include "cli/write/format.h"

#include "cli/write/file_names.h"

std::string format_head(result_format format) {
    return format == result_format::csv ? csv_head() : "";
}

std::string format_record(result_format format, const record &result) {
    switch (format) {
        case result_format::none:
            return "";
        case result_format::text:
            return text_record(result);
        case result_format::json:
            return json_record(result);
        case result_format::csv:
            return csv_record(result);
        default:  // marker files: the name of the file written
            return result.written.empty() ? "" : shown(result.written) + "\n";
    }
}
