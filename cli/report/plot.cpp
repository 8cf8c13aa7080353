#include "cli/report/plot.h"

#include <sys/stat.h>

#include "cli/write/file_names.h"
#include "cli/write/output_file.h"

std::string check_plot(const std::string &target, const std::string &input, bool force) {
    if (same_file(target, input)) return "The picture would replace the file that is analysed.";
    struct stat info {};
    if (lstat(target.c_str(), &info) == 0 && !S_ISREG(info.st_mode) && !S_ISDIR(info.st_mode)) {
        return "The picture " + shown(target) + " cannot be written: it is no regular file.";
    }
    return check_target(target, force);
}

void draw_plot(record &result, const options &opts, int stop_fd) {
    plot_data data;
    std::string error;
    const outcome read = gather_plot(result, kPlotColumns, stop_fd, data, error);
    if (read == outcome::ok) error = write_file(opts.plot, plot_svg(result, data), opts.force);
    if (error.empty()) return;
    result = failed_record(result.file, result.mode, error);
    if (read == outcome::stopped) result.status = outcome::stopped;
}
