// SPDX-License-Identifier: Apache-2.0
package com.corvane.audio;

import static org.junit.jupiter.api.Assertions.assertArrayEquals;
import static org.junit.jupiter.api.Assertions.assertEquals;
import static org.junit.jupiter.api.Assertions.assertTrue;

import java.io.ByteArrayOutputStream;
import java.io.IOException;
import java.nio.ByteBuffer;
import java.nio.ByteOrder;
import java.nio.file.Files;
import java.nio.file.Path;
import java.util.ArrayList;
import java.util.Arrays;
import java.util.List;
import org.junit.jupiter.api.AfterEach;
import org.junit.jupiter.api.BeforeEach;
import org.junit.jupiter.api.Test;
import org.junit.jupiter.api.io.TempDir;

/** The native methods of {@link Kova}, called from a real JVM through the real library. */
class KovaTest {
    static {
        KovaTestHooks.LOAD_LINES.size();
    }

    private static final long PID = ProcessHandle.current().pid();
    private static final int PCM_BYTES = 960000;

    @TempDir Path dir;
    private final List<Long> live = new ArrayList<>();

    @BeforeEach
    void clearLogs() {
        KovaTestHooks.logs();
    }

    @AfterEach
    void releaseInstances() {
        for (long id : live) Kova.deinit(id);
        KovaTestHooks.useNullSink();
    }

    private long open() {
        long id = Kova.init(48000, 2, 1, 1080, 2280);
        assertTrue(id >= 1 && id <= 20, "init gave " + id);
        live.add(id);
        return id;
    }

    private void close(long id) {
        live.remove(Long.valueOf(id));
        assertEquals(0, Kova.deinit(id));
    }

    /** A low-level stereo sine as raw little-endian 16-bit PCM: loud enough to hear, never clips. */
    private String pcmFile(String name, int bytes, double hz) throws IOException {
        ByteBuffer b = ByteBuffer.allocate(bytes).order(ByteOrder.LITTLE_ENDIAN);
        for (int i = 0; b.remaining() >= 4; i++) {
            short v = (short) (400 * Math.sin(2 * Math.PI * hz * i / 48000.0));
            b.putShort(v).putShort(v);
        }
        Path p = dir.resolve(name);
        Files.write(p, b.array());
        return p.toString();
    }

    private long openWithSource() throws IOException {
        long id = open();
        int idx =
                Kova.reg_src_byfiles(
                        id,
                        pcmFile("start.pcm", 9600, 880),
                        pcmFile("loop.pcm", 192000, 220),
                        pcmFile("end.pcm", 9600, 440));
        assertEquals(1, idx);
        assertEquals(0, Kova.set_src(id, 1));
        return id;
    }

    @Test
    void loadingTheLibraryInitialisesTheRegistry() {
        assertEquals(List.of("KOVA_JNI_OnLoad(init)"), KovaTestHooks.LOAD_LINES);
    }

    @Test
    void twentyInstancesThenFullAndSlotReuse() {
        for (int i = 1; i <= 20; i++) assertEquals(i, open());
        assertEquals(
                List.of("kova_init()", "kova_init(id:1,48000hz,2ch,p:1,w:1080,h:2280)"),
                KovaTestHooks.logs().subList(0, 2));
        assertEquals(0, Kova.init(48000, 2, 1, 1080, 2280));
        assertEquals(List.of("kova_init()", "KOVA instance MAX"), KovaTestHooks.logs());

        close(1);
        assertEquals(List.of("kova_deinit()", "kova_deinit(id:1, pid:" + PID + ")"),
                KovaTestHooks.logs());
        assertEquals(1, open());
    }

