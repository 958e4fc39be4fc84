// SPDX-License-Identifier: Apache-2.0
// A program that uses the installed library the way an application does: writes three raw PCM
// sounds, registers them, and renders a touch-down and one 16 ms move. Prints the header version
// so the caller can compare it with the package's. Exit status 0 only when the move rendered 16 ms
// of audible stereo at 48000 Hz. Usage: stroke DIRECTORY (where the sound files are written).
#include <kova/kova.h>
#include <stdio.h>
#include <string.h>

// A square wave of `period` samples, 8000 high and 8000 low.
static int write_sound(const char* path, int bytes, int period) {
    FILE* f = fopen(path, "wb");
    for (int i = 0; f != NULL && i < bytes / 2; i++) {
        int16_t v = (int16_t)(i % period < period / 2 ? 8000 : -8000);
        fwrite(&v, sizeof v, 1, f);
    }
    return f == NULL ? -1 : fclose(f);
}

int main(int argc, char** argv) {
    static const char* names[KOVA_SLOT_COUNT] = {"start.raw", "loop.raw", "end.raw"};
    static const int sizes[KOVA_SLOT_COUNT] = {9600, 96000, 9600};
    char paths[KOVA_SLOT_COUNT][512];
    const char* path_ptrs[KOVA_SLOT_COUNT] = {paths[0], paths[1], paths[2]};
    if (argc != 2) return 2;
    for (int s = 0; s < KOVA_SLOT_COUNT; s++) {
        snprintf(paths[s], sizeof paths[s], "%s/%s", argv[1], names[s]);
        if (write_sound(paths[s], sizes[s], 200) != 0) return 1;
    }
    printf("version %s\n", KOVA_VERSION_STRING);

    KOVA_FORMAT fmt = {48000, 2, 1, 1080, 2280};
    int32_t err;
    KOVA_CTX* ctx = kova_init(&fmt, &err);
    if (ctx == NULL) return 1;
    int ok =
        kova_reg_src_byfiles(ctx, path_ptrs, &err) == 1 && kova_set_active_src(ctx, 1) == KOVA_OK;

    static int16_t pcm[96000];
    KOVA_PCMBUF out = {pcm, sizeof pcm};
    KOVA_PARAM ev = {100.f, 100.f, 1000, 0.f, KOVA_ACTION_START};
    ok = ok && kova_gen_sounds(ctx, &ev, &out) > 0;
    memset(pcm, 0, sizeof pcm);
    ev = (KOVA_PARAM){130.f, 140.f, 1016, 0.f, KOVA_ACTION_MOVE};
    int32_t bytes = kova_gen_sounds(ctx, &ev, &out);
    int audible = 0;
    for (int i = 0; i < bytes / 2; i++) audible |= pcm[i] != 0;
    printf("move: %d bytes, %s\n", (int)bytes, audible ? "audible" : "silent");
    ok = ok && bytes == 16 * 48 * 2 * 2 && audible;
    return kova_deinit(ctx) == KOVA_OK && ok ? 0 : 1;
}
