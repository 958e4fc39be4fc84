// The studio page: draw a stroke and hear the engine play it, shape the set while listening, save
// it as a source-set file and open one.
import {
    DEFAULT_FORMAT, FILTER_TYPES, KovaEngine, KovaError, SLOTS, SLOT_MAX_BYTES, libraryError,
    setFileFormat, setFileProblem,
} from "./engine.js";
import { AudioOut } from "./audio.js";
import { PlayedStrip, drawResponses } from "./views.js";

const $ = (id) => document.getElementById(id);
const RATES = [8000, 11025, 16000, 22050, 24000, 32000, 44100, 48000];
const ACTIONS = { down: 0, move: 1, up: 2 };

// Everything that makes the set, so it can be built again in a fresh context (a new format, a
// reproducible render): the base, then dropped sounds, filters, tune set, thickness, volume.
function newDesign(base = { kind: "builtin" }) {
    return { base, slots: [null, null, null], filters: {}, repeat: null, tune: null, thickness: null, volume: null };
}

const studio = {
    engine: null,
    format: { ...DEFAULT_FORMAT },
    design: newDesign(),
    ctx: 0, // the live context the surface plays through
    setId: 0,
    audio: new AudioOut(),
    pointer: null, // the pointer drawing the stroke
    trail: [],
};

// ---- messages ---------------------------------------------------------------------------------

function say(text, kind = "info") {
    const li = document.createElement("li");
    li.className = kind;
    li.textContent = text;
    const list = $("messages");
    list.prepend(li);
    while (list.children.length > 4) list.lastChild.remove();
    (kind === "error" ? console.warn : console.log)(`studio: ${text}`);
}

// Runs an action; a refusal becomes a message and leaves the design as it was.
function attempt(fn) {
    try {
        return fn();
    } catch (e) {
        say(e instanceof KovaError ? e.message : `unexpected failure: ${e.message || e}`, "error");
        return undefined;
    }
}

// ---- the live context ---------------------------------------------------------------------------

// Builds `design` for `format` in a new context; only when that worked does it replace the live
// one, so a refused file or format leaves everything as it was.
function rebuild(format, design) {
    const ctx = studio.engine.createContext(format);
    let id;
    try {
        id = studio.engine.buildSet(ctx, format, design);
    } catch (e) {
        studio.engine.freeContext(ctx);
        throw e;
    }
    studio.engine.freeContext(studio.ctx);
    studio.ctx = ctx;
    studio.setId = id;
    studio.format = { ...format };
    studio.design = design;
    refreshControls();
    return id;
}

// ---- the drawing surface ------------------------------------------------------------------------

function fitPad() {
    const box = $("pad-box").getBoundingClientRect();
    const { width: w, height: h } = studio.format;
    const aspect = w > 0 && h > 0 ? w / h : 1080 / 2280;
    let cw = box.width, ch = box.width / aspect;
    if (ch > box.height) { ch = box.height; cw = ch * aspect; }
    const pad = $("pad");
    pad.style.width = `${Math.floor(cw)}px`;
    pad.style.height = `${Math.floor(ch)}px`;
    pad.width = Math.floor(cw * devicePixelRatio);
    pad.height = Math.floor(ch * devicePixelRatio);
    const strip = $("strip");
    if (strip.width !== Math.floor(strip.clientWidth) || strip.height !== Math.floor(strip.clientHeight)) {
        strip.width = Math.floor(strip.clientWidth);
        strip.height = Math.floor(strip.clientHeight);
        studio.strip?.clear();
    }
}

// Screen pixels of the engine's screen for a pointer position (a format without a screen size
// uses the surface's own pixels).
function enginePoint(e) {
    const r = $("pad").getBoundingClientRect();
    const w = studio.format.width || r.width, h = studio.format.height || r.height;
    return {
        x: Math.max(0, ((e.clientX - r.left) / r.width) * w),
        y: Math.max(0, ((e.clientY - r.top) / r.height) * h),
        px: e.clientX - r.left, py: e.clientY - r.top,
    };
}

function play(e, action) {
    const p = enginePoint(e);
    const block = studio.engine.gen(studio.ctx, { x: p.x, y: p.y, time: Math.floor(e.timeStamp), action });
    studio.audio.push(block);
    studio.trail.push({ x: p.px, y: p.py, action, at: performance.now(), loud: block.length > 0 });
}

