package com.kestu.tavo;

import java.io.File;
import java.io.InputStream;
import java.lang.ref.WeakReference;
import java.nio.file.Files;
import java.nio.file.Path;
import java.nio.file.Paths;
import java.util.concurrent.CountDownLatch;
import java.util.concurrent.TimeUnit;

/**
 * Tests the bridge in a real virtual machine, which only exits once all threads are detached.
 * Arguments: a song with beats, a clip of 2 s, an empty directory.
 */
public final class BridgeTest {
    public static void main(String[] arguments) throws Exception {
        String song = arguments[0];
        String clip = arguments[1];
        Tavo.disableClickTrack();
        check(analyze(song, Tavo.MODE_BOTH, false).beats > 0, true, "beats were found");
        check(new File("d:\\beattest\\__blips_0.wav").exists(), false, "a click track");
        check(Tavo.reason(song) == null, true, "a song has no reason");
        check(Tavo.reason("missing"), "the file cannot be opened or has no audio stream", "reason");
        check(new Tavo(new Recorder()).isComplete(), false, "complete without an analysis");
        oddNamesAndDescriptors(song, Paths.get(arguments[2]));
        lostObject(clip);
        for (int i = 0; i < 300; ++i) analyze(clip, i % 3, i % 2 != 0);
        System.out.println("all cases passed");
    }

    private static void check(Object got, Object expected, String quantity) {
        if (!got.equals(expected)) {
            throw new AssertionError(quantity + ": " + got + " instead of " + expected);
        }
    }

    /** Records the event of an analysis. Each method calls deinit, which fails, and then throws an exception. */
    private static final class Recorder implements TavoListener {
        final CountDownLatch posted = new CountDownLatch(1);
        volatile String events = "";  // one result of deinit per event
        volatile int highlight;
        volatile int beats;

        @Override
        public void onResult(Tavo tavo, int highlightMs, float[] beatsMs) {
            beats = beatsMs.length;
            onFailure(tavo, highlightMs);
        }

        @Override
        public void onFailure(Tavo tavo, int highlightMs) {
            highlight = highlightMs;
            events += tavo.deinit();
            posted.countDown();
            throw new IllegalStateException("thrown by a listener");
        }
    }

    /** Runs one analysis and waits for its event, or stops it immediately. */
    private static Recorder analyze(String path, int mode, boolean stop) throws Exception {
        Recorder recorder = new Recorder();
        Tavo tavo = new Tavo(recorder);
        check(tavo.init(path, mode), 0, "init of " + path);
        check(tavo.analyze(0, 0, 0), 0, "analyze");
        if (!stop) check(recorder.posted.await(120, TimeUnit.SECONDS), true, "an event arrives");
        check(tavo.deinit(), 0, "deinit");
        check(recorder.events, "-1", "one event, with deinit inside");
        return recorder;
    }

    private static int highlight(String path) throws Exception {
        Recorder recorder = analyze(path, Tavo.MODE_HIGHLIGHT, false);
        check(recorder.beats, 0, "beats of a highlight");
        return recorder.highlight;
    }

    /** A file whose name contains an emoji cannot be opened, except through a descriptor. */
    private static void oddNamesAndDescriptors(String song, Path directory) throws Exception {
        int expected = highlight(song);
        Path copy = directory.resolve("Lied \u2013 \u00e4\u00f6\u00fc \u97f3\u697d.wav");
        Files.copy(Paths.get(song), copy);
        check(highlight(copy.toString()), expected, "highlight");

        Path emoji = Files.move(copy, directory.resolve("\ud83c\udfb5.wav"));
        int code = new Tavo(new Recorder()).init(emoji.toString(), Tavo.MODE_HIGHLIGHT);
        check(code, Tavo.ERROR_UNUSABLE, "init of a name outside the basic plane");
        InputStream open = Files.newInputStream(emoji);
        String descriptor = null;
        for (File each : new File("/proc/self/fd").listFiles()) {
            if (each.exists() && Files.isSameFile(each.toPath(), emoji)) descriptor = each.getPath();
        }
        check(highlight(descriptor), expected, "highlight through a descriptor");
        open.close();
    }

    private static void lostObject(String clip) throws Exception {
        Recorder recorder = new Recorder();
        WeakReference<Tavo> lost = new WeakReference<>(new Tavo(recorder));
        check(lost.get().init(clip, Tavo.MODE_HIGHLIGHT), 0, "init");
        while (lost.get() != null) System.gc();

        Tavo next = new Tavo(recorder);
        check(next.init(clip, Tavo.MODE_HIGHLIGHT), Tavo.ERROR_BUSY, "init beside a lost one");
        check(next.deinit(), 0, "deinit of a lost one");
        highlight(clip);
        check(recorder.events, "", "events of a lost object");
    }
}
