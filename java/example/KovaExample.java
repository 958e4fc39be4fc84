// SPDX-License-Identifier: Apache-2.0
import com.corvane.audio.Kova;
import java.io.IOException;
import java.nio.ByteBuffer;
import java.nio.ByteOrder;
import java.nio.file.Files;
import java.nio.file.Path;
import java.util.Random;

/**
 * How an application plays a pen stroke with libKovaFastTrack: create an instance, register a
 * start/loop/end sound, select it, start the output, send the touch events of one stroke, stop
 * and release. Exits with status 1 if any step fails.
 */
public final class KovaExample {
    private static int failures = 0;

    private static void check(String what, boolean ok, Object result) {
        System.out.println((ok ? "ok   " : "FAIL ") + what + " -> " + result);
        if (!ok) failures++;
    }

    /** Raw 16-bit little-endian stereo: a soft scratch of filtered noise under a fading tone. */
    private static Path writeSound(Path dir, String name, int bytes, double hz, long seed)
            throws IOException {
        ByteBuffer b = ByteBuffer.allocate(bytes).order(ByteOrder.LITTLE_ENDIAN);
        Random noise = new Random(seed);
        double smooth = 0;
        int frames = bytes / 4;
        for (int i = 0; i < frames; i++) {
            smooth = 0.8 * smooth + 0.2 * noise.nextGaussian();
            double fade = 1.0 - (double) i / frames;
            double v = 250 * smooth + 150 * fade * Math.sin(2 * Math.PI * hz * i / 48000.0);
            b.putShort((short) v).putShort((short) v);
        }
        Path p = dir.resolve(name);
        Files.write(p, b.array());
        return p;
    }

    public static void main(String[] args) throws Exception {
        Path dir = Files.createTempDirectory("kova-example");
        try {
            Path start = writeSound(dir, "pen_down.pcm", 19200, 1200, 1);
            Path loop = writeSound(dir, "pen_move.pcm", 192000, 180, 2);
            Path end = writeSound(dir, "pen_up.pcm", 9600, 900, 3);

            long id = Kova.init(48000, 2, 1, 1080, 2280);
            check("init(48000 Hz, 2 ch, panning, 1080x2280)", id >= 1 && id <= 20, id);
            if (id < 1) System.exit(1);

            int set = Kova.reg_src_byfiles(id, start.toString(), loop.toString(), end.toString());
            check("reg_src_byfiles(pen_down, pen_move, pen_up)", set == 1, set);
            int sel = Kova.set_src(id, set);
            check("set_src(" + set + ")", sel == 0, sel);
            int vol = Kova.set_volume(id, 0.9);
            check("set_volume(0.9)", vol == 0, vol);
            Kova.start_fasttrack(id);
            System.out.println("ok   start_fasttrack");

            // A diagonal swipe: pen down, 30 moves about every 12 ms, pen up.
            long t = 0;
            float x = 200;
            float y = 400;
            int total = 0;
            int down = Kova.gen_tofasttrack(id, x, y, t, 0, Kova.ACTION_START);
            check("stroke: pen down", down > 0, down + " bytes");
            total += down;
            for (int i = 0; i < 30; i++) {
                int dt = 10 + (i % 5);
                Thread.sleep(dt);
                t += dt;
                x += 12;
                y += 7;
                total += Kova.gen_tofasttrack(id, x, y, t, 0, Kova.ACTION_MOVE);
            }
            int up = Kova.gen_tofasttrack(id, x, y, t + 12, 0, Kova.ACTION_END);
            check("stroke: pen up", up > 0, up + " bytes");
            total += up;
            check("stroke: whole", total > down + up, total + " bytes, "
                    + String.format("%.0f ms of sound", total / 192.0));
            Thread.sleep(200);

            Kova.stop_fasttrack(id);
            System.out.println("ok   stop_fasttrack");
            int rc = Kova.deinit(id);
            check("deinit", rc == 0, rc);
        } finally {
            try (var files = Files.list(dir)) {
                for (Path p : (Iterable<Path>) files::iterator) Files.delete(p);
            }
            Files.delete(dir);
        }
        System.out.println(failures == 0 ? "example finished" : failures + " step(s) failed");
        System.exit(failures == 0 ? 0 : 1);
    }
}
