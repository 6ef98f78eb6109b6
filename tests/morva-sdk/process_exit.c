/* Calls the engine from a handler of process exit that was registered before the engine existed, so
 * that it runs after the engine's own objects are gone: errors, not crashes. */
#include <stdio.h>
#include <stdlib.h>
#include <string.h>

#include "morva-sdk/morva-ext.h"
#include "morva-sdk/morva-sdk.h"

static void* session;

static void expect(int ok, char const* what) {
    if (ok) return;
    fprintf(stderr, "wrong: %s\n", what);
    _Exit(1);
}

static void lastCalls(void) {
    static short frame[160];
    expect(Morva_NC_CleanAmbientNoiseInt16(session, frame, 160, frame, 160) == -3, "frame");
    expect(Morva_NC_CloseSession(session) == -3, "close");
    expect(Morva_SDK_GlobalDestroy() == -3, "destroy");
    expect(strstr(MorvaExt_LastError(), "DESTROYING WITHOUT INTIALIZATION") != NULL, "text");
}

int main(int count, char** arguments) {
    expect(count == 2, "usage: process_exit WEIGHT");
    expect(atexit(lastCalls) == 0, "atexit");
    wchar_t path[1024];
    expect(mbstowcs(path, arguments[1], 1024) < 1024, "path");
    expect(Morva_SDK_GlobalInit(NULL, 1) == 0, "initialise");
    expect(Morva_SDK_SetModel(path, "model") == 0, "model");
    session =
        Morva_NC_CreateSession(MORVA_RATE_16000, MORVA_RATE_16000, MORVA_FRAME_10_MS, "model");
    expect(session != NULL, "session");
    return 0;
}
