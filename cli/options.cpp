#include "cli/options.h"

#include <sys/stat.h>

#include <CLI/CLI.hpp>
#include <algorithm>
#include <charconv>
#include <cstdio>
#include <iostream>
#include <sstream>

#include "cli/input/ffmpeg_process.h"
#include "cli/write/file_names.h"
#include "cli/write/format.h"
#include "cli/write/frame_rate.h"
#include "cli/write/markers.h"
#include "cli/write/value_text.h"
#include "include/tavo.h"

namespace {

constexpr int32_t kMostJobs = 256;
constexpr int32_t kMostSeconds = 86'400;  // a day: beyond any song, far below what overflows
constexpr int32_t kMostMinutes = 1'000'000;
constexpr int32_t kMostBeats = 1'000'000'000;

constexpr const char *kAbout =
    "Finds the highlight of songs (where the strongest sustained loud passage\n"
    "starts), their tempo and their beats.";

constexpr const char *kFooter =
    "A folder is searched for audio files, recognised by content rather than by\n"
    "name. A list has one name a line (M3U playlists will do) and is read as it\n"
    "comes. Results go to standard output in the order of the inputs, messages to\n"
    "standard error.\n"
    "\n"
    "The start of a highlight is exact to 0.4 s where the loud passage is louder\n"
    "than about -13 dBFS RMS; elsewhere it is a point of a 2 s grid, usually 2 to\n"
    "6 s early, and the text says \"about\"; --normalize refines it. In mode both\n"
    "the tempo is that of the music from the highlight on.\n"
    "\n"
    "Exit status: 0 all done; 1 a file failed; 2 wrong usage; 130 stopped with\n"
    "Ctrl-C; 141 the reader of the results has gone.\n";

constexpr size_t kOptionColumns = 28;
constexpr size_t kTextColumns = 80 - kOptionColumns;

// Breaks the line at spaces.
std::string wrapped(const std::string &text) {
    std::string out;
    size_t used = 0;
    std::istringstream words(text);
    for (std::string word; words >> word; used += word.size() + 1) {
        const bool breaks = used + word.size() > kTextColumns;
        if (breaks) used = 0;
        out += (out.empty() ? "" : breaks ? "\n" : " ") + word;
    }
    return out;
}

constexpr const char *kUsage = "Usage: tavo [OPTION]... FILE...\n";

constexpr const char *kExamples =
    "Examples:\n"
    "  tavo song.mp3                       a summary for people\n"
    "  tavo -f labels -l 30 song.mp3       song.mp3.labels.txt, for Audacity\n"
    "  tavo -f json -r -j 2 Music          one JSON object a line for each file\n"
    "  tavo --report song.html song.mp3    a page that shows and plays the song\n"
    "  find . -name '*.flac' -print0 | tavo -0 -f csv -\n";

constexpr const char *kOtherGroup = "Others";

// Puts the options that were declared since the last call into a group of the help.
void group_options(CLI::App &app, const char *group) {
    for (CLI::Option *option : app.get_options()) {
        if (option->get_group() == "Options") option->group(group);
    }
}

// The names of a group's options in lines of a terminal's width.
std::string group_lines(const CLI::App &app, const std::string &group) {
    constexpr size_t kColumns = 80;
    constexpr size_t kIndent = 13;
    std::string line = "  " + group + std::string(kIndent - 2 - group.size(), ' ');
    std::string lines;
    bool is_first = true;
    for (const CLI::Option *option : app.get_options()) {
        if (option->get_group() != group) continue;
        std::string name = option->get_name(option->get_positional(), true);
        std::replace(name.begin(), name.end(), ',', ' ');
        if (!option->get_type_name().empty()) name += " " + option->get_type_name();
        if (line.size() + 2 + name.size() > kColumns) {
            lines += line + ",\n";
            line = std::string(kIndent, ' ');
            is_first = true;
        }
        line += (is_first ? "" : ", ") + name;
        is_first = false;
    }
    return lines + line + "\n";
}

std::string short_help(const CLI::App &app) {
    std::string text =
        std::string(kUsage) + kAbout + "\n\n" + kExamples + "\nOptions, which --help explains:\n";
    for (const std::string &group : app.get_groups()) text += group_lines(app, group);
    return text;
}

int wrong_usage(const std::string &sentence) {
    fprintf(stderr, "tavo: %s\nTry 'tavo --help'.\n", sentence.c_str());
    return kExitUsage;
}

struct format_word {
    const char *word;
    result_format format;
};
constexpr format_word kFormats[] = {
    {"text", result_format::text},
    {"json", result_format::json},
    {"csv", result_format::csv},
    {"labels", result_format::labels},
    {"kdenlive", result_format::kdenlive},
    {"llc", result_format::llc},
    {"ffmetadata", result_format::ffmetadata},
    {"edl", result_format::edl},
    {"fcpxml", result_format::fcpxml},
    {"otio", result_format::otio},
    {"reaper", result_format::reaper},
};

std::vector<std::string> format_words() {
    std::vector<std::string> words;
    for (const format_word &entry : kFormats) words.emplace_back(entry.word);
    return words;
}

// Values that the parser takes as words.
struct raw_values {
    std::string mode = "both";
    std::string format;  // empty: text, or none with a store
    std::string shard;
    std::string fps;
    bool null_separated = false;
    bool no_ffmpeg = false;
};

// The parser takes a value in square brackets apart at its commas, which a file name must survive:
// such an argument travels after a byte that takes its bracket off the first place.
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

CLI::Validator whole(int32_t least, int32_t most, const char *unit) {
    return CLI::Validator(
        [=](const std::string &text) {
            int32_t value = 0;
            const auto end = std::from_chars(text.data(), text.data() + text.size(), value);
            const bool read = end.ec == std::errc() && end.ptr == text.data() + text.size();
            if (read && value >= least && value <= most) return std::string();
            return "'" + text + "' is not a whole number" + unit + " from " +
                   std::to_string(least) + " to " + std::to_string(most);
        },
        "");
}

void declare_analysis(CLI::App &app, options &out, raw_values &raw) {
    app.add_option(
           "-m,--mode", raw.mode,
           "highlight, beats, or both (default): the highlight, then the beats from there on")
        ->check(CLI::IsMember({"highlight", "beats", "both"}).description(""))
        ->type_name("MODE");
    app.add_option(
           "-l,--length", out.length_s,
           "Length of the highlight wanted: the start is placed so that a passage of this length "
           "ends at a boundary of the music")
        ->check(whole(0, kMostSeconds, " of seconds"))
        ->type_name("SECONDS");
    app.add_option("--max-beats", out.max_beats, "Maximum number of threshold-selected beats")
        ->check(whole(0, kMostBeats, ""))
        ->type_name("N");
    app.add_option("--max-minutes", out.max_minutes,
                   "Refuse audio that lasts longer; 600 by default")
        ->check(whole(1, kMostMinutes, ""))
        ->type_name("N");
    app.add_option("-j,--jobs", out.jobs,
                   "Files analysed at once, each in a process of its own; 1 by default")
        ->check(whole(1, kMostJobs, ""))
        ->type_name("N");
    app.add_option("--timeout", out.timeout_s,
                   "Give up a file whose analysis takes longer; by default none is given up")
        ->check(whole(0, kMostSeconds, " of seconds"))
        ->type_name("SECONDS");
    app.add_flag("--normalize", out.normalize,
                 "Refine the highlight of a quiet song: search it again, raised in level; needs "
                 "ffmpeg");
    app.add_flag("--no-ffmpeg", raw.no_ffmpeg,
                 "Decode nothing with the ffmpeg program, even if it is installed");
}

void declare_output(CLI::App &app, options &out, raw_values &raw) {
    app.add_option("-f,--format", raw.format,
                   "text (default) for people, json: one object a line, csv: one row a file; or "
                   "markers for an editor, a file beside each input: labels (Audacity), kdenlive, "
                   "llc (LosslessCut), ffmetadata (chapters), edl (DaVinci Resolve), fcpxml, otio, "
                   "reaper. Markers span 30 s of highlight without --length")
        ->check(CLI::IsMember(format_words()).description(""))
        ->type_name("FORMAT");
    app.add_option("--print", out.print,
                   "Write this text for each song, with {file}, {stem}, {hl_s}, {hl_ms}, {end_s}, "
                   "{bpm} and {beats} replaced, \\n and \\t for a line's end and a tab")
        ->type_name("TEXT");
    app.add_option("-o,--output-dir", out.output_dir,
                   "Folder for the marker files; by default they are written beside each file")
        ->type_name("DIR");
    app.add_option("--fps", raw.fps,
                   "Frames a second for edl, fcpxml and otio: 23.976, 24, 25, 29.97, 29.97df "
                   "(drop-frame), 30 (default), 50, 59.94, 59.94df, 60")
        ->check(CLI::IsMember(frame_rate_names()).description(""))
        ->type_name("RATE");
    app.add_flag("--force", out.force,
                 "Overwrite marker files, click tracks, clips and pages that exist");
    app.add_flag("--skip-existing", out.skip_existing, "Leave out inputs whose marker file exists");
    app.add_option("--click", out.click,
                   "Write the analysed sound with a click on every beat, a WAV file; from the "
                   "highlight on in "
                   "mode both; one input only")
        ->type_name("WAV");
    app.add_option(
           "--clip", out.clip,
           "Cut --length seconds of highlight into an audio file of the name's kind, or into "
           "a file for each input in a folder; needs ffmpeg")
        ->type_name("FILE|DIR");
    app.add_option("--fade", out.fade_s, "Fade the clip in at its start and out at its end")
        ->check(CLI::Range(0.0, static_cast<double>(kMostSeconds)).description(""))
        ->type_name("SECONDS");
    app.add_flag("-q,--quiet", out.quiet, "No progress bar and no notes");
}

void declare_page(CLI::App &app, options &out) {
    app.add_option("--report", out.report,
                   "Write a page that shows and plays the song, an HTML file; for several inputs "
                   "an index, the pages in a folder beside it")
        ->type_name("HTML");
    app.add_flag("--embed", out.embed, "Put the sound into the page");
}

void declare_catalogue(CLI::App &app, options &out, raw_values &raw) {
    app.add_option("--store", out.store,
                   "Keep the results in a database: sqlite:FILE, FILE.db or "
                   "postgresql://HOST/DATABASE. Songs that it knows are left out; standard output "
                   "is used only with --format")
        ->type_name("URL")
        ->check([](const std::string &url) {
            return url.empty() ? std::string("it has no name") : std::string();
        });
    app.add_flag("--retry-failed", out.retry_failed, "Analyse songs again that failed");
    app.add_flag("--redo", out.redo, "Analyse every song again");
    app.add_flag("--from-store", out.from_store,
                 "Write out what the store holds for --mode, --length and --max-beats; analyses "
                 "nothing");
    app.add_flag("--failed", out.failed, "With --from-store: the songs that failed, and why");
    app.add_option("--patience", out.patience_s,
                   "How long a store that does not answer is tried again; 60 by default")
        ->check(whole(0, kMostSeconds, " of seconds"))
        ->type_name("SECONDS");
    app.add_option("--shard", raw.shard,
                   "Only the share I of N of the inputs, for engines that run one command many "
                   "times; auto: as Slurm, Kubernetes or AWS Batch says")
        ->type_name("I/N");
}

void declare_inputs(CLI::App &app, options &out, raw_values &raw) {
    app.add_option("FILE", out.inputs, "Audio files, folders, or '-': a list on standard input")
        ->type_name("");
    app.add_flag("-r,--recursive", out.recursive,
                 "Search folders inside folders too, linked ones included");
    app.add_option("--files-from", out.lists, "A list of files; '-' is standard input")
        ->allow_extra_args(false)
        ->type_name("LIST");
    app.add_flag("-0,--null", raw.null_separated,
                 "Names in lists end with a NUL instead of a newline");
}

bool is_folder(const std::string &path) {
    struct stat info {};
    return stat(path.c_str(), &info) == 0 && S_ISDIR(info.st_mode);
}

void set_values(const raw_values &raw, options &out) {
    out.mode = mode_of(raw.mode);
    if (raw.format.empty() && !out.store.empty() && !out.failed) out.format = result_format::none;
    for (const format_word &entry : kFormats) {
        if (raw.format == entry.word) out.format = entry.format;
    }
    if (!out.print.empty()) out.format = result_format::print;
    if (!raw.fps.empty()) out.fps = raw.fps;
    for (std::string *path : {&out.click, &out.clip, &out.report, &out.store, &out.print}) {
        unshield(*path);
    }
    unshield(out.output_dir);
    for (std::string &input : out.inputs) unshield(input);
    for (std::string &list : out.lists) unshield(list);
    if (!raw.no_ffmpeg) out.ffmpeg = find_ffmpeg();
    if (raw.null_separated) out.list_separator = '\0';
}

// Returns the error in the options about the store; empty if there is none.
std::string catalogue_contradiction(const options &out) {
    const bool nothing_named = out.inputs.empty() && out.lists.empty();
    if (out.store.empty() && (out.from_store || out.redo || out.retry_failed)) {
        return "--from-store, --redo and --retry-failed are about a --store.";
    }
    if (out.redo && out.retry_failed) return "--redo analyses failed songs too.";
    if (out.from_store && !nothing_named) return "--from-store takes no other inputs.";
    if (out.failed && !out.from_store) return "--failed goes with --from-store.";
    if (out.failed && (writes_files(out.format) || !out.report.empty())) {
        return "--failed goes with --format text, json or csv.";
    }
    if (out.from_store && out.format == result_format::none && out.report.empty()) {
        return "--from-store needs --format or --report.";
    }
    return "";
}

std::string clip_contradiction(const options &out) {
    if (out.clip.empty()) return out.fade_s > 0.0 ? "--fade is about --clip." : "";
    if (out.length_s == 0) return "--clip needs --length, its seconds.";
    if (out.mode == TAVO_MODE_BEATS) return "--clip needs a highlight: --mode highlight or both.";
    if (2 * out.fade_s > out.length_s) return "--fade takes at most half of --length.";
    if (out.ffmpeg.empty()) return "--clip needs the ffmpeg program, which was not found.";
    if (out.clip == out.click || out.clip == out.report) {
        return "--clip names the file of another option.";
    }
    if (is_folder(out.clip)) return "";
    if (!takes_one_file(out))
        return "--clip takes exactly one audio file, or a folder for the clips.";
    const std::string name = base_name(out.clip);
    return stem(name) != name ? "" : "--clip needs a folder, or a name with an ending: clip.mp3.";
}

std::string normalize_contradiction(const options &out) {
    if (!out.normalize) return "";
    if (out.mode == TAVO_MODE_BEATS)
        return "--normalize needs a highlight: --mode highlight or both.";
    if (!out.store.empty())
        return "--normalize does not go with --store, which keeps no such results.";
    return out.ffmpeg.empty() ? "--normalize needs the ffmpeg program, which was not found." : "";
}

// Returns the error in a combination of valid options; empty if there is none.
std::string contradiction(const options &out, const raw_values &raw) {
    const bool list_on_stdin =
        std::find(out.inputs.begin(), out.inputs.end(), "-") != out.inputs.end();
    if (out.inputs.empty() && out.lists.empty() && !out.from_store) {
        return "name at least one audio file, a folder, or '-' for a list on standard input.";
    }
    if (raw.null_separated && !list_on_stdin && out.lists.empty()) {
        return "-0 is about lists of files: give '-' or --files-from.";
    }
    if (!out.output_dir.empty() && !writes_files(out.format)) {
        return "--output-dir goes with the formats that write files, like --format labels.";
    }
    if (!raw.fps.empty() && out.format != result_format::edl &&
        out.format != result_format::fcpxml && out.format != result_format::otio) {
        return "--fps goes with --format edl, fcpxml and otio, which count in frames.";
    }
    if (!out.print.empty() && !raw.format.empty()) return "--print takes the place of --format.";
    std::string sample;
    if (const failure wrong = fill_template(out.print, {}, sample)) return wrong.sentence;
    if (out.skip_existing && !writes_files(out.format)) {
        return "--skip-existing goes with the formats that write files, like --format labels.";
    }
    if (out.skip_existing && out.force) return "--skip-existing and --force exclude each other.";
    if (!out.output_dir.empty() && !is_folder(out.output_dir)) {
        return out.output_dir + ": is not a folder.";
    }
    if (!out.click.empty() && out.mode == TAVO_MODE_HIGHLIGHT) {
        return "--click needs beats: --mode beats or both.";
    }
    if (out.embed && out.report.empty()) return "--embed is about --report.";
    if (!out.click.empty() && out.click == out.report) return "--click and --report name one file.";
    if (!out.click.empty() && !takes_one_file(out)) return "--click takes exactly one audio file.";
    for (const auto contradicts : {normalize_contradiction, clip_contradiction}) {
        const std::string sentence = contradicts(out);
        if (!sentence.empty()) return sentence;
    }
    return catalogue_contradiction(out);
}

// Says which options do other than a newcomer may expect.
void write_notes(const options &out) {
    if (out.quiet) return;
    if (out.length_s > 0 && out.mode == TAVO_MODE_BEATS) {
        fputs("tavo: --length has no effect in mode beats.\n", stderr);
    }
    if (out.max_beats > 0 && out.mode == TAVO_MODE_HIGHLIGHT) {
        fputs("tavo: --max-beats has no effect in mode highlight.\n", stderr);
    }
    if (!out.click.empty() && out.mode == TAVO_MODE_BOTH) {
        fputs("tavo: the click track starts at the highlight; --mode beats clicks all of it.\n",
              stderr);
    }
}

// The exit status after help or the version.
int end_of_help() {
    if (std::cout.flush()) return kExitOk;
    perror("tavo: the output cannot be written");
    return kExitFailed;
}

}  // namespace

