// SPDX-License-Identifier: Apache-2.0
package com.corvane.audio;

import java.util.List;

// Test access to the stand-in audio device and to the library's log lines (tag "kova_jni").
// Loading this class loads the hook library first and then the Kova library, so the lines of the
// library's load hook are captured; they are kept in LOAD_LINES.
final class KovaTestHooks {
    static final List<String> LOAD_LINES;

    static {
        System.loadLibrary("KovaTestHooks");
        takeLog();
        try {
            Class.forName("com.corvane.audio.Kova", true, KovaTestHooks.class.getClassLoader());
        } catch (ClassNotFoundException e) {
            throw new ExceptionInInitializerError(e);
        }
        LOAD_LINES = List.of(takeLog().split("\n"));
    }

    private KovaTestHooks() {}

    static native void useCaptureSink();

    static native void useNullSink();

    static native void clearCapture();

    static native byte[] capture();

    // The library's lines since the last call, each ended by a newline.
    private static native String takeLog();
}
