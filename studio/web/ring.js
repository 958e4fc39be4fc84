// Single-producer single-consumer queue of 16-bit samples over shared memory: the page writes the
// engine's blocks, the audio worklet reads them. Indices only grow (wrapping at 2^32) and are
// published with Atomics, so neither side ever blocks the other.
export const RING_CONTROL_WORDS = 2; // [write index, read index], in samples

export class SampleRing {
    // `control` is an Int32Array of RING_CONTROL_WORDS, `data` an Int16Array whose length is a
    // power of two.
    constructor(control, data) {
        this.control = control;
        this.data = data;
        this.mask = data.length - 1;
    }

    static allocate(samples) {
        const size = 1 << Math.ceil(Math.log2(samples));
        return {
            control: new Int32Array(new SharedArrayBuffer(4 * RING_CONTROL_WORDS)),
            data: new Int16Array(new SharedArrayBuffer(2 * size)),
        };
    }

    readable() {
        return (Atomics.load(this.control, 0) - Atomics.load(this.control, 1)) >>> 0;
    }

    writable() {
        return this.data.length - this.readable();
    }

    // All or nothing, as the device stream takes a block: false when the block does not fit.
    write(block) {
        if (block.length > this.writable()) return false;
        let w = Atomics.load(this.control, 0) >>> 0;
        for (let i = 0; i < block.length; ++i, ++w) this.data[w & this.mask] = block[i];
        Atomics.store(this.control, 0, w | 0);
        return true;
    }

    // Copies up to `out.length` samples into `out`; returns how many.
    read(out) {
        const n = Math.min(out.length, this.readable());
        let r = Atomics.load(this.control, 1) >>> 0;
        for (let i = 0; i < n; ++i, ++r) out[i] = this.data[r & this.mask];
        Atomics.store(this.control, 1, r | 0);
        return n;
    }
}
