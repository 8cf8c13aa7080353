package com.kestu.tavo;

import java.io.File;
import java.io.IOException;
import java.io.InputStream;
import java.lang.management.ManagementFactory;
import java.lang.ref.WeakReference;
import java.nio.file.Files;
import java.nio.file.Path;
import java.nio.file.Paths;
import java.util.concurrent.CountDownLatch;
import java.util.concurrent.TimeUnit;
import java.util.regex.Matcher;
import java.util.regex.Pattern;
import javax.management.ObjectName;

/**
 * The bridge in a real Java virtual machine. Arguments: a song with beats, a clip of 2 s, an empty
 * directory. Ends by returning from main: a thread left attached keeps the machine from ending,
 * which the test's time limit turns into a failure.
 */
public final class BridgeTest {
    private static final int CYCLES = 1000;

    private static String song;
    private static String clip;
    private static Path directory;

    public static void main(String[] arguments) throws Exception {
        song = arguments[0];
        clip = arguments[1];
        directory = Paths.get(arguments[2]);
        Tavo.disableClickTrack();
        listenerThatCallsDeinitAndThrows();
        oddNamesAndDescriptors();
        forgottenObject();
        manyCycles();
        check(!new File("d:\\beattest\\__blips_0.wav").exists(), "no click track is written");
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
        final CountDownLatch told = new CountDownLatch(1);
        volatile int results;
        volatile int failures;
        volatile int highlightMs;
        volatile float[] beatsMs;

        @Override
        public void onResult(Tavo tavo, int highlight, float[] beats) {
            ++results;
            highlightMs = highlight;
            beatsMs = beats;
            told.countDown();
        }

        @Override
        public void onFailure(Tavo tavo, int highlight) {
            ++failures;
            told.countDown();
        }

        void await() throws InterruptedException {
            check(told.await(120, TimeUnit.SECONDS), "an event comes");
        }
    }

    private static Tavo start(Recorder recorder, String path, int mode) {
        Tavo tavo = new Tavo(recorder);
        check(tavo.init(path, mode), 0, "init of " + path);
        check(tavo.analyze(0, 0, 0), 0, "analyze");
        return tavo;
    }

    private static void end(Tavo tavo, Recorder recorder) {
        check(tavo.deinit(), 0, "deinit");
        check(recorder.results + recorder.failures, 1, "events of one analysis");
    }

    /** Runs one analysis from init to deinit and returns its result. */
    private static Recorder analyze(String path, int mode) throws InterruptedException {
        Recorder recorder = new Recorder();
        Tavo tavo = start(recorder, path, mode);
        recorder.await();
        end(tavo, recorder);
        check(recorder.results, 1, "results");
        return recorder;
    }

    private static void listenerThatCallsDeinitAndThrows() throws InterruptedException {
        Thread caller = Thread.currentThread();
        Tavo[] sender = new Tavo[1];
        int[] code = new int[1];
        Recorder recorder = new Recorder() {
            @Override
            public void onResult(Tavo tavo, int highlight, float[] beats) {
                if (Thread.currentThread() != caller) sender[0] = tavo;
                code[0] = tavo.deinit();
                super.onResult(tavo, highlight, beats);
                throw new IllegalStateException("thrown by a listener");
            }
        };
        Tavo tavo = start(recorder, song, Tavo.MODE_BOTH);
        recorder.await();
        end(tavo, recorder);
        check(sender[0] == tavo, "the event names its object, on a thread of its own");
        check(code[0], -1, "deinit inside an event");
        analyze(song, Tavo.MODE_BOTH);
    }

    /** A descriptor alone is what applications have; also the way for names with emoji. */
    private static void oddNamesAndDescriptors() throws Exception {
        int expected = analyze(song, Tavo.MODE_HIGHLIGHT).highlightMs;
        Path copy = directory.resolve("Lied \u2013 \u00e4\u00f6\u00fc \u97f3\u697d.wav");
        Files.copy(Paths.get(song), copy);
        check(analyze(copy.toString(), Tavo.MODE_HIGHLIGHT).highlightMs, expected, "highlight");

        Path emoji = Files.move(copy, directory.resolve("\ud83c\udfb5.wav"));
        Recorder recorder = new Recorder();
        Tavo tavo = new Tavo(recorder);
        check(tavo.init(emoji.toString(), Tavo.MODE_HIGHLIGHT), Tavo.ERROR_UNUSABLE,
                "init of a name outside the basic plane");
        InputStream stream = Files.newInputStream(emoji);
        check(tavo.init(descriptorOf(emoji), Tavo.MODE_HIGHLIGHT), 0, "init of a descriptor");
        stream.close();
        check(tavo.analyze(0, 0, 0), 0, "analyze");
        recorder.await();
        end(tavo, recorder);
        check(recorder.highlightMs, expected, "highlight through a descriptor");
    }

    /** The path of this process's open descriptor of a file. */
    private static String descriptorOf(Path file) throws IOException {
        for (File each : new File("/proc/self/fd").listFiles()) {
            if (each.exists() && Files.isSameFile(each.toPath(), file)) return each.getPath();
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

        Tavo next = new Tavo(recorder);
        check(next.init(clip, Tavo.MODE_HIGHLIGHT), Tavo.ERROR_BUSY, "init beside a forgotten one");
        check(next.deinit(), 0, "deinit of a forgotten one");
        analyze(clip, Tavo.MODE_HIGHLIGHT);
        check(recorder.results + recorder.failures, 0, "events of a forgotten object");
    }

    /** Every other one ends its job while it runs. */
    private static void manyCycles() throws Exception {
        for (int i = 0; i < 10; ++i) analyze(clip, Tavo.MODE_HIGHLIGHT);
        long references = globalReferences();
        int threads = ManagementFactory.getThreadMXBean().getThreadCount();
        for (int i = 0; i < CYCLES; ++i) {
            Recorder recorder = new Recorder();
            Tavo tavo = start(recorder, clip, i % 3);
            if (i % 2 == 0) recorder.await();
            end(tavo, recorder);
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
