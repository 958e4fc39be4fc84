// SPDX-License-Identifier: Apache-2.0
import com.corvane.audio.Kova;
import java.io.IOException;
import java.nio.ByteBuffer;
import java.nio.ByteOrder;
import java.nio.file.Files;
import java.nio.file.Path;
import java.util.Arrays;

/**
 * Time of Kova.gen_tofasttrack as a Java application calls it: one instance at 48000 Hz stereo on
 * a 1080x2280 screen with position panning, three registered files, the output stream playing.
 * After a warm-up long enough for the JIT, each call is timed on its own; the figures are the
 * median and the 90th percentile in microseconds. Between strokes the stream is stopped and
 * started again (not timed) so that the ring buffer never fills: every timed block is really
 * copied into it, as it is when events arrive at the pace of a finger.
 *
 * <p>Usage: java -Dkova.library=/path/libKovaFastTrack.so -cp CLASSES KovaBench [strokes]
 */
public final class KovaBench {
    private static final int MOVES_PER_STROKE = 100;
    private static final int WARMUP_STROKES = 300;
    private static final int[][] PATH = {{30, 40}, {12, -9}, {-45, 20}, {3, -51}};

    /** Noise-like 16-bit stereo PCM, little-endian, the same bytes on every run. */
    private static Path writeNoise(Path dir, String name, int bytes, int seed) throws IOException {
        ByteBuffer b = ByteBuffer.allocate(bytes).order(ByteOrder.LITTLE_ENDIAN);
        int state = seed * 0x9E3779B1 + 1;
        int[] smooth = new int[2];
        for (int i = 0; i < bytes / 2; i++) {
            state = state * 1664525 + 1013904223;
            int white = (state >>> 16) - 32768;
            smooth[i & 1] += (white - smooth[i & 1]) / 4;
            b.putShort((short) (smooth[i & 1] / 6));
        }
        Path p = dir.resolve(name);
        Files.write(p, b.array());
        return p;
    }

    /** Timings of one tuning: moves, starts and ends, in nanoseconds. */
    private static final class Timings {
        final long[] moves;
        final long[] starts;
        final long[] ends;
        int m;
        int s;
        int failures;

        Timings(int strokes) {
            moves = new long[strokes * MOVES_PER_STROKE];
            starts = new long[strokes];
            ends = new long[strokes];
        }
    }

    private static void strokes(long id, int count, Timings t) {
        for (int k = 0; k < count; k++) {
            float x = 540;
            float y = 1140;
            long time = 1000;
            long a = System.nanoTime();
            int n = Kova.gen_tofasttrack(id, x, y, time, 0, Kova.ACTION_START);
            long b = System.nanoTime();
            if (t != null) t.starts[t.s] = b - a;
            if (n <= 0 && t != null) t.failures++;
            for (int i = 0; i < MOVES_PER_STROKE; i++) {
                x += PATH[i & 3][0];
                y += PATH[i & 3][1];
                time += 16;
                a = System.nanoTime();
                n = Kova.gen_tofasttrack(id, x, y, time, 0, Kova.ACTION_MOVE);
                b = System.nanoTime();
                if (t != null) {
                    t.moves[t.m++] = b - a;
                    // 16 ms is 3072 bytes; a pitch-raised block comes out within a frame or two.
                    if (n < 3056 || n > 3072) t.failures++;
                }
            }
            a = System.nanoTime();
            n = Kova.gen_tofasttrack(id, x, y, time + 16, 0, Kova.ACTION_END);
            b = System.nanoTime();
            if (t != null) {
                t.ends[t.s++] = b - a;
                if (n <= 0) t.failures++;
            }
            // Empty the ring buffer so that the next stroke's blocks fit whole.
            Kova.stop_fasttrack(id);
            Kova.start_fasttrack(id);
        }
    }

    private static double percentileUs(long[] v, int count, double q) {
        long[] s = Arrays.copyOf(v, count);
        Arrays.sort(s);
        return s[(int) Math.min(count - 1, Math.floor(q * count))] / 1000.0;
    }

    private static int measure(long id, String label, int strokes, boolean osc, boolean pitch) {
        int rc = Kova.set_tuneset(id, 1, 1.0, 0.4, osc ? 1 : 0, 0.5, pitch ? 1 : 0, 0.2, 0.5,
                0.4, 0.6, 0.9, 0.6);
        if (rc != 0) {
            System.out.println("set_tuneset failed: " + rc);
            return 1;
        }
        strokes(id, WARMUP_STROKES, null);
        Timings t = new Timings(strokes);
        strokes(id, strokes, t);
        System.out.printf(
                "java %-11s move: median %.2f us, p90 %.2f us (%d calls); start: median %.2f us;"
                        + " end: median %.2f us%n",
                label, percentileUs(t.moves, t.m, 0.5), percentileUs(t.moves, t.m, 0.9), t.m,
                percentileUs(t.starts, t.s, 0.5), percentileUs(t.ends, t.s, 0.5));
        if (t.failures != 0) {
            System.out.println("java " + label + ": " + t.failures + " calls produced the wrong size");
            return 1;
        }
        return 0;
    }

    public static void main(String[] args) throws Exception {
        int strokes = args.length > 0 ? Integer.parseInt(args[0]) : 100;
        Path dir = Files.createTempDirectory("kova-bench");
        int failed = 0;
        try {
            Path start = writeNoise(dir, "start.pcm", 38400, 100);
            Path loop = writeNoise(dir, "loop.pcm", 192000, 101);
            Path end = writeNoise(dir, "end.pcm", 38400, 102);
            long id = Kova.init(48000, 2, 1, 1080, 2280);
            if (id < 1) {
                System.out.println("init failed: " + id);
                System.exit(1);
            }
            int set = Kova.reg_src_byfiles(id, start.toString(), loop.toString(), end.toString());
            if (set != 1 || Kova.set_src(id, 1) != 0) {
                System.out.println("registration failed: " + set);
                System.exit(1);
            }
            Kova.start_fasttrack(id);
            failed += measure(id, "plain", strokes, false, false);
            failed += measure(id, "all", strokes, true, true);
            Kova.stop_fasttrack(id);
            Kova.deinit(id);
        } finally {
            try (var files = Files.list(dir)) {
                for (Path p : (Iterable<Path>) files::iterator) Files.delete(p);
            }
            Files.delete(dir);
        }
        System.exit(failed == 0 ? 0 : 1);
    }
}
