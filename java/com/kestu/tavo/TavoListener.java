package com.kestu.tavo;

/**
 * Receives the one event of an analysis.
 *
 * <p>Both methods run on the library's worker thread, never on the thread that called
 * {@link Tavo#analyze}; an application that touches its user interface hands the values to its own
 * thread first. A listener returns soon and must not call {@link Tavo#deinit}, which answers -1
 * there: the job is not over before the listener has returned. What a listener throws is written to
 * the log and dropped.
 */
public interface TavoListener {
    /**
     * The analysis has found what its mode looks for.
     *
     * @param tavo the object whose {@code analyze} was called
     * @param highlightMs start of the highlight, milliseconds from the start of the file; 0 in
     *     {@link Tavo#MODE_BEATS}
     * @param beatsMs beat times, milliseconds from the start of the file, ascending; empty in
     *     {@link Tavo#MODE_HIGHLIGHT}. The array is the listener's to keep.
     */
    void onResult(Tavo tavo, int highlightMs, float[] beatsMs);

    /**
     * No beats were found, the analysis was stopped, or memory ran out.
     *
     * @param tavo the object whose {@code analyze} was called
     * @param highlightMs start of the highlight in milliseconds when {@link Tavo#MODE_BOTH} had
     *     found it before it failed, else 0
     */
    void onFailure(Tavo tavo, int highlightMs);
}
