package com.kestu.tavo;

import java.io.File;
import java.io.FileInputStream;
import java.io.IOException;
import java.lang.management.ManagementFactory;
import java.lang.ref.WeakReference;
import java.nio.file.Files;
import java.nio.file.Path;
import java.nio.file.Paths;
import java.util.regex.Matcher;
import java.util.regex.Pattern;
import javax.management.ObjectName;

/**
 * The bridge in a real Java virtual machine. Arguments: a song of 20 s whose loud part starts at
 * 6 s and whose tempo is 120, a clip of 2 s, an empty directory. Ends by returning from main: a
 * thread left attached keeps the machine from ending, which the test's time limit turns into a
 * failure.
 */
public final class BridgeTest {
    private static final int CYCLES = 1000;
    private static final long EVENT_TIMEOUT_MS = 120_000;

    private static String song;
    private static String clip;
    private static Path directory;

    public static void main(String[] arguments) throws Exception {
        song = arguments[0];
        clip = arguments[1];
        directory = Paths.get(arguments[2]);
        Analyze.writeNoClickTrack();
        analyzeBeforeInit();
        unusableFiles();
        allModes();
        everythingTwice();
        deinitDuringAJob();
        listenerThatThrows();
        listenerThatCallsDeinit();
        pathsThatAreNotAscii();
        fileDescriptors();
        forgottenObject();
        manyCycles();
        System.out.println("all cases passed");
    }

    private static void check(boolean holds, String what) {
        if (!holds) throw new AssertionError(what);
    }

    private static void check(long got, long expected, String what) {
        check(got == expected, what + ": " + got + " instead of " + expected);
    }

    /** Keeps the events of one analysis. */
    private static class Recorder implements TavoListener {
        int results;
        int failures;
        int highlightMs = -1;
        float[] beatsMs;
        Thread thread;
        Tavo sender;

        @Override
        public synchronized void onResult(Tavo tavo, int highlight, float[] beats) {
            ++results;
            beatsMs = beats;
            take(tavo, highlight);
        }

        @Override
        public synchronized void onFailure(Tavo tavo, int highlight) {
            ++failures;
            take(tavo, highlight);
        }

        private void take(Tavo tavo, int highlight) {
            highlightMs = highlight;
            sender = tavo;
            thread = Thread.currentThread();
            notifyAll();
        }

        synchronized int events() {
            return results + failures;
        }

        synchronized void await() throws InterruptedException {
            long end = System.currentTimeMillis() + EVENT_TIMEOUT_MS;
            while (events() == 0 && System.currentTimeMillis() < end) wait(EVENT_TIMEOUT_MS);
            check(events(), 1, "events of one analysis");
        }
    }

    /** Runs one analysis from init to deinit and returns what came of it. */
    private static Recorder analyze(String path, int mode) throws InterruptedException {
        Recorder recorder = new Recorder();
        Tavo tavo = new Tavo(recorder);
        check(tavo.init(path, mode), 0, "init of " + path);
        check(tavo.analyze(0, 0, 0), 0, "analyze");
        recorder.await();
        check(tavo.deinit(), 0, "deinit");
        check(recorder.events(), 1, "events of one analysis");
        check(recorder.sender == tavo, "the event names its object");
        check(recorder.thread != Thread.currentThread(), "the event has a thread of its own");
        return recorder;
    }

    private static void analyzeBeforeInit() {
        Recorder recorder = new Recorder();
        Tavo tavo = new Tavo(recorder);
        check(tavo.analyze(0, 0, 0), 0, "analyze before init");
        check(tavo.deinit(), 0, "deinit before init");
        check(recorder.events(), 0, "events without an analysis");
    }

    private static void unusableFiles() throws IOException {
        Tavo tavo = new Tavo(new Recorder());
        StringBuilder longPath = new StringBuilder(directory.toString());
        while (longPath.length() < 512) longPath.append("/x");
        Path text = Files.write(directory.resolve("text.wav"), "not a song".getBytes());
        String[] paths = {
            null, "", directory.resolve("missing.wav").toString(), directory.toString(),
            text.toString(), longPath.toString()
        };
        for (String path : paths) {
            check(tavo.init(path, Tavo.MODE_BOTH), Tavo.ERROR_UNUSABLE, "init of " + path);
            check(tavo.analyze(0, 0, 0), 0, "analyze after a failed init");
        }
        check(tavo.deinit(), 0, "deinit after a failed init");
    }

