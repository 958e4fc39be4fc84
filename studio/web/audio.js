// Sound out: an AudioContext at the engine's rate, an AudioWorklet fed through the shared ring
// (or posted blocks where the page has no shared memory), and an analyser for the strip.
import { SampleRing } from "./ring.js";

const RING_SECONDS = 2;

export class AudioOut {
    constructor() {
        this.ctx = null;
        this.node = null;
        this.analyser = null;
        this.ring = null;
        this.channels = 2;
        this.stats = { frames: 0, nonSilent: 0, peak: 0 };
        this.dropped = 0; // blocks that did not fit: the stream would drop them too
    }

    // (Re)creates the output for a format; the previous one is closed.
    async open(rate, channels) {
        await this.close();
        this.channels = channels;
        this.stats = { frames: 0, nonSilent: 0, peak: 0 };
        const ctx = new AudioContext({ sampleRate: rate, latencyHint: "interactive" });
        await ctx.audioWorklet.addModule(new URL("./worklet.js", import.meta.url));
        let shared = {};
        if (self.crossOriginIsolated) {
            shared = SampleRing.allocate(rate * channels * RING_SECONDS);
            this.ring = new SampleRing(shared.control, shared.data);
        } else {
            this.ring = null;
        }
        this.node = new AudioWorkletNode(ctx, "kova-player", {
            numberOfInputs: 0,
            outputChannelCount: [2],
            processorOptions: { channels, control: shared.control, data: shared.data },
        });
        this.node.port.onmessage = (e) => { this.stats = e.data; };
        this.analyser = ctx.createAnalyser();
        this.analyser.fftSize = 1024;
        this.analyser.smoothingTimeConstant = 0;
        this.node.connect(this.analyser).connect(ctx.destination);
        this.ctx = ctx;
    }

    async close() {
        if (this.ctx) await this.ctx.close();
        this.ctx = this.node = this.analyser = this.ring = null;
    }

    // Browsers start audio only after a gesture (unless told otherwise): called on every touch.
    resume() {
        if (this.ctx && this.ctx.state !== "running") this.ctx.resume();
    }

    push(block) {
        if (!block.length || !this.node) return;
        if (this.ring) {
            if (!this.ring.write(block)) ++this.dropped;
        } else {
            this.node.port.postMessage({ block }, [block.buffer]);
        }
    }
}