function setUpPad() {
    const pad = $("pad");
    pad.addEventListener("pointerdown", (e) => {
        if (studio.pointer !== null || !studio.ctx) return;
        studio.pointer = e.pointerId;
        pad.setPointerCapture(e.pointerId);
        studio.audio.resume();
        play(e, ACTIONS.down);
        e.preventDefault();
    });
    pad.addEventListener("pointermove", (e) => {
        if (e.pointerId !== studio.pointer) return;
        // Every touch sample since the last frame, each with its own time.
        const all = e.getCoalescedEvents ? e.getCoalescedEvents() : [];
        for (const c of all.length ? all : [e]) play(c, ACTIONS.move);
    });
    const lift = (e) => {
        if (e.pointerId !== studio.pointer) return;
        play(e, ACTIONS.up);
        studio.pointer = null;
    };
    pad.addEventListener("pointerup", lift);
    pad.addEventListener("pointercancel", lift);
}

function drawPad() {
    const pad = $("pad");
    const g = pad.getContext("2d");
    const k = devicePixelRatio;
    g.fillStyle = "#0d1115";
    g.fillRect(0, 0, pad.width, pad.height);
    const now = performance.now();
    studio.trail = studio.trail.filter((p) => now - p.at < 1500);
    let prev = null;
    for (const p of studio.trail) {
        const fade = 1 - (now - p.at) / 1500;
        if (prev && p.action === ACTIONS.move) {
            g.strokeStyle = `rgba(79, 195, 247, ${fade})`;
            g.lineWidth = (p.loud ? 4 : 1.5) * k;
            g.beginPath();
            g.moveTo(prev.x * k, prev.y * k);
            g.lineTo(p.x * k, p.y * k);
            g.stroke();
        }
        prev = p.action === ACTIONS.up ? null : p;
    }
    if (!studio.trail.length) {
        g.fillStyle = "#51606e";
        g.font = `${14 * k}px system-ui, sans-serif`;
        g.textAlign = "center";
        g.fillText("draw here", pad.width / 2, pad.height / 2);
    }
}

function animate() {
    drawPad();
    const strip = studio.strip;
    strip.step(studio.audio.analyser);
    requestAnimationFrame(animate);
}

// ---- controls ---------------------------------------------------------------------------------

function slider(parent, label, { min, max, step, value, log = false, unit = "" }, onChange) {
    const row = document.createElement("label");
    row.className = "control";
    const toPos = (v) => (log ? Math.log(v / min) / Math.log(max / min) : v);
    const fromPos = (p) => (log ? min * Math.pow(max / min, p) : p);
    const input = document.createElement("input");
    input.type = "range";
    input.min = log ? 0 : min;
    input.max = log ? 1 : max;
    input.step = log ? 0.001 : step;
    const out = document.createElement("output");
    const show = (v) => { out.textContent = `${log || step >= 1 ? Math.round(v) : v.toFixed(2)}${unit}`; };
    const set = (v) => { input.value = toPos(v); show(v); };
    set(value);
    input.addEventListener("input", () => show(fromPos(Number(input.value))));
    input.addEventListener("change", () => onChange(fromPos(Number(input.value))));
    const name = document.createElement("span");
    name.textContent = label;
    row.append(name, input, out);
    parent.append(row);
    return { input, set };
}

function checkbox(parent, label, checked, onChange) {
    const row = document.createElement("label");
    row.className = "control";
    const box = document.createElement("input");
    box.type = "checkbox";
    box.checked = checked;
    box.addEventListener("change", () => onChange(box.checked));
    const name = document.createElement("span");
    name.textContent = label;
    row.append(name, box);
    parent.append(row);
    return box;
}

const TUNE_LABELS = {
    gain: "gain", pan: "pan depth", osc_depth: "oscillator depth", sharpness: "sharpness",
    wn_gain: "noise level", file_gain: "file level", start_gain: "start gain",
    loop_gain: "loop gain", end_gain: "end gain",
};

// Changes one tune value in the live set; the design keeps what the engine took.
function changeTune(field, value) {
    attempt(() => {
        const e = studio.engine;
        const t = e.getTune(studio.ctx, studio.setId);
        t[field] = value;
        e.setTune(studio.ctx, studio.setId, t);
        const now = e.getTune(studio.ctx, studio.setId);
        if (now[field] !== value) {
            say(`the engine kept ${field} at ${now[field]}: a depth must lie in 0..1 to switch its effect on`, "error");
        }
        studio.design.tune = now;
        refreshControls();
    });
}

