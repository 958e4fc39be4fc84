// The engine in the page: the library's C functions, compiled to WebAssembly, behind a small
// JavaScript face. Record layouts are those of the 32-bit build.

export const SLOTS = ["start", "loop", "end"];
export const SLOT_MAX_BYTES = [38400, 192000, 38400];
export const FILTER_TYPES = ["lowpass", "highpass", "bandpass", "bandreject"];
export const TUNE_FIELDS = [
    // name, offset in KOVA_TUNE_SET, 32-bit integer switch?
    ["gain", 0, false], ["pan", 8, false], ["osc_enable", 16, true], ["osc_depth", 24, false],
    ["sharp_enable", 32, true], ["sharpness", 40, false], ["wn_gain", 48, false],
    ["file_gain", 56, false], ["start_gain", 64, false], ["loop_gain", 72, false],
    ["end_gain", 80, false],
];
export const DEFAULT_FORMAT = { rate: 48000, channels: 2, panning: 1, width: 1080, height: 2280 };
const MAX_FILTERS = 64; // the most descriptors a saved file may claim
const PCM_BYTES = 960000; // an instance's block buffer on the device

const ERRORS = {
    "-1": "format rejected", "-2": "out of memory", "-3": "invalid parameter",
    "-4": "sound source could not be loaded", "-5": "too many source sets",
};

// A refusal of the engine, with a message a person can act on.
export class KovaError extends Error {
    constructor(what, code) {
        super(code === undefined ? what : `${what}: ${libraryError(code)}`);
        this.code = code;
    }
}

export function libraryError(code) {
    return `${ERRORS[code] || "unknown error"} (library code ${code})`;
}

export class KovaEngine {
    static async load(wasmUrl) {
        /* global createKovaEngine */
        const M = await createKovaEngine({
            locateFile: (name) => (name.endsWith(".wasm") && wasmUrl ? wasmUrl : name),
            print: (line) => console.log(`engine: ${line}`),
            printErr: (line) => console.warn(`engine: ${line}`),
        });
        return new KovaEngine(M);
    }

    constructor(M) {
        this.M = M;
        this.scratch = M._malloc(512); // records handed to the engine, one call at a time
        this.err = M._malloc(4);
        this.paths = M._malloc(3 * 4 + 3 * 64);
        this.pcm = M._malloc(PCM_BYTES);
        this.pcmbuf = M._malloc(8);
        this.sounds = 0; // dropped sounds written so far
        M.FS.mkdirTree("/studio");
    }

    dv() {
        return new DataView(this.M.HEAPU8.buffer); // the memory may have grown since last time
    }

    cstr(text, at = this.scratch + 256) {
        this.M.stringToUTF8(text, at, 256);
        return at;
    }

    errCode() {
        return this.dv().getInt32(this.err, true);
    }

    // ---- contexts ----------------------------------------------------------------------------

    checkFormat(f) {
        this.writeFormat(f);
        return this.M._kova_checkformat(this.scratch);
    }

    writeFormat(f) {
        const v = this.dv();
        [f.rate, f.channels, f.panning, f.width, f.height].forEach((x, i) =>
            v.setUint32(this.scratch + 4 * i, x >>> 0, true));
    }

    createContext(f) {
        this.writeFormat(f);
        const ctx = this.M._kova_init(this.scratch, this.err);
        if (!ctx) throw new KovaError("the engine could not be created", this.errCode());
        return ctx;
    }

    freeContext(ctx) {
        if (ctx) this.M._kova_deinit(ctx);
    }

    // ---- generation --------------------------------------------------------------------------

    // One event through kova_gen_sounds; returns a copy of the block (possibly empty).
    gen(ctx, ev) {
        const v = this.dv();
        const p = this.scratch;
        v.setFloat32(p, ev.x, true);
        v.setFloat32(p + 4, ev.y, true);
        v.setBigInt64(p + 8, BigInt(Math.trunc(ev.time)), true);
        v.setFloat32(p + 16, ev.aux || 0, true);
        v.setUint32(p + 20, ev.action >>> 0, true);
        v.setUint32(this.pcmbuf, this.pcm, true);
        v.setInt32(this.pcmbuf + 4, PCM_BYTES, true);
        const bytes = this.M._kova_gen_sounds(ctx, p, this.pcmbuf);
        return new Int16Array(this.M.HEAPU8.buffer.slice(this.pcm, this.pcm + bytes));
    }

