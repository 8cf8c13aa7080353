#include "cli/options.h"

#include <CLI/CLI.hpp>
#include <algorithm>
#include <cstdio>
#include <filesystem>
#include <iostream>
#include <regex>
#include <utility>

#include "cli/input/ffmpeg.h"
#include "cli/write/format.h"
#include "cli/write/markers.h"
#include "cli/write/value_text.h"

namespace {

constexpr int32_t kMostJobs = 256;
constexpr int32_t kMostSeconds = 86'400;  // one day: longer than any song, far below an overflow
constexpr int32_t kMostMinutes = 1'000'000;
constexpr int32_t kMostBeats = 1'000'000'000;

constexpr size_t kOptionColumns = 28;  // width of the names in --help
constexpr size_t kTextColumns = 80 - kOptionColumns;

// ---- The texts of -h and --help, except the option descriptions.

constexpr const char *kUsage = "Usage: tavo [OPTION]... FILE...\n";
constexpr const char *kAbout =
    "Finds the highlight of songs (where the strongest sustained loud passage\n"
    "starts), their tempo and their beats.";

constexpr const char *kFooter =
    "A folder is searched for audio files, which are recognised by content, not by\n"
    "name. A list has one name per line (M3U playlists are accepted) and is read as\n"
    "it arrives. Results go to standard output in the order of the inputs, messages\n"
    "to standard error.\n\n"
    "The start of a highlight is accurate to 0.4 s if the loud passage is louder than\n"
    "about -13 dBFS RMS. Otherwise it is a point on a 2 s grid, usually 2 to 6 s\n"
    "early, and the text says \"about\"; --normalize refines it. In mode both the\n"
    "tempo is that of the music from the highlight on.\n\n"
    "Exit status: 0 success; 1 a file failed; 2 wrong usage; 130 stopped with\n"
    "Ctrl-C; 141 the reader of the results has closed them.\n";

constexpr const char *kExamples =
    "Examples:\n"
    "  tavo song.mp3                       a summary as text\n"
    "  tavo -f labels -l 30 song.mp3       song.mp3.labels.txt, for Audacity\n"
    "  tavo -f json -r -j 2 Music          one JSON object per line and file\n"
    "  tavo --report song.html song.mp3    a page that shows and plays the song\n"
    "  find . -name '*.flac' -print0 | tavo -0 -f csv -\n";

// Printed by -h. A test compares it with the options.
constexpr const char *kOptionNames =
    "Options, which --help explains:\n"
    "  Input      FILE, -r --recursive, --files-from LIST, -0 --null\n"
    "  Analysis   -m --mode MODE, -l --length SECONDS, --max-beats N, --max-minutes N,\n"
    "             -j --jobs N, --timeout SECONDS, --normalize, --no-ffmpeg\n"
    "  Output     -f --format FORMAT, --print TEXT, -o --output-dir DIR, --fps RATE,\n"
    "             --force, --skip-existing, --click WAV, --clip FILE|DIR,\n"
    "             --fade SECONDS, -q --quiet\n"
    "  Page       --report HTML, --embed\n"
    "  Catalogue  --store URL, --retry-failed, --redo, --from-store, --failed,\n"
    "             --patience SECONDS, --shard I/N\n"
    "  Others     -h, --help, --version\n";

// ---- The declarations of the options.

// Words of --format, in the order of result_format.
const std::vector<std::string> kFormats = {"text", "json", "csv"};

std::vector<std::string> format_words() {
    std::vector<std::string> words = kFormats;
    for (const auto &entry : kMarkerFormats) words.push_back(entry.first);
    return words;
}

void set_format(const std::string &word, options &out) {
    const auto entry = std::find(kFormats.begin(), kFormats.end(), word);
    out.format = static_cast<result_format>(entry - kFormats.begin());
    if (out.format == result_format::markers) out.markers = &kMarkerFormats.at(word);
}

// Wraps the text at spaces.
std::string wrapped(const std::string &text) {
    static const std::regex line("(.{1," + std::to_string(kTextColumns) + "})( |$)");
    std::string lines = std::regex_replace(text, line, "$1\n");
    lines.pop_back();
    return lines;
}

int wrong_usage(const std::string &sentence) {
    fprintf(stderr, "tavo: %s\nTry 'tavo --help'.\n", sentence.c_str());
    return kExitUsage;
}

// The parser splits a FILE in square brackets at its commas. To prevent this, `shielded` puts this
// byte before the opening bracket, and declare_all adds a validator that removes it.
constexpr char kShield = '\x01';

// Returns the arguments in the order that the parser requires, last to first.
std::vector<std::string> shielded(int argc, char **argv) {
    std::vector<std::string> out;
    for (int i = argc - 1; i > 0; --i) {
        out.emplace_back(argv[i]);
        if (out.back().size() > 1 && out.back().front() == '[') out.back().insert(0, 1, kShield);
    }
    return out;
}

// Declares an option with a text value.
CLI::Option *add_text(CLI::App &app, const char *names, std::string &value, const char *type,
                      const char *description) {
    return app.add_option(names, value, description)->type_name(type);
}

// Declares an option whose value is a whole number. `type` is SECONDS or N.
void add_number(CLI::App &app, const char *names, int32_t &value, std::pair<int32_t, int32_t> range,
                const std::string &type, const char *description) {
    const auto check = [=](const std::string &text) {
        const std::optional<int64_t> number = read_number(text);
        if (number && *number >= range.first && *number <= range.second) return std::string();
        return "'" + text + "' is not a whole number" + (type == "N" ? "" : " of seconds") +
               " from " + std::to_string(range.first) + " to " + std::to_string(range.second);
    };
    app.add_option(names, value, description)->check(CLI::Validator(check, ""))->type_name(type);
}

void declare_inputs(CLI::App &app, options &out) {
    app.add_option("FILE", out.inputs, "Audio files, folders, or '-': a list on standard input")
        ->type_name("");
    app.add_flag("-r,--recursive", out.recursive, "Search subfolders too, including linked ones");
    app.add_option("--files-from", out.lists, "A list of files; '-' is standard input")
        ->allow_extra_args(false)
        ->type_name("LIST");
    app.add_flag_callback(
        "-0,--null", [&out] { out.list_separator = '\0'; },
        "Names in lists end with a NUL instead of a newline");
}

void declare_analysis(CLI::App &app, options &out) {
    app.add_option_function<std::string>(
           "-m,--mode", [&out](const std::string &word) { out.mode = mode_of(word); },
           "highlight, beats, or both (default): the highlight, then the beats from there on")
        ->check(CLI::IsMember({"highlight", "beats", "both"}).description(""))
        ->type_name("MODE");
    add_number(app, "-l,--length", out.length_s, {0, kMostSeconds}, "SECONDS",
               "Requested length of the highlight. The start is moved so that a passage of this "
               "length ends at a boundary of the music");
    add_number(app, "--max-beats", out.max_beats, {0, kMostBeats}, "N",
               "Maximum number of threshold-selected beats");
    add_number(app, "--max-minutes", out.max_minutes, {1, kMostMinutes}, "N",
               "Refuse audio that lasts longer; 600 by default");
    add_number(app, "-j,--jobs", out.jobs, {1, kMostJobs}, "N",
               "Files analysed in parallel, each in its own process; 1 by default");
    add_number(app, "--timeout", out.timeout_s, {0, kMostSeconds}, "SECONDS",
               "Longest analysis of a file; a file that takes longer fails. No limit by default");
    app.add_flag("--normalize", out.normalize,
                 "Refine the highlight of a quiet song by a second search in the amplified song; "
                 "needs ffmpeg");
    app.add_flag("--no-ffmpeg", "Decode nothing with the ffmpeg program, even if it is installed");
}

void declare_output(CLI::App &app, options &out) {
    app.add_option_function<std::string>(
           "-f,--format", [&out](const std::string &word) { set_format(word, out); },
           "text (default), json (one object per line), csv (one row per file); or a marker file "
           "for an editor beside each input: labels (Audacity), kdenlive, llc (LosslessCut), "
           "ffmetadata (chapters), edl (DaVinci Resolve), fcpxml, otio, reaper. Without --length "
           "the highlight is marked for 30 s")
        ->check(CLI::IsMember(format_words()).description(""))
        ->type_name("FORMAT");
    add_text(app, "--print", out.print, "TEXT",
             "Write this text for each song, with {file}, {stem}, {hl_s}, {hl_ms}, {end_s}, {bpm} "
             "and {beats} replaced; \\n is a new line, \\t a tab");
    add_text(app, "-o,--output-dir", out.output_dir, "DIR",
             "Folder for the marker files; by default they are written beside each input");
    add_text(app, "--fps", out.fps, "RATE",
             "Frames per second for edl, fcpxml and otio: 23.976, 24, 25, 29.97, 29.97df "
             "(drop-frame), 30 (default), 50, 59.94, 59.94df, 60")
        ->check(CLI::IsMember(kFrameRates).description(""));
    app.add_flag("--force", out.force,
                 "Overwrite existing marker files, click tracks, clips and pages");
    app.add_flag("--skip-existing", out.skip_existing, "Skip inputs whose marker file exists");
    add_text(app, "--click", out.click, "WAV",
             "Write a WAV file of the analysed sound with a click on every beat, in mode both from "
             "the highlight on; only for a single input");
    add_text(app, "--clip", out.clip, "FILE|DIR",
             "Write --length seconds from the highlight on to an audio file, whose extension "
             "selects the format, or to one file per input in a folder; needs ffmpeg");
    app.add_option("--fade", out.fade_s, "Fade the clip in at its start and out at its end")
        ->check(CLI::Range(0.0, static_cast<double>(kMostSeconds)).description(""))
        ->type_name("SECONDS");
    app.add_flag("-q,--quiet", out.quiet, "No progress bar and no notes");
}

void declare_page(CLI::App &app, options &out) {
    add_text(app, "--report", out.report, "HTML",
             "Write an HTML page that shows and plays the song; for several inputs an index, with "
             "the pages in a folder beside it");
    app.add_flag("--embed", out.embed, "Put the sound into the page");
}

void declare_catalogue(CLI::App &app, options &out) {
    add_text(app, "--store", out.store, "URL",
             "Store the results in a database: sqlite:FILE, FILE.db or postgresql://HOST/DATABASE. "
             "Songs that are already stored are skipped. Prints results only with --format");
    app.add_flag("--retry-failed", out.retry_failed, "Analyse failed songs again");
    app.add_flag("--redo", out.redo, "Analyse every song again");
    app.add_flag("--from-store", out.from_store,
                 "Write the stored results for --mode, --length and --max-beats; analyses nothing");
    app.add_flag("--failed", out.failed, "With --from-store: the songs that failed, and why");
    add_number(app, "--patience", out.patience_s, {0, kMostSeconds}, "SECONDS",
               "How long to retry a store that does not respond; 60 by default");
    const auto set_shard = [&out](const std::string &words) {
        const failure wrong = read_shard(words, out.share);
        if (wrong) throw CLI::ValidationError(wrong.sentence);
    };
    app.add_option_function<std::string>(
           "--shard", set_shard,
           "Analyse only part I of N of the inputs, for schedulers that run one command many "
           "times; auto: as set by Slurm, Kubernetes or AWS Batch")
        ->type_name("I/N");
}

void declare_help(CLI::App &app, options & /*out*/) {
    app.set_help_flag("-h", "The options by name");
    app.set_help_all_flag("--help", "This help");
    app.set_version_flag("--version", std::string("tavo ") + TAVO_VERSION, "Print the version");
}

void declare_all(CLI::App &app, options &out) {
    using declaration = void (*)(CLI::App &, options &);
    const std::pair<const char *, declaration> groups[] = {
        {"Input", declare_inputs}, {"Analysis", declare_analysis},   {"Output", declare_output},
        {"Page", declare_page},    {"Catalogue", declare_catalogue}, {"Others", declare_help}};
    app.set_help_flag();
    for (const auto &[name, declare] : groups) {
        app.option_defaults()->group(name);
        declare(app, out);
    }
    for (CLI::Option *option : app.get_options()) {
        if (option->get_items_expected_max() == 0) continue;  // a flag
        const bool is_file = option->get_positional();
        const auto check = [is_file](std::string &value) {
            if (value.size() > 1 && value[0] == kShield && value[1] == '[') value.erase(0, 1);
            // An empty FILE is not refused here. It is reported like a file that cannot be read.
            return value.empty() && !is_file ? "the value is empty" : "";
        };
        option->transform(CLI::Validator(check, ""));
    }
}

bool is_folder(const std::string &path) {
    std::error_code ignored;
    return std::filesystem::is_directory(path, ignored);
}

// Whether the options contradict each other, and the error sentence if they do.
using contradiction = std::pair<bool, std::string>;

failure first_of(std::initializer_list<contradiction> table) {
    for (const auto &[is_found, sentence] : table) {
        if (is_found) return {sentence};
    }
    return {};
}

failure check_output(const CLI::App &app, const options &out) {
    const bool has_files = out.markers != nullptr;
    const bool has_frames = has_files && out.markers->counts_frames;
    const bool has_click = !out.click.empty();
    std::string sample;
    const failure bad_template = fill_template(out.print, {}, sample);
    return first_of({
        {!has_files && (!out.output_dir.empty() || out.skip_existing),
         "--output-dir and --skip-existing need a format that writes files, such as --format "
         "labels."},
        {app.count("--fps") > 0 && !has_frames,
         "--fps is only for --format edl, fcpxml and otio, which count frames."},
        {!out.print.empty() && app.count("--format") > 0,
         "--print replaces --format; give only one of them."},
        {!bad_template.sentence.empty(), bad_template.sentence},
        {out.skip_existing && out.force, "--skip-existing and --force exclude each other."},
        {!out.output_dir.empty() && !is_folder(out.output_dir),
         out.output_dir + ": is not a folder."},
        {has_click && out.mode == TAVO_MODE_HIGHLIGHT,
         "--click needs beats: --mode beats or both."},
        {out.embed && out.report.empty(), "--embed needs --report."},
        {out.normalize && out.mode == TAVO_MODE_BEATS,
         "--normalize needs a highlight: --mode highlight or both."},
        {out.normalize && !out.store.empty(), "--normalize cannot be combined with --store."},
        {out.normalize && out.ffmpeg.empty(),
         "--normalize needs the ffmpeg program, which was not found."},
        {has_click && out.click == out.report, "--click and --report name the same file."},
        {has_click && !takes_one_file(out), "--click takes exactly one audio file."},
    });
}

failure check_clip(const options &out) {
    if (out.clip.empty()) return {out.fade_s > 0.0 ? "--fade needs --clip." : ""};
    const bool is_file = !is_folder(out.clip);
    const std::string name = base_name(out.clip);
    return first_of({
        {out.length_s == 0, "--clip needs --length."},
        {out.mode == TAVO_MODE_BEATS, "--clip needs a highlight: --mode highlight or both."},
        {2 * out.fade_s > out.length_s, "--fade can be at most half of --length."},
        {out.ffmpeg.empty(), "--clip needs the ffmpeg program, which was not found."},
        {out.clip == out.click || out.clip == out.report,
         "--clip names the file of another option."},
        {is_file && !takes_one_file(out),
         "--clip takes exactly one audio file, or a folder for the clips."},
        {is_file && stem(name) == name,
         "--clip needs a folder, or a name with an extension, such as clip.mp3."},
    });
}

failure check_inputs(const options &out) {
    const bool has_inputs = !out.inputs.empty() || !out.lists.empty();
    const bool has_list =
        !out.lists.empty() || std::count(out.inputs.begin(), out.inputs.end(), "-") > 0;
    const bool has_page = !out.report.empty();
    return first_of({
        {!has_inputs && !out.from_store,
         "name at least one audio file, a folder, or '-' for a list on standard input."},
        {out.list_separator == '\0' && !has_list,
         "-0 applies only to lists of files: give '-' or --files-from."},
        {out.store.empty() && (out.from_store || out.redo || out.retry_failed),
         "--from-store, --redo and --retry-failed need --store."},
        {out.from_store && has_inputs, "--from-store accepts no inputs."},
        {out.failed && !out.from_store, "--failed needs --from-store."},
        {out.failed && (out.markers != nullptr || has_page),
         "--failed needs --format text, json or csv."},
        {out.from_store && out.format == result_format::none && !has_page,
         "--from-store needs --format or --report."},
    });
}

// Sets the values that depend on several options, and refuses contradictory options.
failure complete(const CLI::App &app, options &out) {
    if (!out.print.empty()) {
        out.format = result_format::print;
    } else if (app.count("--format") == 0 && !out.store.empty() && !out.failed) {
        out.format = result_format::none;
    }
    if (app.count("--no-ffmpeg") == 0) out.ffmpeg = find_ffmpeg();
    if (failure wrong = check_inputs(out)) return wrong;
    if (failure wrong = check_output(app, out)) return wrong;
    return check_clip(out);
}

// Warns about options that have no effect or less effect than expected.
void write_notes(const options &out) {
    const std::pair<bool, const char *> table[] = {
        {out.length_s > 0 && out.mode == TAVO_MODE_BEATS, "--length has no effect in mode beats."},
        {out.max_beats > 0 && out.mode == TAVO_MODE_HIGHLIGHT,
         "--max-beats has no effect in mode highlight."},
        {!out.click.empty() && out.mode == TAVO_MODE_BOTH,
         "the click track starts at the highlight; --mode beats makes one of the whole song."},
    };
    for (const auto &[is_due, note] : table) {
        if (is_due && !out.quiet) fprintf(stderr, "tavo: %s\n", note);
    }
}

}  // namespace

std::optional<int> parse_options(int argc, char **argv, options &out) {
    CLI::App app(kAbout, "tavo");
    app.footer(std::string(kFooter) + "\n" + kExamples);
    app.get_formatter()->column_width(kOptionColumns);
    declare_all(app, out);
    try {
        app.parse(shielded(argc, argv));
    } catch (const CLI::ParseError &end) {  // also thrown for help and the version
        if (end.get_exit_code() != 0) return wrong_usage(end.what());
        if (end.get_name() == "CallForHelp") {
            std::cout << kUsage << kAbout << "\n\n" << kExamples << "\n" << kOptionNames;
        } else {
            for (CLI::Option *option : app.get_options()) {
                option->description(wrapped(option->get_description()));
            }
            app.exit(end);
        }
        if (std::cout.flush()) return kExitOk;
        perror("tavo: the output cannot be written");
        return kExitFailed;
    }
    if (const failure wrong = complete(app, out)) return wrong_usage(wrong.sentence);
    write_notes(out);
    return std::nullopt;
}

bool takes_one_file(const options &opts) {
    return opts.inputs.size() == 1 && opts.inputs[0] != "-" && opts.lists.empty() &&
           !is_folder(opts.inputs[0]);
}
