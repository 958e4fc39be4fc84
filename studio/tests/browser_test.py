"""Browser tests of the studio: the page in headless Chromium against the native library.

1. generate() equals the native library's bytes for the same saved set and events;
2. a stroke drawn with real pointer events reaches the worklet as sound;
3. the page's built-in set is the tool's; a set saved from the page (its download) registers
   natively and sounds the same, and the page shows what `kova inspect` shows of it;
4. a bad file dropped or loaded gives a clear message and leaves the design intact;
5. screenshots at desktop and phone size, with the page laid out to fit.
"""
import argparse
import base64
import ctypes
import math
import os
import shutil
import struct
import subprocess
import sys
import tempfile
import time
import traceback

sys.path.insert(0, os.path.join(os.path.dirname(os.path.abspath(__file__)), ".."))
import serve  # noqa: E402

from selenium import webdriver  # noqa: E402
from selenium.webdriver.chrome.service import Service  # noqa: E402
from selenium.webdriver.common.action_chains import ActionChains  # noqa: E402
from selenium.webdriver.common.by import By  # noqa: E402

FORMAT = (48000, 2, 1, 1080, 2280)  # the page's format unless changed


# ---- the native library -----------------------------------------------------------------------

class Format(ctypes.Structure):
    _fields_ = [(n, ctypes.c_uint32) for n in ("rate", "channels", "p", "w", "h")]


class Param(ctypes.Structure):
    _fields_ = [("x", ctypes.c_float), ("y", ctypes.c_float), ("time", ctypes.c_int64),
                ("aux", ctypes.c_float), ("action", ctypes.c_uint32)]


class PcmBuf(ctypes.Structure):
    _fields_ = [("data", ctypes.POINTER(ctypes.c_int16)), ("size", ctypes.c_int32)]


class FilterDsc(ctypes.Structure):
    _fields_ = [("type", ctypes.c_uint32), ("freq", ctypes.c_double),
                ("bandwidth", ctypes.c_double), ("enable", ctypes.c_uint32),
                ("samplerate", ctypes.c_int32), ("channels", ctypes.c_int32)]


class TuneSet(ctypes.Structure):
    _fields_ = [("gain", ctypes.c_double), ("pan", ctypes.c_double),
                ("osc_enable", ctypes.c_int32), ("osc_depth", ctypes.c_double),
                ("sharp_enable", ctypes.c_int32), ("sharpness", ctypes.c_double),
                ("wn_gain", ctypes.c_double), ("file_gain", ctypes.c_double),
                ("start_gain", ctypes.c_double), ("loop_gain", ctypes.c_double),
                ("end_gain", ctypes.c_double)]


class Native:
    def __init__(self, path):
        self.lib = ctypes.CDLL(os.path.abspath(path))
        self.lib.kova_init.restype = ctypes.c_void_p
        for name in ("kova_deinit", "kova_gen_sounds", "kova_reg_src_bysavefile",
                     "kova_reg_src_byfilter", "kova_set_active_src", "kova_save_source",
                     "kova_set_tuneset", "kova_update_src_byfiles", "kova_attach_filter"):
            getattr(self.lib, name).argtypes = None
        self.err = ctypes.c_int32()

    def context(self, fmt=FORMAT):
        ctx = self.lib.kova_init(ctypes.byref(Format(*fmt)), ctypes.byref(self.err))
        assert ctx, f"native kova_init failed ({self.err.value})"
        return ctypes.c_void_p(ctx)

    def render(self, set_file, events, fmt=FORMAT):
        """Registers a saved set in a fresh context and returns the blocks of `events`."""
        ctx = self.context(fmt)
        try:
            sid = self.lib.kova_reg_src_bysavefile(ctx, set_file.encode(), ctypes.byref(self.err))
            assert sid > 0, f"the native library refused {set_file} ({self.err.value})"
            assert self.lib.kova_set_active_src(ctx, sid) == 0
            pcm = (ctypes.c_int16 * 480000)()
            out = bytearray()
            for ev in events:
                buf = PcmBuf(ctypes.cast(pcm, ctypes.POINTER(ctypes.c_int16)), ctypes.sizeof(pcm))
                p = Param(ev["x"], ev["y"], ev["time"], 0.0, ev["action"])
                n = self.lib.kova_gen_sounds(ctx, ctypes.byref(p), ctypes.byref(buf))
                out += ctypes.string_at(pcm, n)
            return bytes(out)
        finally:
            self.lib.kova_deinit(ctx)

    def designed_set(self, path, folder):
        """A set with every part the engine has: noise loop through two filters, start and end
        sounds from files, oscillator and pitch raise on. Saved to `path`."""
        ctx = self.context()
        try:
            band = FilterDsc(2, 1800.0, 2400.0, 1, 48000, 2)
            sid = self.lib.kova_reg_src_byfilter(ctx, ctypes.byref(band), ctypes.byref(self.err))
            assert sid > 0
            low = FilterDsc(0, 5000.0, 0.0, 1, 48000, 2)
            assert self.lib.kova_attach_filter(ctx, sid, ctypes.byref(low), ctypes.byref(self.err))
            slots = []
            for name, hz, ms in (("start", 900.0, 60), ("end", 500.0, 90)):
                frames = 48 * ms
                pcm = b"".join(struct.pack("<hh", *(2 * [int(12000 * math.sin(2 * math.pi * hz * i / 48000) * (1 - i / frames))]))
                               for i in range(frames))
                slot_path = os.path.join(folder, f"{name}.raw")
                with open(slot_path, "wb") as f:
                    f.write(pcm)
                slots.append(slot_path.encode())
            paths = (ctypes.c_char_p * 3)(slots[0], None, slots[1])
            assert self.lib.kova_update_src_byfiles(ctx, sid, paths, ctypes.byref(self.err))
            tune = TuneSet(0.9, 0.5, 1, 0.35, 1, 0.4, 0.8, 0.7, 0.8, 0.9, 0.7)
            assert self.lib.kova_set_tuneset(ctx, sid, ctypes.byref(tune)) == 0
            if os.path.exists(path):
                os.remove(path)
            assert self.lib.kova_save_source(ctx, sid, path.encode()) > 0
        finally:
            self.lib.kova_deinit(ctx)


