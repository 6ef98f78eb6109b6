#include "denoiser.h"

#include <algorithm>
#include <exception>

namespace morva::plugins {
namespace {

// The samples of a buffer while they are worked on.
class Samples {
public:
    explicit Samples(GstBuffer* buffer) : buffer_(buffer) {
        mapped_ = gst_buffer_map(buffer, &map_, GST_MAP_READWRITE) != FALSE;
    }
    Samples(Samples const&) = delete;
    Samples& operator=(Samples const&) = delete;
    ~Samples() {
        if (mapped_) gst_buffer_unmap(buffer_, &map_);
    }
    float* data() const { return mapped_ ? reinterpret_cast<float*>(map_.data) : nullptr; }
    std::size_t count() const { return mapped_ ? map_.size / sizeof(float) : 0; }

private:
    GstBuffer* buffer_;
    GstMapInfo map_{};
    bool mapped_;
};

}  // namespace

bool Denoiser::begin(int rateHz, int channels) {
    drain();
    GST_OBJECT_LOCK(&element_);
    auto const model = properties.model;
    GST_OBJECT_UNLOCK(&element_);
    try {
        auto const count = static_cast<std::size_t>(channels);
        adapter_ = std::make_unique<StreamAdapter>(
            StreamAdapter::Setup{count, rateHz, properties.interval != 0, model});
        lanes_.assign(count, {});
    } catch (std::exception const& failure) {
        end();
        GST_ELEMENT_ERROR(&element_, LIBRARY, INIT, (nullptr), ("%s", failure.what()));
        return false;
    }
    rateHz_ = static_cast<guint64>(rateHz);
    heard_ = 0;
    toCut_ = adapter_->latency();
    latency_ = duration(toCut_);
    gst_element_post_message(GST_ELEMENT_CAST(&element_),
                             gst_message_new_latency(GST_OBJECT_CAST(&element_)));
    return true;
}

void Denoiser::end() {
    adapter_.reset();
    heard_ = 0;
    latency_ = 0;
}

GstFlowReturn Denoiser::transform(GstBuffer* buffer) {
    if (!adapter_) return GST_FLOW_NOT_NEGOTIATED;
    if (GST_BUFFER_IS_DISCONT(buffer)) {
        if (auto const flow = drain(); flow != GST_FLOW_OK) return flow;
    }
    std::size_t count = 0;
    {
        Samples const samples(buffer);
        count = samples.count() / lanes_.size();
        clean(samples.data(), count, GST_BUFFER_PTS(buffer));
    }
    heard_ += count;
    if (GST_BUFFER_PTS_IS_VALID(buffer)) end_ = GST_BUFFER_PTS(buffer) + duration(count);
    return bringBack(buffer, count);
}

void Denoiser::clean(float* samples, std::size_t count, GstClockTime start) {
    Settings const settings{properties.limitDb, properties.bypass};
    auto const channels = lanes_.size();
    for (std::size_t done = 0; done < count;) {
        auto const n = std::min(count - done, adapter_->untilFrame());
        for (std::size_t c = 0; c < channels; ++c) {
            auto* const first = samples + done * channels + c;
            lanes_[c] = {first, first, channels};
        }
        adapter_->run(lanes_, n, settings);
        done += n;
        if (adapter_->sinceFrame() > 0) continue;
        frameDone(GST_CLOCK_TIME_IS_VALID(start) ? start + duration(done) : start);
    }
}

// Brings the sound back by the latency and cuts what comes before all sound.
GstFlowReturn Denoiser::bringBack(GstBuffer* buffer, std::size_t count) {
    auto const cut = std::min(toCut_, count);
    toCut_ -= cut;
    if (cut == count) return GST_BASE_TRANSFORM_FLOW_DROPPED;
    auto const bytes = sizeof(float) * lanes_.size();
    gst_buffer_resize(buffer, static_cast<gssize>(cut * bytes),
                      static_cast<gssize>((count - cut) * bytes));
    if (GST_BUFFER_PTS_IS_VALID(buffer)) {
        GstClockTime const late = GST_BUFFER_PTS(buffer) + duration(cut);
        GST_BUFFER_PTS(buffer) = late - std::min<GstClockTime>(late, latency_);
    }
    GST_BUFFER_DURATION(buffer) = duration(count - cut);
    GST_BUFFER_OFFSET(buffer) = GST_BUFFER_OFFSET_NONE;
    GST_BUFFER_OFFSET_END(buffer) = GST_BUFFER_OFFSET_NONE;
    return GST_FLOW_OK;
}

GstFlowReturn Denoiser::drain() {
    if (!adapter_ || heard_ == 0) return GST_FLOW_OK;
    auto const count = adapter_->latency();
    auto const bytes = count * lanes_.size() * sizeof(float);
    auto* const tail = gst_buffer_new_allocate(nullptr, bytes, nullptr);
    gst_buffer_memset(tail, 0, 0, bytes);
    GST_BUFFER_PTS(tail) = end_;
    {
        Samples const samples(tail);
        clean(samples.data(), count, end_);
    }
    auto const flow = bringBack(tail, count);
    heard_ = 0;
    toCut_ = count;
    if (flow == GST_FLOW_OK) return gst_pad_push(element_.srcpad, tail);
    gst_buffer_unref(tail);
    return GST_FLOW_OK;
}

// What the sessions hold comes out first, and is cut.
void Denoiser::flush() {
    if (!adapter_) return;
    heard_ = 0;
    toCut_ = adapter_->latency();
}

bool Denoiser::answerLatency(GstQuery* query) const {
    if (gst_pad_peer_query(element_.sinkpad, query) == FALSE) return false;
    gboolean live = FALSE;
    GstClockTime shortest = 0;
    GstClockTime longest = GST_CLOCK_TIME_NONE;
    gst_query_parse_latency(query, &live, &shortest, &longest);
    if (GST_CLOCK_TIME_IS_VALID(longest)) longest += latency_;
    gst_query_set_latency(query, live, shortest + latency_, longest);
    return true;
}

GstClockTime Denoiser::duration(std::size_t samples) const {
    return gst_util_uint64_scale(samples, GST_SECOND, rateHz_);
}

// A message is due once every interval, with the newest frame's own time.
void Denoiser::frameDone(GstClockTime end) {
    GstClockTime const interval = properties.interval;
    auto const frame = duration(adapter_->frame());
    sinceMessage_ += frame;
    if (interval == 0 || sinceMessage_ < interval) return;
    sinceMessage_ = 0;
    post(GST_CLOCK_TIME_IS_VALID(end) ? end - std::min(end, frame) : end);
}

void Denoiser::post(GstClockTime timestamp) const {
    auto const& [voice, levelDb] = adapter_->meters();
    auto const* const segment = &element_.segment;
    auto* const values = gst_structure_new(
        "morvadenoise", "timestamp", G_TYPE_UINT64, timestamp, "stream-time", G_TYPE_UINT64,
        gst_segment_to_stream_time(segment, GST_FORMAT_TIME, timestamp), "running-time",
        G_TYPE_UINT64, gst_segment_to_running_time(segment, GST_FORMAT_TIME, timestamp), "voice",
        G_TYPE_DOUBLE, static_cast<double>(voice), "level", G_TYPE_DOUBLE,
        static_cast<double>(levelDb), nullptr);
    gst_element_post_message(GST_ELEMENT_CAST(&element_),
                             gst_message_new_element(GST_OBJECT_CAST(&element_), values));
}

}  // namespace morva::plugins