function buildTuneControls() {
    const box = $("tune");
    box.replaceChildren();
    const t = studio.engine.getTune(studio.ctx, studio.setId);
    for (const field of ["gain", "pan"]) {
        slider(box, TUNE_LABELS[field], { min: 0, max: 1, step: 0.01, value: t[field] }, (v) => changeTune(field, v));
    }
    checkbox(box, "oscillator", t.osc_enable === 1, (on) => changeTune("osc_enable", on ? 1 : 0));
    slider(box, TUNE_LABELS.osc_depth, { min: 0, max: 1, step: 0.01, value: t.osc_depth }, (v) => changeTune("osc_depth", v));
    checkbox(box, "pitch raise", t.sharp_enable === 1, (on) => changeTune("sharp_enable", on ? 1 : 0));
    slider(box, TUNE_LABELS.sharpness, { min: 0, max: 1, step: 0.01, value: t.sharpness }, (v) => changeTune("sharpness", v));
    for (const field of ["wn_gain", "file_gain", "start_gain", "loop_gain", "end_gain"]) {
        slider(box, TUNE_LABELS[field], { min: 0, max: 1, step: 0.01, value: t[field] }, (v) => changeTune(field, v));
    }
    const d = studio.design;
    // Only the loop's repeat end shapes playback: the loop plays up to it, then from its middle.
    const rpt = studio.engine.getRepeat(studio.ctx, studio.setId);
    if (rpt.len[1] >= 1) {
        slider(box, "loop repeat end", { min: 1, max: rpt.len[1], step: 1, value: rpt.end[1], unit: " ms" }, (v) => attempt(() => {
            const ms = Math.round(v);
            studio.engine.setRepeat(studio.ctx, studio.setId, { start: [-1, -1, -1], end: [-1, ms, -1] });
            studio.design.repeat = studio.engine.getRepeat(studio.ctx, studio.setId);
        }));
    }
    slider(box, "thickness", { min: 0, max: 1, step: 0.01, value: d.thickness ?? 0.6 }, (v) => attempt(() => {
        studio.engine.check(studio.engine.M._kova_set_thickness(studio.ctx, v), "setting the thickness");
        studio.design.thickness = v;
    }));
    slider(box, "volume", { min: 0, max: 2, step: 0.01, value: d.volume ?? 1 }, (v) => {
        studio.engine.M._kova_set_volume(studio.ctx, v);
        studio.design.volume = v;
    });
}

function buildFilterControls() {
    const box = $("filters");
    box.replaceChildren();
    const { rate } = studio.format;
    const nyquist = rate / 2;
    const present = studio.engine.getFilters(studio.ctx, studio.setId);
    FILTER_TYPES.forEach((name, type) => {
        const have = present.find((f) => f.type === type);
        const cur = have
            ? { freq: have.freq, bandwidth: have.bandwidth, enable: have.enable === 1 }
            : { freq: Math.min(1000, nyquist / 2), bandwidth: Math.min(500, nyquist / 2), enable: false };
        const row = document.createElement("div");
        row.className = "filter";
        box.append(row);
        const apply = (patch) => {
            try {
                const next = { ...cur, ...patch };
                studio.engine.attachFilter(studio.ctx, studio.setId, studio.format, type, next);
                Object.assign(cur, patch);
                studio.design.filters[type] = { ...cur };
                buildFilterControls();
            } catch (e) {
                say(`${e.message}; frequencies must lie strictly between 0 and half the rate (${nyquist} Hz)`, "error");
                buildFilterControls(); // back to what the set holds
            }
        };
        checkbox(row, have ? name : `${name} (not in the set)`, cur.enable, (on) => apply({ enable: on }));
        slider(row, "frequency", { min: 20, max: nyquist * 0.98, value: Math.max(20, cur.freq), log: true, unit: " Hz" },
            (v) => apply({ freq: v }));
        if (type >= 2) {
            slider(row, "bandwidth", { min: 10, max: nyquist * 0.98, value: Math.max(10, cur.bandwidth), log: true, unit: " Hz" },
                (v) => apply({ bandwidth: v }));
        }
    });
    drawFilterResponses();
}