    // ---- files in the engine's file system ---------------------------------------------------

    withFile(name, bytes, fn) {
        const path = `/studio/${name}`;
        this.M.FS.writeFile(path, bytes);
        try {
            return fn(path);
        } finally {
            this.M.FS.unlink(path);
        }
    }

    // ---- building a set from a design --------------------------------------------------------

    // Registers the design's set in `ctx`, makes it active and applies the design's edits.
    // Returns the set's id; throws a KovaError, leaving the context's other sets as they were.
    buildSet(ctx, format, design) {
        const M = this.M;
        let id;
        if (design.base.kind === "builtin") {
            M._srand(1); // the noise of a fresh process, as `kova render` has it
            id = M._studio_register_builtin(ctx, this.err);
            if (!id) throw new KovaError("cannot build the built-in set", this.errCode());
        } else {
            id = this.withFile("set.kset", design.base.bytes, (path) =>
                M._kova_reg_src_bysavefile(ctx, this.cstr(path), this.err));
            if (!id) {
                throw new KovaError(`cannot register source-set file "${design.base.name}"`,
                    this.errCode());
            }
        }
        this.replaceSlots(ctx, id, design.slots);
        for (const [type, f] of Object.entries(design.filters)) {
            this.attachFilter(ctx, id, format, Number(type), f);
        }
        if (design.repeat) this.setRepeat(ctx, id, design.repeat);
        this.check(M._kova_set_active_src(ctx, id), "selecting the set");
        if (design.tune) this.setTune(ctx, id, design.tune);
        if (design.thickness !== null) {
            this.check(M._kova_set_thickness(ctx, design.thickness), "setting the thickness");
        }
        if (design.volume !== null) M._kova_set_volume(ctx, design.volume);
        return id;
    }

    check(code, what) {
        if (code !== 0) throw new KovaError(what, code);
    }

    // Replaces the slots given (others null). Each sound stays in its own file of the in-memory
    // file system: the engine reads file sources again whenever the set's filters change.
    replaceSlots(ctx, id, slots) {
        if (!slots.some(Boolean)) return;
        const v = this.dv();
        slots.forEach((s, i) => {
            let ptr = 0;
            if (s) {
                if (!s.path) {
                    s.path = `/studio/sound-${++this.sounds}.pcm`;
                    this.M.FS.writeFile(s.path, new Uint8Array(s.pcm.buffer, s.pcm.byteOffset, s.pcm.byteLength));
                }
                ptr = this.cstr(s.path, this.paths + 12 + 64 * i);
            }
            v.setUint32(this.paths + 4 * i, ptr, true);
        });
        const levels = this.getTune(ctx, id);
        if (!this.M._kova_update_src_byfiles(ctx, id, this.paths, this.err)) {
            throw new KovaError("cannot load the dropped sounds", this.errCode());
        }
        // A new loop takes the levels of a file registration; new start or end sounds alone do
        // not change how loud the loop plays.
        if (!slots[1]) this.setTune(ctx, id, levels);
    }

    // ---- tuning ----------------------------------------------------------------------------

    getTune(ctx, id) {
        const p = this.scratch;
        this.M.HEAPU8.fill(0, p, p + 88);
        this.M._kova_get_tuneset(ctx, id, p);
        const v = this.dv();
        const t = {};
        for (const [name, off, int] of TUNE_FIELDS) {
            t[name] = int ? v.getInt32(p + off, true) : v.getFloat64(p + off, true);
        }
        return t;
    }