    /** Arguments arrive in their declared order and kinds: the logged values show it. */
    @Test
    void selectionAndControls() throws IOException {
        long id = open();
        assertEquals(1, Kova.reg_src_byfiles(id, null, pcmFile("loop.pcm", 19200, 220), null));
        assertEquals(1, Kova.get_src_num(id));
        KovaTestHooks.logs();
        assertEquals(0, Kova.set_src(id, 1));
        assertEquals(-3, Kova.set_src(id, 1));
        assertEquals(0, Kova.set_tuneset(id, 1, 1.0, 0.3, 1, 0.5, 0, 0.25, 0.0, 0.4, 0.6, 0.9, 0.7));
        assertEquals(0, Kova.set_thickness(id, 0.5));
        assertEquals(0, Kova.set_volume(id, 0.75));
        assertEquals(
                List.of(
                        "kova_set_actiive_src (1, active1)",
                        "kova_set_tuneset(1,1.000000,0.300000,(1,0.500000),(0,0.250000),"
                                + "0.000000,0.400000,0.600000,0.900000,0.700000)",
                        "kova_set_thickness(1,0.500000)",
                        "kova_set_volume(1,0.750000)"),
                KovaTestHooks.logs());
    }

    @Test
    void volumeTables() {
        assertEquals(17, Kova.get_volumeTableSize(1));
        assertEquals(17, Kova.get_volumeTableSize(2));
        assertEquals(1, Kova.get_volumeTableSize(0));
        assertEquals(1, Kova.get_volumeTableSize(-1));
        float[] spk = new float[17];
        float[] hs = new float[17];
        assertEquals(0, Kova.get_volumeTable(spk, hs));
        assertArrayEquals(
                new float[] {0, 78, 79, 80, 81, 82, 83, 84, 85, 87, 88, 90, 92, 94, 96, 98, 1}, spk);
        assertArrayEquals(
                new float[] {0, 63, 65, 67, 69, 71, 73, 76, 79, 82, 85, 88, 91, 94, 97, 100, 1}, hs);
    }

    private static boolean endsWith(byte[] got, byte[] tail) {
        int lead = got.length - tail.length;
        return lead >= 0 && Arrays.equals(got, lead, got.length, tail, 0, tail.length);
    }

    /**
     * A stroke sent to the output stream reaches the device whole and in order: after the silence
     * of the device's first request (made while the stream was still switching to playing, which
     * leaves the platform's buffer as it was), the captured bytes equal the blocks that a second
     * instance with the same sources generates for the same events.
     */
    @Test
    void strokeReachesTheDeviceInOrder() throws Exception {
        long reference = openWithSource();
        KovaTestHooks.useCaptureSink();
        long played = openWithSource();
        KovaTestHooks.clearCapture();
        byte[] out = new byte[PCM_BYTES];

        // While stopped, generation runs but nothing reaches the device.
        int early = Kova.gen_tofasttrack(played, 50, 50, 500, 0, Kova.ACTION_START);
        assertEquals(early, Kova.gen_sounds(reference, out, 50, 50, 500, 0, Kova.ACTION_START));
        assertTrue(early > 0);

        Kova.start_fasttrack(played);
        ByteArrayOutputStream expected = new ByteArrayOutputStream();
        float x = 100;
        float y = 300;
        long t = 1000;
        int moves = 0;
        for (int i = 0; i <= 40; i++) {
            int action = i == 0 ? Kova.ACTION_START : i == 40 ? Kova.ACTION_END : Kova.ACTION_MOVE;
            int n = Kova.gen_tofasttrack(played, x, y, t, 0, action);
            assertEquals(n, Kova.gen_sounds(reference, out, x, y, t, 0, action), "event " + i);
            expected.write(out, 0, n);
            if (action == Kova.ACTION_MOVE && n > 0) moves++;
            int step = 8 + i % 9;
            Thread.sleep(step);
            t += step;
            x += 3 + (i % 4) * 2;
            y += (i % 3) * 4;
        }
        assertTrue(moves >= 30, "moves that produced sound: " + moves);

        byte[] want = expected.toByteArray();
        // The device plays in real time: wait until it has taken the last block (or give up).
        long deadline = System.nanoTime() + 30_000_000_000L;
        byte[] got = KovaTestHooks.capture();
        while (!endsWith(got, want) && System.nanoTime() < deadline) {
            Thread.sleep(10);
            got = KovaTestHooks.capture();
        }
        assertTrue(got.length >= want.length, "captured " + got.length + " of " + want.length);
        int lead = got.length - want.length;
        for (int i = 0; i < lead; i++) assertEquals(0, got[i], "leading byte " + i);
        assertArrayEquals(want, Arrays.copyOfRange(got, lead, got.length));
        Kova.stop_fasttrack(played);
    }
}