function drawFilterResponses() {
    const canvas = $("response");
    canvas.width = Math.max(200, canvas.clientWidth);
    drawResponses(canvas, studio.engine, studio.format.rate,
        studio.engine.getFilters(studio.ctx, studio.setId));
}

function refreshControls() {
    buildTuneControls();
    buildFilterControls();
    fitPad();
    const f = studio.format;
    $("f-rate").value = String(f.rate);
    $("f-channels").value = String(f.channels);
    $("f-panning").checked = f.panning === 1;
    $("f-width").value = f.width;
    $("f-height").value = f.height;
    for (const zone of document.querySelectorAll(".drop[data-target]")) {
        const slot = Number(zone.dataset.target);
        if (Number.isNaN(slot)) continue;
        let note = zone.querySelector("small");
        if (!note) zone.append((note = document.createElement("small")));
        note.textContent = studio.design.slots[slot]?.name ?? "the set's own sound (drop a file to replace it)";
    }
    const base = studio.design.base;
    $("status").textContent = `${base.kind === "builtin" ? "built-in set" : base.name} · ${f.rate} Hz, ` +
        `${f.channels} channel${f.channels > 1 ? "s" : ""}${f.panning === 1 ? ", panning" : ""}, ${f.width} × ${f.height}`;
}

// ---- format -----------------------------------------------------------------------------------

async function applyFormat() {
    const f = {
        rate: Number($("f-rate").value), channels: Number($("f-channels").value),
        panning: $("f-panning").checked ? 1 : 0,
        width: Number($("f-width").value) >>> 0, height: Number($("f-height").value) >>> 0,
    };
    const code = studio.engine.checkFormat(f); // 1 accepted, -1 refused
    if (code < 1) {
        const why = f.panning === 1 && f.channels !== 2 ? "panning needs 2 channels"
            : f.panning === 1 ? "panning needs a screen size" : "rate 8000..48000 Hz, 1 or 2 channels";
        say(`format refused: ${libraryError(code)}; ${why}`, "error");
        refreshControls();
        return;
    }
    // Filters edited here were designed for the old rate: keep them only where they still fit.
    const design = { ...studio.design, filters: {} };
    for (const [t, flt] of Object.entries(studio.design.filters)) {
        if (flt.freq < f.rate / 2 && (Number(t) < 2 || flt.bandwidth < f.rate / 2)) design.filters[t] = flt;
        else say(`the ${FILTER_TYPES[t]} filter does not fit under ${f.rate / 2} Hz and was left out`, "note");
    }
    // Dropped sounds are converted again from their files for the new format.
    design.slots = [];
    for (const [i, s] of studio.design.slots.entries()) {
        try {
            design.slots.push(s && { name: s.name, bytes: s.bytes, pcm: await soundToPcm({ name: s.name }, s.bytes, i, f) });
        } catch (e) {
            say(`${e.message}; the format stays as it was`, "error");
            return;
        }
    }
    if (attempt(() => rebuild(f, design)) === undefined) return;
    await studio.audio.open(f.rate, f.channels);
    say(`format ${f.rate} Hz, ${f.channels} channel(s)`);
}

// ---- files --------------------------------------------------------------------------------------

async function readFile(file) {
    return new Uint8Array(await file.arrayBuffer());
}

function inspectText(name, info) {
    const lines = [`source-set file ${name}`, "", "slots:"];
    for (const s of info.slots) {
        if (s.size < 0) { lines.push(`  ${s.name.padEnd(5)}  (empty)`); continue; }
        lines.push(`  ${s.name.padEnd(5)}  offset ${String(s.offset).padStart(7)}  size ${String(s.size).padStart(6)} bytes` +
            `  length ${String(s.lengthMs).padStart(5)} ms  repeat ${s.repeatStartMs}..${s.repeatEndMs} ms`);
    }
    lines.push("", "filters:");
    for (const f of info.filters) {
        lines.push(`  ${FILTER_TYPES[f.type].padEnd(10)}  freq ${f.freq} Hz  bandwidth ${f.bandwidth} Hz  ` +
            `${f.enable === 1 ? "on " : "off"}  (for ${f.samplerate} Hz, ${f.channels} channel${f.channels === 1 ? "" : "s"})`);
    }
    if (!info.filters.length) lines.push("  (none)");
    // Each tune value as JSON writes it: doubles with a fraction part, NaN as null.
    lines.push("", "tune set:");
    for (const [name, value] of Object.entries(info.tune)) {
        const int = name.endsWith("_enable");
        const text = Number.isNaN(value) ? "null" : int || !Number.isInteger(value) ? String(value) : value.toFixed(1);
        lines.push(`  ${name.padEnd(12)} ${text}`);
    }
    return lines.join("\n");
}

