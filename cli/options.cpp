#include "cli/options.h"

#include <sys/stat.h>

#include <CLI/CLI.hpp>
#include <cstdio>

#include "core/tavo.h"

namespace {

constexpr int32_t kMostJobs = 256;
constexpr int32_t kMostSeconds = 86'400;  // a day: beyond any song, far below what overflows
constexpr int32_t kMostBeats = 1'000'000'000;

constexpr const char *kAbout =
    "Finds the highlight of songs (where the strongest loud passage starts), their tempo and\n"
    "their beats.";

constexpr const char *kFooter =
    "A folder stands for the audio files in it, told by their content. A list names files or\n"
    "folders, one a line; '-' as FILE is a list on standard input, read to its end first.\n"
    "Results go to standard output in the order of the inputs, messages to standard error.\n"
    "\n"
    "Exit status: 0 all done; 1 a file failed; 2 wrong usage; 130 stopped with Ctrl-C.\n"
    "\n"
    "Examples:\n"
    "  tavo song.wav                               a summary for people\n"
    "  tavo --format json --recursive -j 2 Music   one JSON object a line for each file\n"
    "  find . -name '*.flac' -print0 | tavo -0 --format csv -\n"
    "  tavo --format labels --length 30 song.wav   song.wav.labels.txt, for Audacity\n";

int wrong_usage(const std::string &why) {
    fprintf(stderr, "tavo: %s\nTry 'tavo --help'.\n", why.c_str());
    return kExitUsage;
}

// What the parser holds as words until they are known to be right.
struct words {
    std::string mode = "both";
    std::string format = "text";
    bool null_separated = false;
};

// The parser takes a value in square brackets apart at its commas, which a file name must survive:
// such an argument travels behind a byte that takes its bracket off the first place.
constexpr char kShield = '\x01';

std::vector<std::string> shielded(int argc, char **argv) {
    std::vector<std::string> out;
    for (int i = argc - 1; i > 0; --i) {  // the parser wants them last to first
        std::string argument = argv[i];
        if (argument.size() > 1 && argument.front() == '[') argument.insert(0, 1, kShield);
        out.push_back(argument);
    }
    return out;
}

void unshield(std::string &argument) {
    if (argument.size() > 1 && argument[0] == kShield && argument[1] == '[') argument.erase(0, 1);
}

void declare_analysis(CLI::App &app, options &out, words &read) {
    app.add_option(
           "-m,--mode", read.mode,
           "highlight, beats, or both (default):\nthe highlight, then the beats from there on")
        ->check(CLI::IsMember({"highlight", "beats", "both"}).description(""))
        ->type_name("MODE");
    app.add_option("-l,--length", out.length_s,
                   "Length of the highlight wanted: its start is placed\nso that a passage of this "
                   "length ends well")
        ->check(CLI::Range(0, kMostSeconds).description(""))
        ->type_name("SECONDS");
    app.add_option("--max-beats", out.max_beats, "Most beats that the threshold selects")
        ->check(CLI::Range(0, kMostBeats).description(""))
        ->type_name("N");
    app.add_option("-j,--jobs", out.jobs,
                   "Files analysed at once, each in a process of its own;\n1 unless told otherwise")
        ->check(CLI::Range(1, kMostJobs).description(""))
        ->type_name("N");
}

void declare_output(CLI::App &app, options &out, words &read) {
    app.add_option("-f,--format", read.format,
                   "text (default) for people, json: one object a line,\ncsv: one row a file, "
                   "labels: a label track for Audacity,\nFILE.labels.txt; it marks 30 s of "
                   "highlight without --length")
        ->check(CLI::IsMember({"text", "json", "csv", "labels"}).description(""))
        ->type_name("FORMAT");
    app.add_option("-o,--output-dir", out.output_dir,
                   "Folder for the label tracks, else beside each file")
        ->type_name("DIR");
    app.add_flag("--force", out.force,
                 "Overwrite label tracks, click tracks and pictures\nthat exist");
    app.add_option("--click", out.click,
                   "Write the sound with a click on every beat, a WAV file;\none input only")
        ->type_name("WAV");
    app.add_option("--plot", out.plot,
                   "Draw the result, an SVG file: waveform, loudness,\nhighlight and beats; one "
                   "input only")
        ->type_name("SVG");
    app.add_flag("-q,--quiet", out.quiet, "No progress bar and no notes");
}

void declare_inputs(CLI::App &app, options &out, words &read) {
    app.add_option("FILE", out.inputs, "Audio files, folders, or '-': a list on standard input")
        ->type_name("");
    app.add_flag("-r,--recursive", out.recursive, "Search folders in folders too");
    app.add_option("--files-from", out.lists, "A list of files; '-' is standard input")
        ->allow_extra_args(false)
        ->type_name("LIST");
    app.add_flag("-0,--null", read.null_separated, "Names in lists end with a NUL, not a newline");
}

bool is_folder(const std::string &path) {
    struct stat info {};
    return stat(path.c_str(), &info) == 0 && S_ISDIR(info.st_mode);
}

void set_values(const words &read, options &out) {
    out.mode = read.mode == "highlight" ? TAVO_MODE_HIGHLIGHT
               : read.mode == "beats"   ? TAVO_MODE_BEATS
                                        : TAVO_MODE_BOTH;
    out.format = read.format == "json"     ? result_format::json
                 : read.format == "csv"    ? result_format::csv
                 : read.format == "labels" ? result_format::labels
                                           : result_format::text;
    unshield(out.click);
    unshield(out.plot);
    unshield(out.output_dir);
    for (std::string &input : out.inputs) unshield(input);
    for (std::string &list : out.lists) unshield(list);
    if (read.null_separated) out.list_separator = '\0';
}

// What no single option can say about itself. Empty when all is well.
std::string contradiction(const options &out, bool null_separated) {
    bool list_on_stdin = false;
    for (const std::string &input : out.inputs) list_on_stdin = list_on_stdin || input == "-";
    if (out.inputs.empty() && out.lists.empty()) {
        return "name at least one audio file, a folder, or '-' for a list on standard input.";
    }
    if (null_separated && !list_on_stdin && out.lists.empty()) {
        return "-0 is about lists of files: give '-' or --files-from.";
    }
    if (!out.output_dir.empty() && out.format != result_format::labels) {
        return "--output-dir goes with --format labels.";
    }
    if (!out.output_dir.empty() && !is_folder(out.output_dir)) {
        return out.output_dir + ": is not a folder.";
    }
    if (!out.click.empty() && out.mode == TAVO_MODE_HIGHLIGHT) {
        return "--click needs beats: --mode beats or both.";
    }
    if (!out.click.empty() && out.click == out.plot) return "--click and --plot name one file.";
    const bool single = !out.click.empty() || !out.plot.empty();
    if (single && (out.inputs.size() != 1 || list_on_stdin || !out.lists.empty() ||
                   is_folder(out.inputs[0]))) {
        return std::string(out.click.empty() ? "--plot" : "--click") +
               " takes exactly one audio file.";
    }
    return "";
}

}  // namespace

std::optional<int> parse_options(int argc, char **argv, options &out) {
    CLI::App app(kAbout, "tavo");
    app.footer(kFooter);
    app.get_formatter()->column_width(28);
    app.set_version_flag("--version", std::string("tavo ") + TAVO_VERSION);
    words read;
    declare_inputs(app, out, read);
    declare_analysis(app, out, read);
    declare_output(app, out, read);
    try {
        app.parse(shielded(argc, argv));
    } catch (const CLI::Success &done) {
        return app.exit(done) == 0 ? kExitOk : kExitUsage;
    } catch (const CLI::ParseError &wrong) {
        return wrong_usage(wrong.what());
    }
    set_values(read, out);
    const std::string why = contradiction(out, read.null_separated);
    if (!why.empty()) return wrong_usage(why);
    return std::nullopt;
}
