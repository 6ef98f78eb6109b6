/*
 * Cleans raw sound from standard input to standard output: mono, 16-bit, in frames of 10 ms.
 *
 *   sox noisy.wav -t raw -r 48000 -c 1 -b 16 -e signed - \
 *     | denoise models/c6.xs.f.ca03f4.mvw 48000 | play -t raw -r 48000 -c 1 -b 16 -e signed -
 */
#include <locale.h>
#include <stdio.h>
#include <stdlib.h>
#include <unistd.h>

#include "morva-sdk.h"

enum { longestFrame = 960 }; /* 10 ms at 96000 Hz */

static int run(FILE* in, FILE* out, MorvaSamplingRate rate) {
    void* session = Morva_NC_CreateSession(rate, rate, MORVA_FRAME_10_MS, "model");
    if (session == NULL) return 1; /* the reason stands on standard error */

    unsigned int const size = (unsigned int)rate * MORVA_FRAME_10_MS / 1000;
    short frame[longestFrame] = {0};
    int failed = 0;
    for (size_t got; !failed && (got = fread(frame, sizeof *frame, size, in)) > 0;) {
        for (size_t i = got; i < size; ++i) frame[i] = 0; /* the last frame, filled up */
        failed = Morva_NC_CleanAmbientNoiseInt16(session, frame, size, frame, size) != 0 ||
                 fwrite(frame, sizeof *frame, got, out) != got;
    }
    Morva_NC_CloseSession(session);
    return failed || ferror(in) || fflush(out) != 0;
}

int main(int argc, char** argv) {
    wchar_t path[4096];
    if (argc != 3) {
        fprintf(stderr, "usage: denoise MODEL.mvw RATE < noisy.raw > clean.raw\n");
        return 2;
    }
    setlocale(LC_CTYPE, "C.UTF-8"); /* model paths are wide strings */
    if (mbstowcs(path, argv[1], sizeof path / sizeof *path) >= sizeof path / sizeof *path) return 2;

    /* Registration reports on standard output: let it go to standard error, the sound needs the
     * other. */
    FILE* sound = fdopen(dup(1), "wb");
    if (sound == NULL || dup2(2, 1) < 0) return 1;

    int status = 1;
    if (Morva_SDK_GlobalInit(NULL, 1) == 0) {
        if (Morva_SDK_SetModel(path, "model") == 0)
            status = run(stdin, sound, (MorvaSamplingRate)atoi(argv[2]));
        Morva_SDK_GlobalDestroy();
    }
    return status;
}