    setTune(ctx, id, t) {
        const p = this.scratch;
        const v = this.dv();
        this.M.HEAPU8.fill(0, p, p + 88);
        for (const [name, off, int] of TUNE_FIELDS) {
            if (int) v.setInt32(p + off, t[name], true);
            else v.setFloat64(p + off, t[name], true);
        }
        this.M._kova_set_tuneset(ctx, id, p);
    }

    // ---- repeat points ----------------------------------------------------------------------

    // {len, start, end}: per slot, in milliseconds (-1 for an empty slot).
    getRepeat(ctx, id) {
        const p = this.scratch;
        this.M.HEAPU8.fill(0, p, p + 48);
        this.check(this.M._kova_get_rptinfo(ctx, id, p), "reading the repeat points");
        const v = this.dv();
        const at = (off, i, wide) => (wide ? Number(v.getBigInt64(p + off + 8 * i, true)) : v.getInt32(p + off + 4 * i, true));
        return {
            len: [0, 1, 2].map((i) => at(0, i, true)),
            start: [0, 1, 2].map((i) => at(24, i)),
            end: [0, 1, 2].map((i) => at(36, i)),
        };
    }

    // Stores start and end values (-1 keeps a value; the engine skips values out of range).
    setRepeat(ctx, id, r) {
        const p = this.scratch;
        const v = this.dv();
        this.M.HEAPU8.fill(0, p, p + 48);
        for (let i = 0; i < 3; ++i) {
            v.setInt32(p + 24 + 4 * i, r.start[i], true);
            v.setInt32(p + 36 + 4 * i, r.end[i], true);
        }
        this.check(this.M._kova_set_rptinfo(ctx, id, p), "setting the repeat points");
    }

    // ---- filters ---------------------------------------------------------------------------

    writeFilter(p, type, f, format) {
        const v = this.dv();
        this.M.HEAPU8.fill(0, p, p + 40);
        v.setUint32(p, type, true);
        v.setFloat64(p + 8, f.freq, true);
        v.setFloat64(p + 16, f.bandwidth, true);
        v.setUint32(p + 24, f.enable ? 1 : 0, true);
        v.setInt32(p + 28, format.rate, true);
        v.setInt32(p + 32, format.channels, true);
    }

    attachFilter(ctx, id, format, type, f) {
        this.writeFilter(this.scratch, type, f, format);
        if (!this.M._kova_attach_filter(ctx, id, this.scratch, this.err)) {
            throw new KovaError(`cannot attach the ${FILTER_TYPES[type]} filter`, this.errCode());
        }
    }

    readFilters(at) {
        const v = this.dv();
        const out = [];
        for (let t = 0; t < 4; ++t) {
            const p = at + 40 * t;
            if (v.getUint32(p, true) !== t) continue; // untouched: the set has no such filter
            out.push({
                type: t, freq: v.getFloat64(p + 8, true), bandwidth: v.getFloat64(p + 16, true),
                enable: v.getUint32(p + 24, true), samplerate: v.getInt32(p + 28, true),
                channels: v.getInt32(p + 32, true),
            });
        }
        return out;
    }

    presetFilterArray(at) {
        const v = this.dv();
        for (let t = 0; t < 4; ++t) v.setUint32(at + 40 * t, 0xffffffff, true);
    }

    getFilters(ctx, id) {
        const at = this.M._malloc(160);
        try {
            this.presetFilterArray(at);
            this.M._kova_get_filters(ctx, id, at);
            return this.readFilters(at);
        } finally {
            this.M._free(at);
        }
    }

    // The biquad the engine designs for a filter: {a0, a1, a2, b1, b2}.
    biquad(rate, type, freq, bandwidth) {
        const p = this.scratch;
        this.M.HEAPU8.fill(0, p, p + 80);
        this.M._makefilter(p, rate, type, freq, bandwidth);
        const v = this.dv();
        const c = (i) => v.getFloat64(p + 8 * i, true);
        return { a0: c(2), a1: c(3), a2: c(4), b1: c(5), b2: c(6) };
    }

    // ---- saving and opening ------------------------------------------------------------------

