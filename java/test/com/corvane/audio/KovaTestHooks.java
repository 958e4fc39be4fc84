// SPDX-License-Identifier: Apache-2.0
package com.corvane.audio;

// Test access to the stand-in audio device: the sink new streams play into, and what the capture
// sink received.
final class KovaTestHooks {
    static {
        System.loadLibrary("KovaTestHooks");
    }

    private KovaTestHooks() {}

    static native void useCaptureSink();

    static native void useNullSink();

    static native void clearCapture();

    static native byte[] capture();
}