    private static void allModes() throws InterruptedException {
        Recorder highlight = analyze(song, Tavo.MODE_HIGHLIGHT);
        check(highlight.results, 1, "results of mode 0");
        check(highlight.beatsMs.length, 0, "beats of mode 0");
        check(Math.abs(highlight.highlightMs - 6000) <= 2000, "highlight " + highlight.highlightMs);

        Recorder beats = analyze(song, Tavo.MODE_BEATS);
        check(beats.results, 1, "results of mode 1");
        check(beats.highlightMs, 0, "highlight of mode 1");
        onTheGrid(beats.beatsMs, 0);

        Recorder both = analyze(song, Tavo.MODE_BOTH);
        check(both.results, 1, "results of mode 2");
        onTheGrid(both.beatsMs, both.highlightMs);
    }

    /** Beats after a time, ascending, most of them on the hits, which come every 500 ms. */
    private static void onTheGrid(float[] beats, float from) {
        check(beats.length >= 5 && beats.length <= 40, "20 s have " + beats.length + " beats");
        int onHits = 0;
        for (float beat : beats) {
            check(beat >= from && beat <= 20_000, "beat at " + beat + " after " + from);
            if (Math.abs(beat - 500 * Math.round(beat / 500)) < 60) ++onHits;
            from = beat;
        }
        check(4 * onHits >= 3 * beats.length, onHits + " of " + beats.length + " on the hits");
    }

    private static void everythingTwice() throws InterruptedException {
        Recorder recorder = new Recorder();
        Tavo tavo = new Tavo(recorder);
        check(tavo.init(song, Tavo.MODE_BEATS), 0, "init");
        check(tavo.init(song, Tavo.MODE_HIGHLIGHT), Tavo.ERROR_BUSY, "second init");
        check(tavo.analyze(0, 0, 0), 0, "analyze");
        check(tavo.analyze(0, 0, 0), -1, "second analyze");
        recorder.await();
        check(tavo.analyze(0, 0, 0), -1, "analyze after the event");
        check(tavo.deinit(), 0, "deinit");
        check(tavo.deinit(), 0, "second deinit");
        check(tavo.analyze(0, 0, 0), 0, "analyze after deinit");
        check(recorder.results, 1, "results");
        check(recorder.events(), 1, "events");
    }

    private static void deinitDuringAJob() {
        for (int mode = Tavo.MODE_HIGHLIGHT; mode <= Tavo.MODE_BOTH; ++mode) {
            Recorder recorder = new Recorder();
            Tavo tavo = new Tavo(recorder);
            check(tavo.init(song, mode), 0, "init");
            check(tavo.analyze(0, 0, 0), 0, "analyze");
            check(tavo.deinit(), 0, "deinit during a job");
            check(recorder.events(), 1, "events before deinit returned");
        }
    }

    private static void listenerThatThrows() throws InterruptedException {
        Recorder recorder = new Recorder() {
            @Override
            public synchronized void onResult(Tavo tavo, int highlight, float[] beats) {
                super.onResult(tavo, highlight, beats);
                throw new IllegalStateException("thrown by a listener");
            }
        };
        Tavo tavo = new Tavo(recorder);
        check(tavo.init(song, Tavo.MODE_BOTH), 0, "init");
        check(tavo.analyze(0, 0, 0), 0, "analyze");
        recorder.await();
        check(tavo.deinit(), 0, "deinit after a listener has thrown");
        check(analyze(song, Tavo.MODE_BOTH).results, 1, "results of the next analysis");
    }

    private static void listenerThatCallsDeinit() throws InterruptedException {
        int[] code = new int[1];
        Recorder recorder = new Recorder() {
            @Override
            public synchronized void onResult(Tavo tavo, int highlight, float[] beats) {
                code[0] = tavo.deinit();
                super.onResult(tavo, highlight, beats);
            }
        };
        Tavo tavo = new Tavo(recorder);
        check(tavo.init(clip, Tavo.MODE_HIGHLIGHT), 0, "init");
        check(tavo.analyze(0, 0, 0), 0, "analyze");
        recorder.await();
        check(code[0], -1, "deinit inside an event");
        check(tavo.deinit(), 0, "deinit");
    }

