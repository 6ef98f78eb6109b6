/* Runs where the engine cannot (an emulated processor without the feature that is named): it says
 * so, and a caller who goes on all the same gets errors, not an illegal instruction. */
#include <stdio.h>
#include <string.h>

#include "morva-sdk/morva-ext.h"
#include "morva-sdk/morva-sdk.h"

static int check(int ok, char const* what) {
    if (!ok) fprintf(stderr, "wrong: %s\n", what);
    return !ok;
}

int main(int count, char** names) {
    char text[64];
    snprintf(text, sizeof text, "does not support %s,", count > 1 ? names[1] : "");
    short frame[480] = {0};
    int failures = check(Morva_SDK_GlobalInit(NULL, 1) == -3, "initialise");
    failures += check(strstr(MorvaExt_LastError(), text) != NULL, "text");
    failures += check(Morva_SDK_SetModel(L"model.mvw", "model") == -3, "file");
    failures += check(!Morva_VAD_CreateSession(MORVA_RATE_48000, MORVA_FRAME_10_MS, NULL), "open");
    failures += check(Morva_NC_CleanAmbientNoiseInt16(text, frame, 480, frame, 480) == -3, "frame");
    failures += check(Morva_NC_CloseSession(text) == -3, "close");
    return failures + check(Morva_SDK_GlobalDestroy() == -3, "destroy");
}
