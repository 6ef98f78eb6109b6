/* The process ends while an audio thread is inside a frame, and a handler of process exit still
 * works with the engine. The handler is registered before the engine exists, so it runs after
 * whatever the engine registered: nothing of the engine may be gone by then. */
#include <pthread.h>
#include <sched.h>
#include <stdatomic.h>
#include <stdio.h>
#include <stdlib.h>

#include "morva-sdk/morva-ext.h"
#include "morva-sdk/morva-sdk.h"

static void* session;
static atomic_int framesDone;

static void expect(int ok, char const* what) {
    if (ok) return;
    fprintf(stderr, "wrong: %s\n", what);
    _Exit(1);
}

static void cleanFrame(void) {
    short frame[441] = {1000, -1000};
    expect(Morva_NC_CleanAmbientNoiseInt16(session, frame, 441, frame, 441) == 0, "frame");
}

static void* audioThread(void* unused) {
    for (;; ++framesDone) cleanFrame();
    return unused;
}

static void waitForFrames(int count) {
    for (int const from = framesDone; framesDone < from + count;) sched_yield();
}

static void lastCalls(void) {
    waitForFrames(50);
    void* late =
        Morva_NC_CreateSession(MORVA_RATE_48000, MORVA_RATE_44100, MORVA_FRAME_10_MS, "model");
    expect(late != NULL, "session");
    expect(Morva_NC_CloseSession(late) == 0, "close");
    waitForFrames(50);
}

int main(int count, char** arguments) {
    expect(count == 2, "usage: process_exit WEIGHT");
    expect(atexit(lastCalls) == 0, "atexit");
    wchar_t path[1024];
    expect(mbstowcs(path, arguments[1], 1024) < 1024, "path");
    expect(Morva_SDK_GlobalInit(NULL, 1) == 0, "initialise");
    expect(Morva_SDK_SetModel(path, "model") == 0, "model");
    session =
        Morva_NC_CreateSession(MORVA_RATE_44100, MORVA_RATE_44100, MORVA_FRAME_10_MS, "model");
    expect(session != NULL, "session");
    pthread_t thread;
    expect(pthread_create(&thread, NULL, audioThread, NULL) == 0, "thread");
    waitForFrames(10);
    return 0;
}
