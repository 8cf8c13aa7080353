package com.kestu.tavo;

import java.io.File;
import java.io.InputStream;
import java.lang.management.ManagementFactory;
import java.lang.ref.WeakReference;
import java.nio.file.Files;
import java.nio.file.Path;
import java.nio.file.Paths;
import java.util.concurrent.CountDownLatch;
import java.util.concurrent.TimeUnit;
import javax.management.ObjectName;

/**
 * The bridge in a real virtual machine. Arguments: a song with beats, a clip of 2 s, an empty
 * directory. Ends by returning from main: a thread left attached would keep the machine from
 * exiting, and the test would run into its time limit.
 */
public final class BridgeTest {
    private static final int CYCLES = 1000;

    private static String song;
    private static String clip;

    public static void main(String[] arguments) throws Exception {
        song = arguments[0];
        clip = arguments[1];
        Tavo.disableClickTrack();
        listenerThatCallsDeinitAndThrows();
        oddNamesAndDescriptors(Paths.get(arguments[2]));
        lostObject();
        manyCycles();
        check(!new File("d:\\beattest\\__blips_0.wav").exists(), "no click track is written");
        System.out.println("all cases passed");
    }

    private static void check(boolean holds, String claim) {
        if (!holds) throw new AssertionError(claim);
    }

    private static void check(long got, long expected, String quantity) {
        check(got == expected, quantity + ": " + got + " instead of " + expected);
    }

    /** Keeps the events of one analysis. */
    private static class Recorder implements TavoListener {
        final CountDownLatch told = new CountDownLatch(1);
        volatile int results;
        volatile int failures;
        volatile int highlightMs;

        @Override
        public void onResult(Tavo tavo, int highlight, float[] beats) {
            ++results;
            highlightMs = highlight;
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

    /** Runs one analysis and returns its highlight. */
    private static int analyze(String path) throws InterruptedException {
        Recorder recorder = new Recorder();
        Tavo tavo = start(recorder, path, Tavo.MODE_HIGHLIGHT);
        recorder.await();
        end(tavo, recorder);
        check(recorder.results, 1, "results");
        return recorder.highlightMs;
    }

    private static void listenerThatCallsDeinitAndThrows() throws InterruptedException {
        Thread caller = Thread.currentThread();
        Tavo[] sender = new Tavo[1];
        int[] code = new int[1];
        Recorder recorder = new Recorder() {
            @Override
            public void onResult(Tavo tavo, int highlight, float[] beats) {
                if (Thread.currentThread() != caller && beats.length > 0) sender[0] = tavo;
                code[0] = tavo.deinit();
                super.onResult(tavo, highlight, beats);
                throw new IllegalStateException("thrown by a listener");
            }
        };
        Tavo tavo = start(recorder, song, Tavo.MODE_BOTH);
        recorder.await();
        end(tavo, recorder);
        check(sender[0] == tavo, "the event has beats and its object, on a thread of the library");
        check(code[0], -1, "deinit inside an event");
    }

    /** An emoji is not found by name, but through a descriptor, which is all some hosts have. */
    private static void oddNamesAndDescriptors(Path directory) throws Exception {
        int expected = analyze(song);
        Path copy = directory.resolve("Lied \u2013 \u00e4\u00f6\u00fc \u97f3\u697d.wav");
        Files.copy(Paths.get(song), copy);
        check(analyze(copy.toString()), expected, "highlight");

        Path emoji = Files.move(copy, directory.resolve("\ud83c\udfb5.wav"));
        int code = new Tavo(new Recorder()).init(emoji.toString(), Tavo.MODE_HIGHLIGHT);
        check(code, Tavo.ERROR_UNUSABLE, "init of a name outside the basic plane");
        InputStream open = Files.newInputStream(emoji);
        String descriptor = null;
        for (File each : new File("/proc/self/fd").listFiles()) {
            if (each.exists() && Files.isSameFile(each.toPath(), emoji)) {
                descriptor = each.getPath();
            }
        }
        check(analyze(descriptor), expected, "highlight through a descriptor");
        open.close();
    }

    private static void lostObject() throws Exception {
        Recorder recorder = new Recorder();
        WeakReference<Tavo> lost = new WeakReference<>(new Tavo(recorder));
        check(lost.get().init(clip, Tavo.MODE_HIGHLIGHT), 0, "init");
        for (int i = 0; i < 100 && lost.get() != null; ++i) {
            System.gc();
            Thread.sleep(10);
        }
        check(lost.get() == null, "a lost object is collected");

        Tavo next = new Tavo(recorder);
        check(next.init(clip, Tavo.MODE_HIGHLIGHT), Tavo.ERROR_BUSY, "init beside a lost one");
        check(next.deinit(), 0, "deinit of a lost one");
        analyze(clip);
        check(recorder.results + recorder.failures, 0, "events of a lost object");
    }

    /** Every other cycle ends its job while it runs. */
    private static void manyCycles() throws Exception {
        for (int i = 0; i < 10; ++i) analyze(clip);
        String references = globalReferences();
        int threads = ManagementFactory.getThreadMXBean().getThreadCount();
        for (int i = 0; i < CYCLES; ++i) {
            Recorder recorder = new Recorder();
            Tavo tavo = start(recorder, clip, i % 3);
            if (i % 2 == 0) recorder.await();
            end(tavo, recorder);
        }
        check(globalReferences().equals(references), "global references stay " + references);
        check(ManagementFactory.getThreadMXBean().getThreadCount(), threads, "threads");
    }

    /** The line at the end of the machine's own thread dump. */
    private static String globalReferences() throws Exception {
        String dump = (String) ManagementFactory.getPlatformMBeanServer().invoke(
                new ObjectName("com.sun.management:type=DiagnosticCommand"), "threadPrint",
                new Object[] {new String[0]}, new String[] {String[].class.getName()});
        int at = dump.indexOf("JNI global refs: ");
        check(at >= 0, "the thread dump counts the global references");
        return dump.substring(at).split(",")[0].trim();
    }
}
