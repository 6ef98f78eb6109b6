/*
 * Prints what models make of a recording, for comparing one platform with another.
 *
 *   values RECORDING {NC|VAD|NoiseDB MODEL.mvw} ...    (raw, 16-bit, mono, 48000 Hz)
 *
 * A line is the model's kind and a value: cleaned samples of full scale 1, scores, levels.
 */
#include <stdio.h>
#include <string.h>

#include "morva-sdk.h"

enum { frameSize = 480 };

static int values(char const* kind, FILE* sound) {
    void* session =
        strcmp(kind, "NC") == 0
            ? Morva_NC_CreateSession(MORVA_RATE_48000, MORVA_RATE_48000, MORVA_FRAME_10_MS, kind)
        : strcmp(kind, "VAD") == 0
            ? Morva_VAD_CreateSession(MORVA_RATE_48000, MORVA_FRAME_10_MS, kind)
            : Morva_NoiseDB_CreateSession(MORVA_RATE_48000, MORVA_FRAME_10_MS, kind);
    if (session == NULL) return 1;
    short in[frameSize];
    float out[frameSize], exact[frameSize];
    rewind(sound);
    while (fread(in, sizeof *in, frameSize, sound) == frameSize) {
        int count = 1;
        if (strcmp(kind, "NC") == 0) {
            count = frameSize;
            for (int i = 0; i < frameSize; ++i) exact[i] = (float)in[i] / 32768;
            if (Morva_NC_CleanAmbientNoiseFloat(session, exact, frameSize, out, frameSize))
                return 1;
        } else if (strcmp(kind, "VAD") == 0) {
            out[0] = Morva_VAD_FrameInt16(session, in, frameSize);
        } else {
            out[0] = Morva_NoiseDB_FrameInt16(session, in, frameSize);
        }
        for (int i = 0; i < count; ++i) printf("%s %.9g\n", kind, (double)out[i]);
    }
    return 0;
}

int main(int count, char** names) {
    FILE* sound = count > 1 ? fopen(names[1], "rb") : NULL;
    if (sound == NULL) return 2;
    int failed = 0;
    for (int i = 2; i + 1 < count && !failed; i += 2) {
        wchar_t path[1024] = L"";
        for (size_t k = 0; k < 1023 && names[i + 1][k]; ++k) path[k] = (wchar_t)names[i + 1][k];
        failed = Morva_SDK_GlobalInit(NULL, 1) != 0 || Morva_SDK_SetModel(path, names[i]) != 0 ||
                 values(names[i], sound) || Morva_SDK_GlobalDestroy() != 0;
    }
    fclose(sound);
    return failed;
}
