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

    /** Motion phases of a touch stroke. */
    public static final int ACTION_START = 0;
    public static final int ACTION_MOVE = 1;
    public static final int ACTION_END = 2;

    /** Number of floats in one volume-table row. */
    public static final int VOLUME_ROW = 17;

    static {
        String path = System.getProperty(LIBRARY_PROPERTY);
        if (path != null && !path.isEmpty()) {
            System.load(path);
        } else {
            System.loadLibrary("KovaFastTrack");
        }
    }

    private Kova() {}

    /** Creates an instance; returns its id (1..20), 0 or -1 on failure. */
    public static native long init(int sampleRate, int channels, int p, int w, int h);

    /** Destroys an instance; returns the engine's teardown result, 0, or -3 for an invalid id. */
    public static native int deinit(long id);

    /** Registers a source set from raw PCM files; returns its 1-based index, 0 on failure. */
    public static native int reg_src_byfiles(long id, String start, String loop, String end);

    /** Makes a registered source set active. */
    public static native int set_src(long id, int index);

    /** Number of registered source sets. */
    public static native int get_src_num(long id);

    /** Generates the block for one motion event into {@code out}; returns the bytes written. */
    public static native int gen_sounds(
            long id, byte[] out, float x, float y, long time, float aux, int action);

    /** Generates the block for one motion event straight into the output stream. */
    public static native int gen_tofasttrack(
            long id, float x, float y, long time, float aux, int action);

    /** Sets the tune set of a source set; values outside 0..1 are ignored by the engine. */
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

    /** Sets the thickness (0..1) of the active source set. */
    public static native int set_thickness(long id, double thickness);

    /** Sets the output volume factor. */
    public static native int set_volume(long id, double volume);

    /** Stops the output stream and discards what it still held. */
    public static native void stop_fasttrack(long id);

    /** Starts the output stream. */
    public static native void start_fasttrack(long id);

    /** Number of volume values for a device code. */
    public static native int get_volumeTableSize(int device);

    /** Copies one row of the speaker and headset tables; each array should hold 17 floats. */
    public static native int get_volumeTable(float[] speaker, float[] headset);
}
