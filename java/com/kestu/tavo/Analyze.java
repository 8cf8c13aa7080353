package com.kestu.tavo;

import java.io.PrintStream;
import java.io.UnsupportedEncodingException;
import java.util.ArrayList;
import java.util.Arrays;
import java.util.List;
import java.util.concurrent.CountDownLatch;

/**
 * An example for desktop machines: analyses files from the command line and prints their highlight
 * and beats as the {@code tavo} command does. It is the main class of {@code tavo.jar}:
 *
 * <pre>{@code java -Djava.library.path=LIB -jar tavo.jar [options] FILE...}</pre>
 *
 * <p>LIB is the directory of {@code libtavo.so}: {@code build/release/lib} after a build,
 * {@code PREFIX/lib} after an installation, which puts the jar at
 * {@code PREFIX/share/java/tavo.jar}.
 *
 * <p>Exit status: 0 on success, 1 if a file failed, 2 for a usage error.
 */
public final class Analyze {
    private static final String USAGE =
            "usage: java -Djava.library.path=LIB -jar tavo.jar\n"
                    + "           [--mode highlight|beats|both] [--length SECONDS]"
                    + " [--max-beats N] FILE...";

    private int mode = Tavo.MODE_BOTH;
    private int lengthSeconds = 0;
    private int maxBeats = 0;
    private final List<String> files = new ArrayList<>();

    private Analyze() {}

    public static void main(String[] arguments) throws UnsupportedEncodingException {
        Analyze command = new Analyze();
        if (!command.parse(arguments)) {
            System.err.println(USAGE);
            System.exit(2);
        }
        if (!command.run()) System.exit(1);
    }

    private boolean parse(String[] arguments) {
        try {
            for (int i = 0; i < arguments.length; ++i) {
                switch (arguments[i]) {
                    case "--mode":
                        mode = modeOf(arguments[++i]);
                        break;
                    case "--length":
                        lengthSeconds = count(arguments[++i]);
                        break;
                    case "--max-beats":
                        maxBeats = count(arguments[++i]);
                        break;
                    default:
                        if (arguments[i].startsWith("--")) return false;
                        files.add(arguments[i]);
                }
            }
        } catch (IllegalArgumentException | ArrayIndexOutOfBoundsException wrong) {
            return false;
        }
        return !files.isEmpty();
    }

    private static int modeOf(String name) {
        int found = Arrays.asList("highlight", "beats", "both").indexOf(name);
        if (found < 0) throw new IllegalArgumentException(name);
        return found;
    }

    private static int count(String text) {
        int value = Integer.parseInt(text);
        if (value < 0) throw new IllegalArgumentException(text);
        return value;
    }

    /** Returns true if every file has a result. */
    private boolean run() throws UnsupportedEncodingException {
        Tavo.disableClickTrack();
        boolean allDone = true;
        try (PrintStream out = new PrintStream(System.out, true, "UTF-8")) {
            for (String file : files) {
                Outcome outcome = analyze(file);
                if (outcome.error == null) {
                    out.print(text(file, outcome));
                } else {
                    System.err.println("tavo: " + file + ": " + outcome.error);
                    allDone = false;
                }
            }
        }
        return allDone;
    }

    /** The outcome of one file; {@code error} is null on success. */
    private static final class Outcome implements TavoListener {
        final CountDownLatch done = new CountDownLatch(1);
        String error;
        int highlightMs;
        float[] beatsMs;

        @Override
        public void onResult(Tavo tavo, int highlight, float[] beats) {
            highlightMs = highlight;
            beatsMs = beats;
            done.countDown();
        }

        @Override
        public void onFailure(Tavo tavo, int highlight) {
            error =
                    tavo.isComplete()
                            ? "No beats were found: the file may be silent or too short for a rhythm."
                            : "The file could not be read to its end.";
            done.countDown();
        }
    }

    private Outcome analyze(String file) {
        Outcome outcome = new Outcome();
        Tavo tavo = new Tavo(outcome);
        int code = tavo.init(file, mode);
        if (code != 0) {
            String reason = Tavo.reason(file);
            outcome.error =
                    "The file cannot be analysed: "
                            + (reason != null ? reason : "out of memory (code " + code + ")") + ".";
            return outcome;
        }
        if (tavo.analyze(lengthSeconds, maxBeats, 0) != 0) {
            outcome.error = "The analysis could not be started.";
        } else {
            await(outcome);
        }
        tavo.deinit();
        return outcome;
    }

    private static void await(Outcome outcome) {
        try {
            outcome.done.await();
        } catch (InterruptedException stopped) {
            outcome.error = "The analysis was stopped.";
        }
    }

    private String text(String file, Outcome outcome) {
        StringBuilder text = new StringBuilder(file).append('\n');
        if (mode != Tavo.MODE_BEATS) {
            text.append("  highlight  ").append(clock(outcome.highlightMs));
            if (lengthSeconds > 0) {
                text.append(" to ").append(clock(outcome.highlightMs + 1000.0 * lengthSeconds));
            }
            text.append('\n');
        }
        if (mode != Tavo.MODE_HIGHLIGHT) {
            float[] beats = outcome.beatsMs;
            text.append("  beats      ").append(beats.length);
            if (beats.length > 0) {
                text.append(", from ").append(clock(beats[0]));
                text.append(" to ").append(clock(beats[beats.length - 1]));
            }
            text.append('\n');
        }
        return text.toString();
    }

    /** Formats a time as m:ss.t, or as h:mm:ss.t if it is an hour or longer. */
    private static String clock(double ms) {
        long tenths = Math.round(ms / 100.0);
        long whole = tenths / 10;
        if (whole < 3600) {
            return String.format("%d:%02d.%d", whole / 60, whole % 60, tenths % 10);
        }
        return String.format(
                "%d:%02d:%02d.%d", whole / 3600, whole / 60 % 60, whole % 60, tenths % 10);
    }
}
