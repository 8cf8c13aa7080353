package com.kestu.tavo;

import java.lang.ref.WeakReference;

/**
 * Finds the highlight and the beats of a song.
 *
 * <pre>{@code
 * Tavo.disableClickTrack();
 * Tavo tavo = new Tavo(listener);
 * if (tavo.init(path, Tavo.MODE_BOTH) == 0) tavo.analyze(30, 0, 0);
 * // The listener is called once, on another thread. Then, or to stop early:
 * tavo.deinit();
 * }</pre>
 *
 * <p><b>One analysis in a process.</b> All objects of this class share one native analysis, and the
 * object that was created last receives the events: create one object and keep it.
 *
 * <p><b>Order.</b> Call {@code init}, then {@code analyze} once. After the event, call {@code
 * deinit}, then {@code init} for the next file. {@code deinit} is allowed at any time after
 * {@code init}. It stops a running job, whose event still arrives before {@code deinit} returns.
 *
 * <p><b>Threads.</b> Call {@code init}, {@code analyze} and {@code deinit} from one thread, or from
 * several that take turns. {@code init} reads from the file and {@code deinit} waits for a running
 * job, so do not call them on a user-interface thread. Events arrive on a thread of the library.
 *
 * <p><b>Lifetime.</b> The library holds only a weak reference to this object. Keep your own
 * reference until the event has arrived; otherwise the event is lost. Only {@code deinit} releases
 * the native analysis: if an object is lost first, call {@code deinit} on the next one.
 *
 * <p><b>Click track.</b> The modes with beats write a diagnostic WAV file into the working
 * directory unless {@link #disableClickTrack} was called. On Android the working directory is not
 * writable, so no file is written.
 *
 * <p><b>Paths.</b> A path with characters outside the basic multilingual plane, such as emoji, is
 * not found, because Java passes them in its own encoding. Open such a file and pass {@code
 * "/proc/self/fd/" + number}, which also works for a descriptor without a name. Keep the descriptor
 * open until {@code init} has returned.
 */
public final class Tavo implements AutoCloseable {
    /** Finds the start of the highlight. */
    public static final int MODE_HIGHLIGHT = 0;

    /** Finds the beats of the whole file. */
    public static final int MODE_BEATS = 1;

    /** Finds the highlight, then the beats from there on. */
    public static final int MODE_BOTH = 2;

    /** {@code init}: this or another object has an open analysis. */
    public static final int ERROR_BUSY = -1;

    /** {@code init}: out of memory. */
    public static final int ERROR_MEMORY = -2;

    /** {@code init}: the path is null, or the file cannot be analysed. */
    public static final int ERROR_UNUSABLE = -4;

    private static final int EVENT_RESULT = 1;

    static {
        System.loadLibrary("tavo");
    }

    private final TavoListener listener;

    /**
     * Creates the object that receives all later events.
     *
     * @param listener receives the result of each analysis, not null
     */
    public Tavo(TavoListener listener) {
        if (listener == null) throw new NullPointerException("listener");
        this.listener = listener;
        native_setup(new WeakReference<>(this));
    }

    /**
     * Stops the library from writing its diagnostic click track, a WAV file in the working
     * directory that every analysis with beats overwrites. The effect is process-wide and
     * cannot be undone. Call this method before {@link #analyze}.
     */
    public static native void disableClickTrack();

    /**
     * Returns the reason why a file cannot be analysed. Needs no open analysis.
     *
     * @param path the file, may be null
     * @return an English clause without a period, or null if the file can be analysed
     */
    public static native String reason(String path);

    /**
     * Returns true if the analysis decoded the file to its end. Otherwise the event is a
     * failure. The value is valid from the event until {@link #deinit}.
     *
     * @return true if complete; always false before the event, after a stop or without {@code init}
     */
    public native boolean isComplete();

    /** Registers the first argument of the events: a weak reference to this object. */
    private native void native_setup(Object obj);

    /**
     * Opens a file and prepares its analysis.
     *
     * @param path the file, fewer than 512 bytes in UTF-8; for null the result is
     *     {@link #ERROR_UNUSABLE}
     * @param mode one of the modes above
     * @return 0, {@link #ERROR_BUSY}, {@link #ERROR_MEMORY} or {@link #ERROR_UNUSABLE}; an error
     *     changes nothing, and {@link #reason} explains {@link #ERROR_UNUSABLE}
     */
    public native int init(String path, int mode);

    /**
     * Starts the analysis on its own thread.
     *
     * @param highlightSeconds requested highlight length, 0 for none; not used in {@link #MODE_BEATS}
     * @param maxBeats maximum number of threshold-selected beats, 0 for no limit; not used in
     *     {@link #MODE_HIGHLIGHT}
     * @param reserved not used, 0
     * @return 0 if started; -1 if not, for instance because it was already started. Without
     *     {@code init}, returns 0, but nothing happens and no event follows.
     */
    public native int analyze(int highlightSeconds, int maxBeats, int reserved);

    /**
     * Ends the analysis: stops a running job, waits for its event and releases everything.
     *
     * @return 0, even if nothing was open; -1 if called by a listener
     */
    public native int deinit();

    /** Same as {@link #deinit}. */
    @Override
    public void close() {
        deinit();
    }

    /**
     * Called by the library once per analysis, on its worker thread. The library finds it by name
     * and signature.
     *
     * @param ref the argument of {@code native_setup}
     * @param what 1 for a result, 2 for a failure
     * @param arg1 start of the highlight, milliseconds
     * @param arg2 number of beats
     * @param beats the beat times in milliseconds, or null
     */
    private static void postEventFromNative(
            Object ref, int what, int arg1, int arg2, float[] beats) {
        Tavo tavo = (Tavo) ((WeakReference<?>) ref).get();
        if (tavo == null) return;
        if (what == EVENT_RESULT && tavo.isComplete()) {
            tavo.listener.onResult(tavo, arg1, beats != null ? beats : new float[0]);
        } else {
            tavo.listener.onFailure(tavo, arg1);
        }
    }
}
