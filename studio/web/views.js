// Pictures: the strip of what was played (waveform above, spectrogram below, scrolling left) and
// the frequency responses of the set's filters.
import { FILTER_TYPES } from "./engine.js";

const FILTER_COLOURS = ["#4fc3f7", "#ffb74d", "#81c784", "#e57373"];

export class PlayedStrip {
    constructor(canvas) {
        this.canvas = canvas;
        this.g = canvas.getContext("2d");
        this.clear();
        this.time = null;
        this.freq = null;
    }

    clear() {
        this.g.fillStyle = "#101418";
        this.g.fillRect(0, 0, this.canvas.width, this.canvas.height);
    }

    // One column per animation frame from the analyser after the worklet.
    step(analyser) {
        const { canvas: c, g } = this;
        if (!analyser || !c.width) return;
        if (!this.time || this.time.length !== analyser.fftSize) {
            this.time = new Float32Array(analyser.fftSize);
            this.freq = new Uint8Array(analyser.frequencyBinCount);
        }
        analyser.getFloatTimeDomainData(this.time);
        analyser.getByteFrequencyData(this.freq);
        const dx = 2;
        g.drawImage(c, -dx, 0);
        const x = c.width - dx;
        const half = Math.floor(c.height * 0.35);
        g.fillStyle = "#101418";
        g.fillRect(x, 0, dx, c.height);
        let lo = 0, hi = 0;
        for (const s of this.time) { lo = Math.min(lo, s); hi = Math.max(hi, s); }
        g.fillStyle = "#4fc3f7";
        const mid = half / 2;
        g.fillRect(x, mid - hi * mid, dx, Math.max(1, (hi - lo) * mid));
        // Spectrogram: bins on a logarithmic frequency axis, low at the bottom.
        const rows = c.height - half - 1;
        const bins = this.freq.length;
        for (let r = 0; r < rows; ++r) {
            const bin = Math.min(bins - 1, Math.floor(Math.pow(bins, 1 - r / rows)));
            const v = this.freq[bin] / 255;
            g.fillStyle = v < 0.02 ? "#101418" : `hsl(${240 - 200 * v}, 90%, ${8 + 55 * v}%)`;
            g.fillRect(x, half + 1 + r, dx, 1);
        }
    }
}

// Complex response of the engine's biquad (output scaled by 0.9) at frequency f for rate fs.
function response(q, f, fs) {
    const w = (2 * Math.PI * f) / fs;
    const c1 = Math.cos(w), s1 = Math.sin(w), c2 = Math.cos(2 * w), s2 = Math.sin(2 * w);
    const nr = q.a0 + q.a1 * c1 + q.a2 * c2, ni = -(q.a1 * s1 + q.a2 * s2);
    const dr = 1 + q.b1 * c1 + q.b2 * c2, di = -(q.b1 * s1 + q.b2 * s2);
    const d2 = dr * dr + di * di;
    return { re: (0.9 * (nr * dr + ni * di)) / d2, im: (0.9 * (ni * dr - nr * di)) / d2 };
}

const toDb = (re, im) => 20 * Math.log10(Math.max(Math.hypot(re, im), 1e-9));

// Draws each filter's response and, in white, that of the bank (enabled filters run in parallel
// and are averaged, so the bank's response is the mean of their complex responses).
export function drawResponses(canvas, engine, rate, filters) {
    const g = canvas.getContext("2d");
    const W = canvas.width, H = canvas.height;
    g.fillStyle = "#101418";
    g.fillRect(0, 0, W, H);
    const fMin = 20, fMax = rate / 2;
    const xOf = (f) => (Math.log(f / fMin) / Math.log(fMax / fMin)) * W;
    const yOf = (db) => ((12 - db) / 72) * H; // +12 dB at the top, -60 dB at the bottom
    g.strokeStyle = "#2a3440";
    g.fillStyle = "#7a8896";
    g.font = "10px sans-serif";
    for (const f of [100, 1000, 10000]) {
        if (f >= fMax) continue;
        g.beginPath(); g.moveTo(xOf(f), 0); g.lineTo(xOf(f), H); g.stroke();
        g.fillText(f >= 1000 ? `${f / 1000}k` : `${f}`, xOf(f) + 2, H - 3);
    }
    for (const db of [0, -24, -48]) {
        g.beginPath(); g.moveTo(0, yOf(db)); g.lineTo(W, yOf(db)); g.stroke();
        g.fillText(`${db} dB`, 2, yOf(db) - 2);
    }
    const designs = filters.map((f) => ({ f, q: engine.biquad(rate, f.type, f.freq, f.bandwidth) }));
    const curve = (colour, width, dbAt) => {
        g.strokeStyle = colour;
        g.lineWidth = width;
        g.beginPath();
        for (let x = 0; x <= W; x += 2) {
            const f = fMin * Math.pow(fMax / fMin, x / W);
            const y = Math.min(H, Math.max(0, yOf(dbAt(f))));
            if (x === 0) g.moveTo(x, y); else g.lineTo(x, y);
        }
        g.stroke();
        g.lineWidth = 1;
    };
    for (const { f, q } of designs) {
        curve(FILTER_COLOURS[f.type], 1.5, (fr) => { const h = response(q, fr, rate); return toDb(h.re, h.im); });
        g.fillStyle = FILTER_COLOURS[f.type];
        g.fillText(`${FILTER_TYPES[f.type]}${f.enable ? "" : " (off)"}`, W - 90, 12 + 12 * f.type);
    }
    const on = designs.filter((d) => d.f.enable === 1);
    if (on.length > 1) {
        curve("#ffffff", 2, (fr) => {
            let re = 0, im = 0;
            for (const { q } of on) {
                const h = response(q, fr, rate);
                re += h.re;
                im += h.im;
            }
            return toDb(re / on.length, im / on.length);
        });
    }
}