    private static void pathsThatAreNotAscii() throws Exception {
        Path copy = directory.resolve("Lied \u2013 \u00e4\u00f6\u00fc \u97f3\u697d.wav");
        Files.copy(Paths.get(song), copy);
        int expected = analyze(song, Tavo.MODE_HIGHLIGHT).highlightMs;
        check(analyze(copy.toString(), Tavo.MODE_HIGHLIGHT).highlightMs, expected, "highlight");
    }

    /** What an application with a descriptor alone does; also the way for names with emoji. */
    private static void fileDescriptors() throws Exception {
        Path copy = directory.resolve("\ud83c\udfb5.wav");
        Files.copy(Paths.get(song), copy);
        check(new Tavo(new Recorder()).init(copy.toString(), Tavo.MODE_HIGHLIGHT),
                Tavo.ERROR_UNUSABLE, "init of a name outside the basic plane");
        int expected = analyze(song, Tavo.MODE_HIGHLIGHT).highlightMs;

        Recorder recorder = new Recorder();
        Tavo tavo = new Tavo(recorder);
        try (FileInputStream stream = new FileInputStream(copy.toFile())) {
            check(stream.getFD().valid(), "the file is open");
            check(tavo.init(descriptorOf(copy), Tavo.MODE_HIGHLIGHT), 0, "init of a descriptor");
        }
        check(tavo.analyze(0, 0, 0), 0, "analyze");  // the descriptor is closed by now
        recorder.await();
        check(tavo.deinit(), 0, "deinit");
        check(recorder.highlightMs, expected, "highlight through a descriptor");
    }

    /** The path of this process's open descriptor of a file. */
    private static String descriptorOf(Path file) throws IOException {
        for (File each : new File("/proc/self/fd").listFiles()) {
            try {
                if (Files.isSameFile(each.toPath(), file)) return each.getPath();
            } catch (IOException closedMeanwhile) {
                continue;
            }
        }
        throw new AssertionError("no descriptor of " + file);
    }

    private static void forgottenObject() throws Exception {
        Recorder recorder = new Recorder();
        WeakReference<Tavo> forgotten = new WeakReference<>(new Tavo(recorder));
        check(forgotten.get().init(clip, Tavo.MODE_HIGHLIGHT), 0, "init");
        for (int i = 0; i < 100 && forgotten.get() != null; ++i) {
            System.gc();
            Thread.sleep(10);
        }
        check(forgotten.get() == null, "a forgotten object is collected");

        Recorder other = new Recorder();
        Tavo next = new Tavo(other);
        check(next.init(clip, Tavo.MODE_HIGHLIGHT), Tavo.ERROR_BUSY, "init beside a forgotten one");
        check(next.deinit(), 0, "deinit of a forgotten one");
        check(analyze(clip, Tavo.MODE_HIGHLIGHT).results, 1, "results after a forgotten one");
        check(recorder.events() + other.events(), 0, "events of a forgotten object");
    }

    private static void manyCycles() throws Exception {
        for (int i = 0; i < 10; ++i) analyze(clip, Tavo.MODE_HIGHLIGHT);
        long references = globalReferences();
        int threads = ManagementFactory.getThreadMXBean().getThreadCount();
        for (int i = 0; i < CYCLES; ++i) {
            Recorder recorder = new Recorder();
            Tavo tavo = new Tavo(recorder);
            check(tavo.init(clip, i % 3), 0, "init");
            check(tavo.analyze(0, 0, 0), 0, "analyze");
            if (i % 2 == 0) recorder.await();
            check(tavo.deinit(), 0, "deinit");
            check(recorder.events(), 1, "events of a cycle");
        }
        check(globalReferences(), references, "global references after " + CYCLES + " cycles");
        check(ManagementFactory.getThreadMXBean().getThreadCount(), threads, "threads");
    }

    /** The count at the end of the machine's own thread dump. */
    private static long globalReferences() throws Exception {
        String dump = (String) ManagementFactory.getPlatformMBeanServer().invoke(
                new ObjectName("com.sun.management:type=DiagnosticCommand"), "threadPrint",
                new Object[] {new String[0]}, new String[] {String[].class.getName()});
        Matcher found = Pattern.compile("JNI global refs: (\\d+)").matcher(dump);
        check(found.find(), "the thread dump counts the global references");
        return Long.parseLong(found.group(1));
    }
}
