package com.kestu.tavo;

/**
 * Receives the result of an analysis through exactly one call to one of these methods.
 *
 * <p>Both methods run on a thread of the library, never on the thread that called
 * {@link Tavo#analyze}. Pass the values to your own thread before you touch a user interface.
 * Return quickly, and do not call {@link Tavo#deinit}, which returns -1 there. If a method throws
 * an exception, the library logs it and goes on.
 */
public interface TavoListener {
    /**
     * The analysis succeeded.
     *
     * @param tavo the object whose {@code analyze} was called, not null
     * @param highlightMs start of the highlight, milliseconds from the start of the file; 0 in
     *     {@link Tavo#MODE_BEATS}
     * @param beatsMs beat times, milliseconds from the start of the file, ascending; not null, empty in
     *     {@link Tavo#MODE_HIGHLIGHT}. The listener may keep the array.
     */
    void onResult(Tavo tavo, int highlightMs, float[] beatsMs);

    /**
     * The analysis failed: it found no beats, was stopped, ran out of memory, or could not read the
     * file to its end (then {@link Tavo#isComplete} is false).
     *
     * @param tavo the object whose {@code analyze} was called, not null
     * @param highlightMs start of the highlight in milliseconds if {@link Tavo#MODE_BOTH} found it
     *     before the failure, otherwise 0
     */
    void onFailure(Tavo tavo, int highlightMs);
}