    save(ctx, id) {
        const path = "/studio/save.kset";
        if (this.M.FS.analyzePath(path).exists) this.M.FS.unlink(path); // the engine does not truncate
        const n = this.M._kova_save_source(ctx, id, this.cstr(path));
        if (n < 0) throw new KovaError("cannot save the set", n);
        const bytes = this.M.FS.readFile(path);
        this.M.FS.unlink(path);
        return bytes;
    }

    // What `kova inspect` shows of a saved file, through the library's file queries.
    inspect(bytes) {
        return this.withFile("inspect.kset", bytes, (path) => {
            const M = this.M;
            const cpath = this.cstr(path);
            const at = M._malloc(24 + 160 + 88 + 48);
            try {
                const v = () => this.dv();
                for (let i = 0; i < 6; ++i) v().setInt32(at + 4 * i, -1, true);
                const fail = (code, what) => {
                    if (code !== 0) throw new KovaError(`cannot read the ${what}`, code);
                };
                fail(M._kova_get_pcminfo_fromfile(cpath, at, at + 4, at + 8, at + 12, at + 16, at + 20), "payloads");
                this.presetFilterArray(at + 24);
                fail(M._kova_get_filters_fromfile(cpath, at + 24), "filters");
                fail(M._kova_get_tuneset_fromfile(cpath, at + 184), "tune set");
                fail(M._kova_get_rptinfo_fromfile(cpath, at + 272), "repeat points");
                const d = v();
                const slots = SLOTS.map((name, s) => ({
                    name, offset: d.getInt32(at + 8 * s, true), size: d.getInt32(at + 8 * s + 4, true),
                    lengthMs: Number(d.getBigInt64(at + 272 + 8 * s, true)),
                    repeatStartMs: d.getInt32(at + 272 + 24 + 4 * s, true),
                    repeatEndMs: d.getInt32(at + 272 + 36 + 4 * s, true),
                }));
                const tune = {};
                for (const [name, off, int] of TUNE_FIELDS) {
                    tune[name] = int ? d.getInt32(at + 184 + off, true) : d.getFloat64(at + 184 + off, true);
                }
                return { slots, filters: this.readFilters(at + 24), tune };
            } finally {
                M._free(at);
            }
        });
    }
}

// A plausibility check of a source-set file before the engine reads it: the file has no magic
// number, so any bytes would be read as one. Returns the reason it is not a usable set, or null.
export function setFileProblem(bytes) {
    const v = new DataView(bytes.buffer, bytes.byteOffset, bytes.byteLength);
    const size = bytes.byteLength;
    if (size < 4) return "it is shorter than 4 bytes";
    const count = v.getInt32(0, true);
    if (count < 0 || count > MAX_FILTERS) return `its filter count ${count} is outside 0..${MAX_FILTERS}`;
    const infoAt = 4 + 40 * count + 88;
    if (infoAt + 20 > size) return "it ends before its slot table";
    let pos = infoAt + 20;
    const has = [0, 1, 2].map((s) => v.getInt32(infoAt + 4 * s, true));
    for (let s = 0; s < 3; ++s) {
        if (has[s] !== 1) continue;
        if (pos + 48 > size) return `it ends inside the record of the ${SLOTS[s]} sound`;
        const n = v.getInt32(pos + 24, true);
        if (n < 1 || n > SLOT_MAX_BYTES[s]) {
            return `its ${SLOTS[s]} sound claims ${n} bytes, accepted 1..${SLOT_MAX_BYTES[s]}`;
        }
        pos += 48 + n;
        if (pos > size) return `its ${SLOTS[s]} sound runs past the end of the file`;
    }
    if (has[1] !== 1) return "it has no loop sound, so it cannot play a stroke";
    return null;
}

// The format a saved file was made for: {rate, channels}.
export function setFileFormat(bytes) {
    const v = new DataView(bytes.buffer, bytes.byteOffset, bytes.byteLength);
    const infoAt = 4 + 40 * v.getInt32(0, true) + 88;
    return { rate: v.getInt32(infoAt + 12, true), channels: v.getInt32(infoAt + 16, true) };
}
