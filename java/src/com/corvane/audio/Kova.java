// SPDX-License-Identifier: Apache-2.0
package com.corvane.audio;

/**
 * Java face of libKovaFastTrack: a touch stroke in, 16-bit PCM out.
 *
 * <p>An instance of the native library is named by an id from {@link #init}; every other method
 * takes that id. The methods are static because the native side keeps no per-object state: the
 * id carries the instance. Ids are 1 to 20; {@code init} returns 0 or -1 when it fails.
 *
 * <p>The library is loaded when this class is initialised: from the file named by the system
 * property {@code kova.library} when it is set (an absolute path, as used by tests), otherwise by
 * {@code System.loadLibrary("KovaFastTrack")} from {@code java.library.path}.
 *
 * <p>Results follow the native conventions: -3 for an invalid id, an empty slot or a missing
 * engine context in the control methods, 0 in the counting and generating methods. No method
 * throws. Arrays passed in must not be null.
 */
public final class Kova {
    /** System property naming the library file to load instead of searching the library path. */
    public static final String LIBRARY_PROPERTY = "kova.library";

    /** Motion phase of the event that puts the finger down: plays the set's start sound. */
    public static final int ACTION_START = 0;

    /** Motion phase of an event while the finger moves: plays loop sound shaped by the speed. */
    public static final int ACTION_MOVE = 1;

    /** Motion phase of the event that lifts the finger: plays the set's whole end sound. */
    public static final int ACTION_END = 2;

    /** Number of floats in one volume-table row: 16 step values and a factor. */
    public static final int VOLUME_ROW = 17;

    static {
        String path = System.getProperty(LIBRARY_PROPERTY);
        if (path != null && !path.isEmpty()) {
            System.load(path);
        } else {
            System.loadLibrary("KovaFastTrack");
        }
    }

    /** Not instantiated: an instance of the library is named by an id, not by an object. */
    private Kova() {}

    /**
     * Creates an instance: an engine context, a 960000-byte PCM buffer and a stopped low-latency
     * output stream (always 48000 Hz, 2 channels, whatever the format below).
     *
     * <p>Allocates; serialised with every other method by the process-wide registry lock.
     *
     * @param sampleRate the engine's sample rate in Hz. This must be from 8000 to 48000.
     * @param channels the engine's channel count. This must be 1 or 2.
     * @param p position panning: 1 pans each block by the touch position, any other value not.
     * @param w the screen width in pixels, used with {@code h} to normalise the touch speed.
     * @param h the screen height in pixels.
     * @return the instance id, 1 to 20; 0 when all 20 instances are in use, the buffer or the
     *     stream cannot be had, or the registry refuses the entry; -1 when the engine rejects the
     *     format or cannot be created
     */
    public static native long init(int sampleRate, int channels, int p, int w, int h);

    /**
     * Destroys an instance: closes its output stream, frees its PCM buffer and its engine.
     *
     * @param id an id returned by {@link #init}.
     * @return 0 when the instance was destroyed, or when the id's slot was already free; -3 for
     *     an id outside 1 to 20 or an instance without engine; the engine's negative code when it
     *     refused the teardown (the slot then stays in use)
     */
    public static native int deinit(long id);

    /**
     * Registers a source set from three raw PCM files (signed 16-bit interleaved little-endian
     * samples in the engine's format, no header) and makes it the active set. Reads the files.
     *
     * @param id an id returned by {@link #init}.
     * @param start the start sound's file, at most 38400 bytes, or {@code null} for none.
     * @param loop the loop sound's file, at most 192000 bytes. This must not be {@code null}.
     * @param end the end sound's file, at most 38400 bytes, or {@code null} for none.
     * @return the new set's 1-based index (the number of sets registered), 0 on failure, -3 for
     *     an invalid id or an empty slot
     */
    public static native int reg_src_byfiles(long id, String start, String loop, String end);

    /**
     * Makes a registered source set active and applies its thickness to the equaliser.
     *
     * @param id an id returned by {@link #init}.
     * @param index the set's 1-based index. This must be from 1 to {@link #get_src_num}, and
     *     differ from the index this method was last given for the instance.
     * @return 0 on success; -3 for an invalid id, an instance without engine, the index last
     *     given (the engine is not called), or an index the engine rejects
     */
    public static native int set_src(long id, int index);

    /**
     * Counts the instance's registered source sets.
     *
     * @param id an id returned by {@link #init}.
     * @return the number of sets, 0 to 21; 0 for an invalid id or an empty slot
     */
    public static native int get_src_num(long id);

    /**
     * Generates the block of one motion event into {@code out}: interleaved signed 16-bit
     * little-endian samples in the engine's format. Allocates nothing.
     *
     * @param id an id returned by {@link #init}.
     * @param out the destination. This must not be {@code null}; its length is the capacity in
     *     bytes and no byte beyond it is written.
     * @param x the touch position's x in pixels, 0 to the screen width.
     * @param y the touch position's y in pixels, 0 to the screen height.
     * @param time the event time in milliseconds, never decreasing within a stroke.
     * @param aux passed through; the engine does not read it.
     * @param action the motion phase. This must be one of {@link #ACTION_START},
     *     {@link #ACTION_MOVE} or {@link #ACTION_END}.
     * @return the number of bytes written; 0 for an invalid id, an empty slot, an empty array or
     *     an event the engine rejects
     */
    public static native int gen_sounds(
            long id, byte[] out, float x, float y, long time, float aux, int action);

