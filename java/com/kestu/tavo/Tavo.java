package com.kestu.tavo;

import java.lang.ref.WeakReference;

/**
 * Finds the highlight and the beats of a song.
 *
 * <pre>{@code
 * Tavo.disableClickTrack();
 * Tavo tavo = new Tavo(listener);
 * if (tavo.init(path, Tavo.MODE_BOTH) == 0) tavo.analyze(30, 0, 0);
 * // the listener is called once, on another thread; then, or to stop early:
 * tavo.deinit();
 * }</pre>
 *
 * <p><b>One analysis in a process.</b> All objects of this class drive the same one native
 * analysis, and events go to the object that was made last: make one and keep it.
 *
 * <p><b>Order.</b> {@code init}, {@code analyze} once, the event once, {@code deinit}; a new
 * analysis starts over with {@code init}. {@code deinit} may come at any time after {@code init}
 * and ends a running job, whose event still comes before it returns.
 *
 * <p><b>Threads.</b> {@code init}, {@code analyze} and {@code deinit} are called from one thread,
 * or one after another. {@code init} reads the head of the file and {@code deinit} waits for a
 * running job: neither belongs on a thread that draws. Events come on a thread of the library's.
 *
 * <p><b>Lifetime.</b> The library holds this object weakly: keep a reference for as long as the
 * event is wanted, since that of a collected object is dropped. The native analysis itself is
 * released by {@code deinit} alone; what a forgotten object has left open, the next object's
 * {@code deinit} releases.
 *
 * <p><b>Click track.</b> The modes with beats write a diagnostic WAV file into the working directory
 * unless {@link #disableClickTrack} was called. On Android the working directory is not writable and
 * no file appears.
 *
 * <p><b>Paths.</b> Characters outside the basic multilingual plane (emoji, for one) reach the
 * library in Java's own form and name no file: open such a file and pass
 * {@code "/proc/self/fd/" + number} instead, which is also the way for a file descriptor without a
 * name. The descriptor is needed until {@code init} has returned.
 */
public final class Tavo implements AutoCloseable {
    /** Finds the start of the highlight. */
    public static final int MODE_HIGHLIGHT = 0;

    /** Finds the beats of the whole file. */
    public static final int MODE_BEATS = 1;

    /** Finds the highlight, then the beats from there on. */
    public static final int MODE_BOTH = 2;

    /** {@code init}: an analysis is open already, of this or of another object. */
    public static final int ERROR_BUSY = -1;

    /** {@code init}: out of memory. */
    public static final int ERROR_MEMORY = -2;

    /** {@code init}: the path is null or names no file that can be analysed. */
    public static final int ERROR_UNUSABLE = -4;

    private static final int EVENT_RESULT = 1;

    static {
        System.loadLibrary("tavo");
    }

    private final TavoListener listener;

    /**
     * Makes this object the one that receives the events of the process.
     *
     * @param listener told of each analysis's result, not null
     */
    public Tavo(TavoListener listener) {
        if (listener == null) throw new NullPointerException("listener");
        this.listener = listener;
        native_setup(new WeakReference<>(this));
    }

    /**
     * Stops the library from writing its diagnostic click track, a WAV file in the working directory
     * that every analysis with beats overwrites. It holds for the whole process and cannot be undone.
     * Call it before {@link #analyze}.
     */
    public static native void disableClickTrack();

    /** Tells the library whom its events are for: the object's own weak reference. */
    private native void native_setup(Object obj);

    /**
     * Opens a file and plans its analysis.
     *
     * @param path the file, fewer than 512 bytes in UTF-8
     * @param mode one of the modes above
     * @return 0, {@link #ERROR_BUSY}, {@link #ERROR_MEMORY} or {@link #ERROR_UNUSABLE}; nothing has
     *     changed after an error
     */
    public native int init(String path, int mode);

    /**
     * Starts the analysis on a thread of its own.
     *
     * @param highlightSeconds highlight length wanted, 0 for none; not used in {@link #MODE_BEATS}
     * @param maxBeats most beats to choose, 0 for no limit; not used in {@link #MODE_HIGHLIGHT}
     * @param reserved not used, 0
     * @return 0 when started, -1 when not (it was started before); 0 also without {@code init}, when
     *     nothing happens and no event comes
     */
    public native int analyze(int highlightSeconds, int maxBeats, int reserved);

    /**
     * Ends the analysis: waits until a running job has delivered its event, then releases it.
     *
     * @return 0, also when nothing was open; -1 when called by a listener
     */
    public native int deinit();

    /** The same as {@link #deinit}. */
    @Override
    public void close() {
        deinit();
    }

    /**
     * Called by the library, by this name and signature, once per analysis on its worker thread.
     *
     * @param ref what {@code native_setup} was given
     * @param what 1 a result, 2 a failure
     * @param arg1 start of the highlight, milliseconds
     * @param arg2 number of beats
     * @param beats the beat times in milliseconds, null when there are none
     */
    private static void postEventFromNative(
            Object ref, int what, int arg1, int arg2, float[] beats) {
        Tavo tavo = (Tavo) ((WeakReference<?>) ref).get();
        if (tavo == null) return;
        if (what == EVENT_RESULT) {
            tavo.listener.onResult(tavo, arg1, beats != null ? beats : new float[0]);
        } else {
            tavo.listener.onFailure(tavo, arg1);
        }
    }
}
