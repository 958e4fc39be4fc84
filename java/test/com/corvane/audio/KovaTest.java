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
import java.util.List;
import java.util.Arrays;
import org.junit.jupiter.api.AfterEach;
import org.junit.jupiter.api.Test;
import org.junit.jupiter.api.io.TempDir;

// The native methods of Kova called from a real JVM through the real library: what only a JVM
// proves (the class loads the library, results and arrays cross JNI). The results at the edges,
// the log lines (the load hook's too) and the volume tables are checked through the same symbols
// in tests/jni.
class KovaTest {
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