std::optional<int> parse_options(int argc, char **argv, options &out) {
    CLI::App app(kAbout, "tavo");
    app.footer(std::string(kFooter) + "\n" + kExamples);
    app.set_help_flag();
    app.get_formatter()->column_width(kOptionColumns);
    raw_values raw;
    declare_inputs(app, out, raw);
    group_options(app, "Input");
    declare_analysis(app, out, raw);
    group_options(app, "Analysis");
    declare_output(app, out, raw);
    group_options(app, "Output");
    declare_page(app, out);
    group_options(app, "Page");
    declare_catalogue(app, out, raw);
    group_options(app, "Catalogue");
    app.set_help_flag("-h", "The options by name");
    app.set_help_all_flag("--help", "This help");
    app.set_version_flag("--version", std::string("tavo ") + TAVO_VERSION, "Print the version");
    group_options(app, kOtherGroup);
    for (CLI::Option *option : app.get_options()) {
        option->description(wrapped(option->get_description()));
    }
    try {
        app.parse(shielded(argc, argv));
    } catch (const CLI::CallForHelp &) {
        std::cout << short_help(app);
        return end_of_help();
    } catch (const CLI::Success &done) {
        app.exit(done);
        return end_of_help();
    } catch (const CLI::ParseError &wrong) {
        return wrong_usage(wrong.what());
    }
    set_values(raw, out);
    std::string sentence = contradiction(out, raw);
    if (sentence.empty() && !raw.shard.empty()) {
        sentence = read_shard(raw.shard, out.share).sentence;
    }
    if (!sentence.empty()) return wrong_usage(sentence);
    write_notes(out);
    return std::nullopt;
}

bool takes_one_file(const options &opts) {
    return opts.inputs.size() == 1 && opts.inputs[0] != "-" && opts.lists.empty() &&
           !is_folder(opts.inputs[0]);
}