def stroke(t0=1000, x0=200.0, y0=300.0):
    """A stroke with slow and fast stretches (fast moves reset the loop), at 8 to 16 ms steps."""
    events = [{"time": t0, "action": 0, "x": x0, "y": y0}]
    t, x, y = t0, x0, y0
    for i in range(80):
        t += 8 if i % 3 else 16
        speed = 3 if i < 30 else (40 if i < 55 else 9)
        x += speed * math.cos(i / 9.0)
        y += speed * math.sin(i / 13.0) + 2
        events.append({"time": t, "action": 1, "x": abs(x), "y": abs(y)})
    events.append({"time": t + 10, "action": 2, "x": abs(x), "y": abs(y)})
    return events


# ---- the page ---------------------------------------------------------------------------------

class Page:
    def __init__(self, url, downloads):
        opts = webdriver.ChromeOptions()
        opts.binary_location = "/usr/bin/chromium"
        self.profile = tempfile.mkdtemp(prefix="kova-studio-profile-")
        for a in ("--headless=new", "--no-sandbox", "--disable-gpu", "--disable-quic",
                  "--no-first-run", "--disable-background-networking", "--disable-component-update",
                  "--disable-sync", "--disable-dev-shm-usage", f"--user-data-dir={self.profile}",
                  "--autoplay-policy=no-user-gesture-required", "--window-size=1280,900"):
            opts.add_argument(a)
        opts.set_capability("goog:loggingPrefs", {"browser": "ALL"})
        self.d = webdriver.Chrome(service=Service("/usr/bin/chromedriver"), options=opts)
        self.d.execute_cdp_cmd("Browser.setDownloadBehavior",
                               {"behavior": "allow", "downloadPath": os.path.abspath(downloads)})
        self.d.get(url)
        self.wait("window.kovaStudio && window.kovaStudio.ready", "the engine to load")

    def quit(self):
        self.d.quit()
        shutil.rmtree(self.profile, ignore_errors=True)

    def js(self, script, *args):
        return self.d.execute_script(script, *args)

    def wait(self, condition, what, seconds=20):
        end = time.time() + seconds
        while time.time() < end:
            if self.js(f"return !!({condition})"):
                return
            time.sleep(0.1)
        raise AssertionError(f"timed out waiting for {what}")

    def generate(self, events):
        b64 = self.js("const a = kovaStudio.generate(arguments[0]);"
                      "let s = ''; const u = new Uint8Array(a.buffer);"
                      "for (let i = 0; i < u.length; i += 8192) s += String.fromCharCode(...u.subarray(i, i + 8192));"
                      "return btoa(s);", events)
        return base64.b64decode(b64)

    def load_set(self, data):
        """kovaStudio.loadSet; returns (id, None) or (None, error message)."""
        return self.js("try { return [kovaStudio.loadSet(Uint8Array.from(atob(arguments[0]), c => c.charCodeAt(0))), null]; }"
                       "catch (e) { return [null, e.message]; }", base64.b64encode(data).decode())

    def messages(self):
        return [li.text for li in self.d.find_elements(By.CSS_SELECTOR, "#messages li")]

    def drop(self, target, name, data):
        """Drops a file on a drop zone through the page's own drop handler."""
        self.js("const f = new File([Uint8Array.from(atob(arguments[2]), c => c.charCodeAt(0))], arguments[1]);"
                "const dt = new DataTransfer(); dt.items.add(f);"
                "document.querySelector(`.drop[data-target='${arguments[0]}']`)"
                ".dispatchEvent(new DragEvent('drop', {dataTransfer: dt, bubbles: true, cancelable: true}));",
                target, name, base64.b64encode(data).decode())