    /**
     * Generates the block of one motion event into the instance's buffer and hands it to the
     * output stream, all or nothing: a block is queued only while the stream plays and only when
     * it fits whole, otherwise it is dropped. Never waits for the device and allocates nothing.
     *
     * @param id an id returned by {@link #init}.
     * @param x the touch position's x in pixels, 0 to the screen width.
     * @param y the touch position's y in pixels, 0 to the screen height.
     * @param time the event time in milliseconds, never decreasing within a stroke.
     * @param aux passed through; the engine does not read it.
     * @param action the motion phase. This must be one of {@link #ACTION_START},
     *     {@link #ACTION_MOVE} or {@link #ACTION_END}.
     * @return the number of bytes generated (queued or not); 0 for an invalid id, an empty slot
     *     or an event the engine rejects
     */
    public static native int gen_tofasttrack(
            long id, float x, float y, long time, float aux, int action);

    /**
     * Sets the tune set of a source set. Each value is taken only when it lies in 0.0 to 1.0 (a
     * value outside, or not a number, keeps the stored one, without an error); the oscillator
     * and sharpness pairs are taken together (see {@code oscEnable} and {@code sharpEnable}).
     *
     * @param id an id returned by {@link #init}.
     * @param index the set's 1-based index, 1 to {@link #get_src_num}.
     * @param gain factor of every phase's gain.
     * @param pan position panning depth.
     * @param oscEnable 1 lets the oscillator modulate the loop sound (taken with
     *     {@code oscDepth} only when that is in range); 0 turns it off; other values change
     *     nothing.
     * @param oscDepth oscillator frequency per unit of speed envelope, times 200 Hz.
     * @param sharpEnable 1 raises the loop sound's pitch with speed (taken with
     *     {@code sharpness} only when that is in range); 0 turns it off; other values change
     *     nothing.
     * @param sharpness pitch rise per unit of speed envelope, times 0.1.
     * @param wnGain level of a loop sound generated as noise.
     * @param fileGain level of a loop sound loaded from a file.
     * @param startGain gain of the start sound.
     * @param loopGain gain of the loop sound.
     * @param endGain gain of the end sound.
     * @return 0 when the values were applied (each in range); -3 for an invalid id, an instance
     *     without engine or an index out of range
     */
    public static native int set_tuneset(
            long id,
            int index,
            double gain,
            double pan,
            int oscEnable,
            double oscDepth,
            int sharpEnable,
            double sharpness,
            double wnGain,
            double fileGain,
            double startGain,
            double loopGain,
            double endGain);

    /**
     * Sets the thickness of the active source set and applies it to the equaliser. Succeeds
     * without effect while no set is active.
     *
     * @param id an id returned by {@link #init}.
     * @param thickness the thickness. This must be from 0.0 (thin) to 1.0 (thick).
     * @return 0 on success; -3 for an invalid id, an instance without engine or a thickness out of
     *     range
     */
    public static native int set_thickness(long id, double thickness);

    /**
     * Sets the output volume of every set of the instance; the engine stores {@code volume}
     * times 0.8 (1.0 gives the level at creation).
     *
     * @param id an id returned by {@link #init}.
     * @param volume the volume factor; no range is enforced, 0.0 to 1.0 keeps the level at or below
     *     the level at creation.
     * @return 0 on success; -3 for an invalid id or an instance without engine
     */
    public static native int set_volume(long id, double volume);

    /**
     * Stops the output stream and discards what it still held. Nothing happens for an invalid
     * id or an empty slot.
     *
     * @param id an id returned by {@link #init}.
     */
    public static native void stop_fasttrack(long id);

    /**
     * Starts the output stream; blocks then generated by {@link #gen_tofasttrack} are heard.
     * Nothing happens for an invalid id or an empty slot.
     *
     * @param id an id returned by {@link #init}.
     */
    public static native void start_fasttrack(long id);

    /**
     * Number of volume values for a device code. Takes no lock.
     *
     * @param device the device code; 1 and 2 have a table.
     * @return 17 for the device codes 1 and 2, 1 for any other code
     */
    public static native int get_volumeTableSize(int device);

    /**
     * Copies row 1 of the speaker table and row 1 of the headset table: 16 step volumes (0 to
     * 100) and a factor each. Takes no lock.
     *
     * @param speaker receives the speaker row. This must hold at least {@link #VOLUME_ROW} floats.
     * @param headset receives the headset row. This must hold at least {@link #VOLUME_ROW} floats.
     * @return always 0
     */
    public static native int get_volumeTable(float[] speaker, float[] headset);
}
