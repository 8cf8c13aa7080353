// The texts of -h and --help, except the option descriptions.
#ifndef TAVO_CLI_HELP_TEXT_H
#define TAVO_CLI_HELP_TEXT_H

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

#endif