def first_difference(a, b):
    for i in range(min(len(a), len(b)) // 2):
        if a[2 * i:2 * i + 2] != b[2 * i:2 * i + 2]:
            return f"sample {i}: page {struct.unpack_from('<h', a, 2 * i)[0]}, native {struct.unpack_from('<h', b, 2 * i)[0]}"
    return f"lengths {len(a)} and {len(b)} bytes"


# ---- the tests --------------------------------------------------------------------------------

def test_generate_matches_native(page, native, work):
    set_file = os.path.join(work, "designed.kset")
    native.designed_set(set_file, work)
    with open(set_file, "rb") as f:
        data = f.read()
    sid, err = page.load_set(data)
    assert err is None and sid >= 1, f"loadSet refused a set the library saved: {err}"
    events = stroke()
    want = native.render(set_file, events)
    got = page.generate(events)
    assert len(want) > 100000 and any(want), "the native reference is too short or silent"
    assert got == want, f"page and native differ: {first_difference(got, want)}"
    return f"{len(got)} bytes identical"


def test_stroke_reaches_worklet(page):
    pad = page.d.find_element(By.ID, "pad")
    before = page.js("return kovaStudio.audioStats()")
    assert before["state"] == "running", f"audio is not running: {before}"
    w, h = pad.size["width"], pad.size["height"]
    chain = ActionChains(page.d, duration=0)
    chain.move_to_element_with_offset(pad, -w // 4, -h // 4).click_and_hold()
    for i in range(40):
        chain.move_by_offset(4 if i % 2 else 6, 5).pause(0.012)
    chain.release().perform()
    page.wait("kovaStudio.audioStats().nonSilent > " + str(before["nonSilent"] + 2000),
              "the worklet to play the stroke", seconds=10)
    after = page.js("return kovaStudio.audioStats()")
    assert after["peak"] > 1000, f"the stroke played too quietly: {after}"
    return f"worklet played {after['frames'] - before['frames']} frames, peak {after['peak']}"


def slots_present(data):
    """The has-source flags of a saved file's slot table."""
    info_at = 4 + 40 * struct.unpack_from("<i", data, 0)[0] + 88
    return list(struct.unpack_from("<3i", data, info_at))


def download(page, work, name):
    """Saves the page's design through its Save button; returns the downloaded bytes."""
    saved = os.path.join(work, name)
    if os.path.exists(saved):
        os.remove(saved)
    page.js("document.getElementById('save-name').value = arguments[0];"
            "document.getElementById('save').click();", name)
    end = time.time() + 10
    while not os.path.exists(saved) and time.time() < end:
        time.sleep(0.1)
    assert os.path.exists(saved), "the page's download did not arrive"
    time.sleep(0.2)  # the file is renamed into place when complete; let the size settle
    with open(saved, "rb") as f:
        return saved, f.read()


def test_saved_set_sounds_the_same_natively(page, native, kova, work):
    page.js("document.getElementById('builtin').click()")
    # The page's built-in set is the tool's, byte for byte.
    _, page_builtin = download(page, work, "page-builtin.kset")
    tool_builtin = os.path.join(work, "tool-builtin.kset")
    subprocess.run([kova, "save", "-o", tool_builtin], check=True, capture_output=True)
    with open(tool_builtin, "rb") as f:
        assert page_builtin == f.read(), "the page's built-in set differs from `kova save`'s"

    # Shape the design through the controls: a new low-pass filter and the pitch raise.
    page.js("""
        const boxes = [...document.querySelectorAll('#filters .filter')];
        const low = boxes[0].querySelector('input[type=checkbox]');
        low.checked = true; low.dispatchEvent(new Event('change'));
        const pitch = [...document.querySelectorAll('#tune .control')].find(l => l.textContent.startsWith('pitch raise'));
        const box = pitch.querySelector('input'); box.checked = true; box.dispatchEvent(new Event('change'));
    """)
    saved, data = download(page, work, "studio-test.kset")
    assert data != page_builtin, "the edits did not reach the saved set"
    # A filter change reloads file sources: the start and end sounds must survive it.
    assert slots_present(data) == [1, 1, 1], f"slots lost after a filter edit: {slots_present(data)}"
    # The page shows what `kova inspect` shows of the file.
    shown = page.d.find_element(By.ID, "inspect").get_attribute("textContent").splitlines()
    told = subprocess.run([kova, "inspect", saved], check=True, capture_output=True, text=True).stdout.splitlines()
    assert shown[1:] == told[1:], f"the page's view of the file differs from `kova inspect`: {shown} vs {told}"
    events = stroke(t0=5000, x0=800.0, y0=1500.0)
    want = native.render(saved, events)
    got = page.generate(events)
    assert any(want), "the saved set is silent natively"
    assert got == want, f"the saved set sounds different natively: {first_difference(got, want)}"
    return f"built-in set equals `kova save`; {len(data)}-byte file, {len(got)} bytes identical"


def test_bad_files_leave_design_intact(page):
    events = stroke(t0=9000)
    before = page.generate(events)
    status = page.d.find_element(By.ID, "status").text
    cases = [
        ("loadSet", b"not a source-set file at all", "filter count"),
        ("loadSet", struct.pack("<i", 0) + bytes(88) + struct.pack("<5i", 0, 1, 0, 48000, 2) + bytes(48 + 10)[:30],
         "record of the loop sound"),
        ("drop set", struct.pack("<i", 0) + bytes(88) + struct.pack("<5i", 0, 0, 0, 48000, 2), "no loop sound"),
        ("drop loop", b"plain text, no sound in it", "cannot decode"),
        ("drop end", b"", "is empty"),
    ]
    for how, data, expect in cases:
        if how == "loadSet":
            sid, err = page.load_set(data)
            assert sid is None and err and expect in err, f"loadSet of a bad file: {sid}, {err}"
        else:
            target = {"set": "set", "loop": "1", "end": "2"}[how.split()[1]]
            page.drop(target, "bad.wav" if target != "set" else "bad.kset", data)
            page.wait(f"[...document.querySelectorAll('#messages li.error')].some(li => li.textContent.includes({expect!r}))",
                      f"a message containing {expect!r}", seconds=10)
        shown = page.messages()
        assert any(expect in m for m in shown), f"no clear message for {how}: {shown}"
    assert page.d.find_element(By.ID, "status").text == status, "the design changed"
    after = page.generate(events)
    assert after == before, "a refused file changed the design's sound"
    return f"{len(cases)} refusals, each with a message, design unchanged"


def test_screenshots(page, artifacts):
    shots = []
    for name, w, h in (("desktop", 1280, 900), ("phone", 390, 844)):
        page.d.set_window_size(w, h)
        time.sleep(0.5)
        inner = page.js("return [innerWidth, document.documentElement.scrollWidth]")
        assert inner[1] <= inner[0] + 1, f"{name}: the page is wider than the screen: {inner}"
        pad = page.d.find_element(By.ID, "pad")
        assert pad.size["width"] > 100 and pad.size["height"] > 100, f"{name}: surface too small: {pad.size}"
        path = os.path.join(artifacts, f"studio-{name}.png")
        assert page.d.save_screenshot(path) and os.path.getsize(path) > 10000, f"{name}: no screenshot"
        shots.append(path)
    page.d.set_window_size(1280, 900)
    return ", ".join(shots)


def main():
    ap = argparse.ArgumentParser()
    ap.add_argument("--site", required=True)
    ap.add_argument("--library", required=True)
    ap.add_argument("--kova", required=True, help="the kova tool, for its built-in set")
    ap.add_argument("--artifacts", required=True)
    args = ap.parse_args()
    os.makedirs(args.artifacts, exist_ok=True)
    work = tempfile.mkdtemp(prefix="kova-studio-")
    native = Native(args.library)
    server = serve.start(args.site)
    page = None
    failed = 0
    try:
        page = Page(server.url, work)
        tests = [
            ("generate() equals the native library", lambda: test_generate_matches_native(page, native, work)),
            ("a drawn stroke reaches the worklet", lambda: test_stroke_reaches_worklet(page)),
            ("a saved set sounds the same natively", lambda: test_saved_set_sounds_the_same_natively(page, native, args.kova, work)),
            ("bad files leave the design intact", lambda: test_bad_files_leave_design_intact(page)),
            ("screenshots", lambda: test_screenshots(page, args.artifacts)),
        ]
        for name, fn in tests:
            try:
                print(f"studio test: {name}: ok ({fn()})", flush=True)
            except Exception as e:  # noqa: BLE001 - every failure is reported, then the next test runs
                failed += 1
                print(f"studio test: {name}: FAILED: {e}", flush=True)
                traceback.print_exc()
        if failed:
            for entry in page.d.get_log("browser"):
                print("browser:", entry["message"][:400])
    finally:
        if page:
            page.quit()
        server.shutdown()
        server.server_close()
        shutil.rmtree(work, ignore_errors=True)
    print(f"studio tests: {5 - failed} of 5 passed")
    return 1 if failed else 0


if __name__ == "__main__":
    sys.exit(main())
