// What the element morvadenoise does with buffers, events and queries; its GObject is element.cpp.
//
// Sound is cleaned where it lies. It comes out late, but labelled with its own time: buffers are
// brought back by the latency, the first ones are cut, and a tail follows at the end. So what goes
// into a file lies where it lay, and a live pipeline waits for as long as the latency query says.
// After the first buffers nothing is allocated or locked here but for messages, which are
// GStreamer's.
#pragma once

#include <gst/base/gstbasetransform.h>

#include <atomic>
#include <memory>
#include <string>
#include <vector>

#include "stream_adapter.h"

namespace morva::plugins {

// As the application has set them, on any thread.
struct Properties {
    std::atomic<float> limitDb = kNoLimitDb;
    std::atomic<bool> bypass = false;
    std::atomic<GstClockTime> interval = 100 * GST_MSECOND;  // 0: no messages
    std::string model;  // under the element's object lock; empty: chosen by the rate
};

// All on the streaming thread but for what says otherwise.
class Denoiser {
public:
    explicit Denoiser(GstBaseTransform& element) : element_(element) {}

    Properties properties;

    // Sound of this format follows. False, with an error on the bus, when it cannot be cleaned.
    bool begin(int rateHz, int channels);
    // No sound follows.
    void end();
    // Cleans a writable buffer and brings it back to its own time.
    GstFlowReturn transform(GstBuffer* buffer);
    // Pushes what is still on its way, as before a gap or the end.
    GstFlowReturn drain();
    // Forgets what is still on its way.
    void flush();
    // [any thread] Adds the latency to upstream's.
    bool answerLatency(GstQuery* query) const;

private:
    GstClockTime duration(std::size_t samples) const;
    void clean(float* samples, std::size_t count, GstClockTime start);
    void frameDone(GstClockTime end);
    void post(GstClockTime timestamp) const;
    GstFlowReturn bringBack(GstBuffer* buffer, std::size_t count);

    GstBaseTransform& element_;
    std::unique_ptr<StreamAdapter> adapter_;
    std::vector<Lane> lanes_;
    guint64 rateHz_ = 1;
    std::atomic<GstClockTime> latency_ = 0;
    GstClockTime end_ = GST_CLOCK_TIME_NONE;  // of the newest buffer
    std::size_t heard_ = 0;                   // samples since begin, drain or flush
    std::size_t toCut_ = 0;  // samples of output until the first one heard comes out
    GstClockTime sinceMessage_ = 0;
};

}  // namespace morva::plugins
