// SPDX-License-Identifier: Apache-2.0
package com.corvane.audio;

import static org.junit.jupiter.api.Assertions.assertArrayEquals;
import static org.junit.jupiter.api.Assertions.assertEquals;
import static org.junit.jupiter.api.Assertions.assertTrue;

import java.io.ByteArrayOutputStream;
import java.nio.ByteBuffer;
import java.nio.ByteOrder;
import java.nio.file.Files;
import java.nio.file.Path;
import java.util.ArrayList;
import java.util.Arrays;
import java.util.List;
import org.junit.jupiter.api.AfterEach;
import org.junit.jupiter.api.Test;
import org.junit.jupiter.api.io.TempDir;

// The native methods of Kova called from a real JVM through the real library: what only a JVM
// proves (class loading runs the load hook, the bindings take their arguments in the declared
// order, results and arrays cross JNI). The results at the edges are checked in tests/jni.
class KovaTest {
    static {
        KovaTestHooks.LOAD_LINES.size(); // the hook library loads first, then the Kova class
    }

    @TempDir Path dir;
    private final List<Long> live = new ArrayList<>();

    @AfterEach
    void releaseInstances() {
        for (long id : live) Kova.deinit(id);
        KovaTestHooks.useNullSink();
    }

    private long open() {
        long id = Kova.init(48000, 2, 1, 1080, 2280);
        live.add(id);
        return id;
    }

    // An instance with one set of quiet stereo sines (raw little-endian 16-bit PCM), selected.
    private long openWithSource() throws Exception {
        String[] paths = new String[3];
        int[] sizes = {9600, 192000, 9600};
        for (int s = 0; s < 3; s++) {
            ByteBuffer b = ByteBuffer.allocate(sizes[s]).order(ByteOrder.LITTLE_ENDIAN);
            for (int i = 0; b.remaining() >= 4; i++) {
                short v = (short) (400 * Math.sin(2 * Math.PI * 220 * (s + 1) * i / 48000.0));
                b.putShort(v).putShort(v);
            }
            Path p = dir.resolve("s" + s + ".pcm");
            Files.write(p, b.array());
            paths[s] = p.toString();
        }
        long id = open();
        assertEquals(1, Kova.reg_src_byfiles(id, paths[0], paths[1], paths[2]));
        assertEquals(0, Kova.set_src(id, 1));
        return id;
    }

    @Test
    void loadHookRunsOnceAndTwentyInstancesFitThenSlotsAreReused() {
        assertEquals(List.of("KOVA_JNI_OnLoad(init)"), KovaTestHooks.LOAD_LINES);
        KovaTestHooks.logs();
        for (int i = 1; i <= 20; i++) assertEquals(i, open());
        assertEquals(0, Kova.init(48000, 2, 1, 1080, 2280));
        live.remove(0);
        assertEquals(0, Kova.deinit(1));
        assertEquals(1, open());
        List<String> lines = KovaTestHooks.logs();
        assertEquals(
                List.of("kova_init()", "kova_init(id:1,48000hz,2ch,p:1,w:1080,h:2280)"),
                lines.subList(0, 2));
        assertEquals(
                List.of("kova_init()", "KOVA instance MAX", "kova_deinit()"),
                lines.subList(40, 43));
    }

    // The tune set's eleven values arrive in their declared order: the logged values show it.
    @Test
    void tuneSetTakesItsArgumentsInOrder() throws Exception {
        long id = openWithSource();
        KovaTestHooks.logs();
        assertEquals(0, Kova.set_tuneset(id, 1, 1.0, 0.3, 1, 0.5, 0, 0.25, 0.0, 0.4, 0.6, 0.9, 0.7));
        assertEquals(
                List.of(
                        "kova_set_tuneset(1,1.000000,0.300000,(1,0.500000),(0,0.250000),"
                                + "0.000000,0.400000,0.600000,0.900000,0.700000)"),
                KovaTestHooks.logs());
    }

    @Test
    void volumeTablesFillJavaArrays() {
        assertEquals(17, Kova.get_volumeTableSize(1));
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

    // A stroke sent to the output stream reaches the device whole and in order: after leading
    // silence (device requests made while the stream was still switching to playing), the
    // captured bytes equal the Java arrays that a second instance fills for the same events.
    @Test
    void strokeReachesTheDeviceAsTheArraysHoldIt() throws Exception {
        long reference = openWithSource();
        KovaTestHooks.useCaptureSink();
        long played = openWithSource();
        KovaTestHooks.clearCapture();
        Kova.start_fasttrack(played);
        byte[] out = new byte[960000];
        ByteArrayOutputStream expected = new ByteArrayOutputStream();
        long t = 1000;
        for (int i = 0; i <= 40; i++) {
            int action = i == 0 ? Kova.ACTION_START : i == 40 ? Kova.ACTION_END : Kova.ACTION_MOVE;
            float x = 100 + 5 * i;
            float y = 300 + (i % 3) * 4;
            int n = Kova.gen_tofasttrack(played, x, y, t, 0, action);
            assertEquals(n, Kova.gen_sounds(reference, out, x, y, t, 0, action), "event " + i);
            expected.write(out, 0, n);
            Thread.sleep(8 + i % 9);
            t += 8 + i % 9;
        }
        byte[] want = expected.toByteArray();
        assertTrue(want.length > 40000, "generated " + want.length);
        // The device plays in real time: wait until it has taken the last block (or give up).
        long deadline = System.nanoTime() + 30_000_000_000L;
        byte[] got = KovaTestHooks.capture();
        while (!endsWith(got, want) && System.nanoTime() < deadline) {
            Thread.sleep(10);
            got = KovaTestHooks.capture();
        }
        assertTrue(got.length >= want.length, "captured " + got.length + " of " + want.length);
        int lead = got.length - want.length;
        assertArrayEquals(new byte[lead], Arrays.copyOf(got, lead));
        assertArrayEquals(want, Arrays.copyOfRange(got, lead, got.length));
    }
}
