/* Runs where the engine cannot (an emulated processor without the feature that is named): it says
 * so, and a caller who goes on all the same gets errors, not an illegal instruction. */
#include <stdio.h>
#include <string.h>

#include "morva-sdk/morva-ext.h"
#include "morva-sdk/morva-sdk.h"

static int failures = 0;

static void expect(int ok, char const* what) {
    if (ok) return;
    fprintf(stderr, "wrong: %s\n", what);
    ++failures;
}

int main(int count, char** names) {
    char text[64];
    snprintf(text, sizeof text, "does not support %s,", count > 1 ? names[1] : "");
    short frame[480] = {0};
    int handle = 0;
    expect(Morva_SDK_GlobalInit(NULL, 1) == -3, "initialise");
    expect(strstr(MorvaExt_LastError(), text) != NULL, "text");
    expect(Morva_SDK_SetModel(L"model.mvw", "model") == -3, "file");
    expect(Morva_SDK_SetModel_Blob("bytes", 5, "model") == -3, "bytes");
    expect(
        Morva_NC_CreateSession(MORVA_RATE_48000, MORVA_RATE_48000, MORVA_FRAME_10_MS, NULL) == NULL,
        "session");
    expect(Morva_VAD_CreateSession(MORVA_RATE_48000, MORVA_FRAME_10_MS, NULL) == NULL, "voice");
    expect(Morva_NC_CleanAmbientNoiseInt16(&handle, frame, 480, frame, 480) == -3, "frame");
    expect(Morva_NC_CloseSession(&handle) == -3, "close");
    expect(Morva_SDK_GlobalDestroy() == -3, "destroy");
    return failures;
}
