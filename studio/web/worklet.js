// Plays the engine's interleaved 16-bit blocks as they arrive: from the shared ring when the page
// is cross-origin isolated, else from blocks posted to the port. Reports what it played.
import { SampleRing } from "./ring.js";

class KovaPlayer extends AudioWorkletProcessor {
    constructor(options) {
        super();
        const { channels, control, data } = options.processorOptions;
        this.channels = channels;
        this.ring = control ? new SampleRing(control, data) : null;
        this.queue = []; // posted blocks, when there is no shared memory
        this.queueAt = 0;
        this.scratch = new Int16Array(128 * 2);
        this.frames = 0; // frames that carried samples
        this.nonSilent = 0; // samples other than 0
        this.peak = 0;
        this.quanta = 0;
        this.port.onmessage = (e) => {
            if (e.data.block) this.queue.push(e.data.block);
            if (e.data.clear) this.queue = [];
        };
    }

    take(want) {
        if (this.ring) return this.ring.read(this.scratch.subarray(0, want));
        let n = 0;
        while (n < want && this.queue.length) {
            const head = this.queue[0];
            const k = Math.min(want - n, head.length - this.queueAt);
            this.scratch.set(head.subarray(this.queueAt, this.queueAt + k), n);
            n += k;
            this.queueAt += k;
            if (this.queueAt === head.length) {
                this.queue.shift();
                this.queueAt = 0;
            }
        }
        return n;
    }

    process(_inputs, outputs) {
        const out = outputs[0];
        const frames = out[0].length;
        const ch = this.channels;
        const got = this.take(frames * ch);
        const whole = Math.floor(got / ch);
        for (let f = 0; f < frames; ++f) {
            for (let c = 0; c < out.length; ++c) {
                const s = f < whole ? this.scratch[f * ch + Math.min(c, ch - 1)] : 0;
                out[c][f] = s / 32768;
            }
        }
        for (let i = 0; i < got; ++i) {
            const a = Math.abs(this.scratch[i]);
            if (a) ++this.nonSilent;
            if (a > this.peak) this.peak = a;
        }
        this.frames += whole;
        if (++this.quanta % 8 === 0) {
            this.port.postMessage({ frames: this.frames, nonSilent: this.nonSilent, peak: this.peak });
        }
        return true;
    }
}

registerProcessor("kova-player", KovaPlayer);