// Opens a source-set file as the new design. Throws a KovaError (the design stays) when refused.
function openSet(bytes, name) {
    const problem = setFileProblem(bytes);
    if (problem) throw new KovaError(`"${name}" is not a source-set file the studio can play: ${problem}`);
    const info = studio.engine.inspect(bytes);
    const id = rebuild(studio.format, newDesign({ kind: "file", name, bytes: new Uint8Array(bytes) }));
    $("inspect").textContent = inspectText(name, info);
    const saved = setFileFormat(bytes);
    if (saved.rate !== studio.format.rate || saved.channels !== studio.format.channels) {
        say(`${name} was saved for ${saved.rate} Hz, ${saved.channels} channel(s); it plays at ` +
            `${studio.format.rate} Hz, ${studio.format.channels} channel(s)`, "note");
    }
    say(`opened ${name}`);
    return id;
}

// Decodes a dropped sound into the engine's format: 16-bit interleaved at its rate and channels.
async function soundToPcm(file, bytes, slot, format = studio.format) {
    const { rate, channels } = format;
    if (!bytes.length) throw new KovaError(`${file.name} is empty`);
    let pcm;
    if (/\.(raw|pcm|s16)$/i.test(file.name)) {
        const usable = bytes.length - (bytes.length % (2 * channels));
        if (!usable) throw new KovaError(`${file.name} holds less than one frame of 16-bit PCM`);
        pcm = new Int16Array(bytes.buffer.slice(bytes.byteOffset, bytes.byteOffset + usable));
    } else {
        let decoded;
        try {
            decoded = await new OfflineAudioContext(channels, 1, rate).decodeAudioData(bytes.buffer.slice(0));
        } catch {
            throw new KovaError(`cannot decode ${file.name}: the browser does not read it as audio ` +
                "(WAV, MP3, Ogg, FLAC…); raw PCM must be named .raw or .pcm");
        }
        const frames = Math.max(1, Math.ceil(decoded.duration * rate));
        const off = new OfflineAudioContext(channels, frames, rate);
        const src = off.createBufferSource();
        src.buffer = decoded;
        src.connect(off.destination);
        src.start();
        const out = await off.startRendering();
        pcm = new Int16Array(frames * channels);
        for (let c = 0; c < channels; ++c) {
            const data = out.getChannelData(c);
            for (let i = 0; i < frames; ++i) pcm[i * channels + c] = Math.trunc(Math.max(-1, Math.min(1, data[i])) * 32767);
        }
    }
    const max = SLOT_MAX_BYTES[slot] / 2;
    if (pcm.length > max) {
        say(`${file.name} is ${Math.round((pcm.length / channels / rate) * 1000)} ms; the ${SLOTS[slot]} slot keeps ` +
            `the first ${Math.round((max / channels / rate) * 1000)} ms`, "note");
        pcm = pcm.slice(0, max - (max % channels));
    }
    return pcm;
}

async function dropped(file, target) {
    const bytes = await readFile(file);
    if (target === "set") {
        attempt(() => openSet(bytes, file.name));
        return;
    }
    const slot = Number(target);
    try {
        const pcm = await soundToPcm(file, bytes, slot);
        const slots = [null, null, null];
        slots[slot] = { name: file.name, bytes, pcm };
        studio.engine.replaceSlots(studio.ctx, studio.setId, slots);
        studio.design.slots[slot] = slots[slot];
        // The new sound may change the set's levels (a new loop plays at the file level), and
        // its repeat points are the whole sound again.
        studio.design.tune = studio.engine.getTune(studio.ctx, studio.setId);
        studio.design.repeat = studio.engine.getRepeat(studio.ctx, studio.setId);
        refreshControls();
        say(`${file.name} is now the ${SLOTS[slot]} sound`);
    } catch (e) {
        say(e instanceof KovaError ? e.message : `cannot use ${file.name}: ${e.message || e}`, "error");
        // The engine empties a slot whose new file it cannot read: the live set is built again
        // from the unchanged design.
        attempt(() => rebuild(studio.format, studio.design));
    }
}

