#include "cli/write/click.h"

#include <filesystem>

#include "cli/input/recognise.h"
#include "cli/write/value_text.h"
#include "include/tavo.h"

namespace {

// The library ignores write errors, so only the length shows that the disk was full.
bool is_whole_track(const std::string &path) {
    int code = 0;
    const std::string size = read_bytes(path, 40, 4, code);  // of the samples, little-endian
    std::error_code failed;
    return std::filesystem::file_size(path, failed) ==
           44 + big_endian(std::string(size.rbegin(), size.rend()), 0, 4);
}

}  // namespace

failure begin_click(output_file &track, const options &opts, const std::string &input) {
    fnamedec = "";
    if (opts.click.empty()) return {};
    if (same_file(opts.click, input)) {
        return {"The click track would replace the file that is analysed."};
    }
    failure failed = check_target(opts.click, opts.force);
    if (!failed) failed = begin_output(track, opts.click);
    if (!failed) fnamedec = track.temporary.c_str();
    return failed;
}

failure finish_click(output_file &track, const options &opts, bool is_analysed) {
    fnamedec = "";
    if (track.temporary.empty()) return {};
    if (is_analysed && is_whole_track(track.temporary)) return commit_output(track, opts.force);
    abandon_output(track);
    if (!is_analysed) return {};
    return {"The click track " + shown(opts.click) +
            " could not be written whole; the disk may be full."};
}