function setUpFiles() {
    for (const zone of document.querySelectorAll(".drop")) {
        const target = zone.dataset.target;
        zone.addEventListener("dragover", (e) => { e.preventDefault(); zone.classList.add("over"); });
        zone.addEventListener("dragleave", () => zone.classList.remove("over"));
        zone.addEventListener("drop", (e) => {
            e.preventDefault();
            e.stopPropagation();
            zone.classList.remove("over");
            const file = e.dataTransfer.files[0];
            if (file) dropped(file, target);
        });
        const input = zone.querySelector("input[type=file]");
        if (input) {
            zone.addEventListener("click", () => input.click());
            input.addEventListener("change", () => { if (input.files[0]) dropped(input.files[0], target); input.value = ""; });
        }
    }
    $("open-set").addEventListener("change", (e) => {
        const file = e.target.files[0];
        if (file) dropped(file, "set");
        e.target.value = "";
    });
    // A file dropped anywhere else would make the browser leave the page.
    window.addEventListener("dragover", (e) => e.preventDefault());
    window.addEventListener("drop", (e) => {
        e.preventDefault();
        const file = e.dataTransfer.files[0];
        if (file) dropped(file, "set");
    });
    $("save").addEventListener("click", () => attempt(() => {
        const bytes = studio.engine.save(studio.ctx, studio.setId);
        let name = $("save-name").value.trim() || "design.kset";
        if (!name.includes(".")) name += ".kset";
        const a = document.createElement("a");
        a.href = URL.createObjectURL(new Blob([bytes], { type: "application/octet-stream" }));
        a.download = name;
        a.click();
        setTimeout(() => URL.revokeObjectURL(a.href), 10000);
        $("inspect").textContent = inspectText(name, studio.engine.inspect(bytes));
        say(`saved ${name} (${bytes.length} bytes)`);
    }));
    $("builtin").addEventListener("click", () => attempt(() => {
        rebuild(studio.format, newDesign());
        $("inspect").textContent = "";
        say("back to the built-in set");
    }));
    $("f-apply").addEventListener("click", applyFormat);
}

// ---- automation -------------------------------------------------------------------------------

// Renders events through a fresh context holding the design, so the result depends only on the
// design and the events (not on what was drawn before), as a fresh process of the native library.
function generate(events) {
    const e = studio.engine;
    const ctx = e.createContext(studio.format);
    try {
        e.buildSet(ctx, studio.format, studio.design);
        const blocks = [];
        let total = 0;
        for (const ev of events) {
            const action = typeof ev.action === "string" ? ACTIONS[ev.action] : ev.action;
            const b = e.gen(ctx, { x: ev.x, y: ev.y, time: ev.time, aux: ev.aux, action });
            blocks.push(b);
            total += b.length;
        }
        const out = new Int16Array(total);
        let at = 0;
        for (const b of blocks) { out.set(b, at); at += b.length; }
        return out;
    } finally {
        e.freeContext(ctx);
    }
}

window.kovaStudio = {
    ready: false,
    loadSet(bytes) {
        try {
            return openSet(bytes instanceof Uint8Array ? bytes : new Uint8Array(bytes), "set.kset");
        } catch (e) {
            say(e.message, "error");
            throw e;
        }
    },
    generate,
    saveSet: () => studio.engine.save(studio.ctx, studio.setId),
    audioStats: () => ({ ...studio.audio.stats, dropped: studio.audio.dropped, state: studio.audio.ctx?.state }),
    format: () => ({ ...studio.format }),
};

// ---- start ------------------------------------------------------------------------------------

async function start() {
    for (const r of RATES) $("f-rate").append(new Option(String(r), String(r)));
    studio.strip = new PlayedStrip($("strip"));
    try {
        studio.engine = await KovaEngine.load();
    } catch (e) {
        $("status").textContent = `the engine could not be loaded: ${e.message || e}`;
        return;
    }
    setUpPad();
    setUpFiles();
    window.addEventListener("resize", () => { fitPad(); drawFilterResponses(); });
    if (attempt(() => rebuild(studio.format, newDesign())) === undefined) return;
    try {
        await studio.audio.open(studio.format.rate, studio.format.channels);
    } catch (e) {
        say(`no sound output: ${e.message || e}`, "error");
    }
    if (!self.crossOriginIsolated) say("no shared memory here: blocks reach the player by message", "note");
    requestAnimationFrame(animate);
    window.kovaStudio.ready = true;
}

start();
