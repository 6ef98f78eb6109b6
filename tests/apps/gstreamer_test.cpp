// The element morvadenoise in GStreamer's own harness, and the adapter under all plugins.
#include <gst/check/gstharness.h>
#include <gtest/gtest.h>

#include <algorithm>
#include <cmath>
#include <numeric>
#include <vector>

#include "stream_adapter.h"
#include "support/allocation_counter.h"
#include "support/random.h"

namespace {

using Sound = std::vector<float>;
constexpr std::size_t kRate = 48000;
constexpr std::size_t kLatency = 960;  // 10 ms for the blocks, as many of the engine

GstClockTime timeOf(std::size_t samples) {
    return gst_util_uint64_scale(samples, GST_SECOND, kRate);
}
double power(Sound const& sound) {
    return std::inner_product(sound.begin(), sound.end(), sound.begin(), 0.0) /
           static_cast<double>(sound.size());
}

class Element : public ::testing::Test {
protected:
    static void SetUpTestSuite() {
        gst_init(nullptr, nullptr);
        ASSERT_NE(gst_plugin_load_file(MORVA_GSTREAMER, nullptr), nullptr);
    }
    ~Element() override {
        gst_element_set_bus(harness_->element, nullptr);
        gst_harness_teardown(harness_);
        gst_object_unref(bus_);
    }

    template <class... Values>
    void set(Values... values) {
        g_object_set(harness_->element, values..., nullptr);
    }
    void begin() {
        gst_element_set_bus(harness_->element, bus_);
        gst_harness_set_src_caps_str(
            harness_, "audio/x-raw, format=F32LE, layout=interleaved, rate=48000, channels=1");
    }
    // Pushes sound in buffers of any length. `start`: where it begins, in samples.
    GstFlowReturn push(Sound const& sound, std::size_t start, std::size_t longest = 3000) {
        test_support::Random random(longest);
        GstFlowReturn flow = GST_FLOW_OK;
        for (std::size_t at = 0, n = 0; at < sound.size() && flow == GST_FLOW_OK; at += n) {
            n = std::min(random.between(1, longest), sound.size() - at);
            auto* const buffer = gst_buffer_new_allocate(nullptr, n * sizeof(float), nullptr);
            gst_buffer_fill(buffer, 0, sound.data() + at, n * sizeof(float));
            GST_BUFFER_PTS(buffer) = timeOf(start + at);
            if (at == 0) GST_BUFFER_FLAG_SET(buffer, GST_BUFFER_FLAG_DISCONT);
            flow = gst_harness_push(harness_, buffer);
        }
        return flow;
    }
    void send(GstEvent* event) { EXPECT_TRUE(gst_harness_push_event(harness_, event)); }
    // What has come out, each sample where its time says that it lies; a million elsewhere.
    Sound take() {
        Sound all;
        while (auto* const buffer = gst_harness_try_pull(harness_)) {
            auto const at = (GST_BUFFER_PTS(buffer) * kRate + GST_SECOND / 2) / GST_SECOND;
            auto const n = gst_buffer_get_size(buffer) / sizeof(float);
            EXPECT_GE(at, all.size()) << "overlap";
            all.resize(at, 1e6F);
            all.resize(at + n);
            gst_buffer_extract(buffer, 0, all.data() + at, n * sizeof(float));
            gst_buffer_unref(buffer);
        }
        return all;
    }

    GstHarness* harness_ = gst_harness_new("morvadenoise");
    GstBus* bus_ = gst_bus_new();
    Sound noise_ = test_support::Random(1).normal(kRate, 0.1F);
};

// Bypassed sound says where everything lies, also around a gap.
TEST_F(Element, LabelsSoundWithItsOwnTimeAndKeepsItsLength) {
    set("bypass", TRUE);
    begin();
    gst_harness_set_upstream_latency(harness_, 5 * GST_MSECOND);
    EXPECT_EQ(gst_harness_query_latency(harness_), 5 * GST_MSECOND + timeOf(kLatency));
    push(noise_, 0);
    push(noise_, 2 * kRate);
    send(gst_event_new_eos());
    auto const out = take();
    ASSERT_EQ(out.size(), 3 * kRate);
    for (std::size_t i = 960; i < out.size(); ++i) {  // behind the cross-fade
        bool const gap = i / kRate == 1;
        ASSERT_NEAR(out[i], gap ? 1e6F : noise_[i % kRate], 1e-6F) << i;
    }
}

TEST_F(Element, ForgetsWhatWasThereBeforeAFlush) {
    set("bypass", TRUE);
    begin();
    push(noise_, 0);
    take();
    send(gst_event_new_flush_start());
    send(gst_event_new_flush_stop(TRUE));
    GstSegment segment;
    gst_segment_init(&segment, GST_FORMAT_TIME);
    send(gst_event_new_segment(&segment));
    push(Sound(5000), 0);
    send(gst_event_new_eos());
    EXPECT_EQ(take(), Sound(5000));
}

TEST_F(Element, FollowsTheLimitAndTellsVoiceAndLevel) {
    begin();
    push(noise_, 0);
    auto const cleaned = power(take());
    set("limit", 0.0F);
    push(noise_, kRate);
    auto out = take();
    EXPECT_GT(power({out.begin() + kRate, out.end()}), 100 * cleaned);

    std::vector<double> times;
    double level = -1.0;
    double loud = -1.0;
    while (auto* const message = gst_bus_pop_filtered(bus_, GST_MESSAGE_ELEMENT)) {
        double voice = -1.0;
        GstClockTime time = 0;
        gst_structure_get(gst_message_get_structure(message), "running-time", G_TYPE_UINT64, &time,
                          "voice", G_TYPE_DOUBLE, &voice, "level", G_TYPE_DOUBLE, &level, nullptr);
        EXPECT_TRUE(voice >= 0.0 && voice < 0.5) << voice;
        if (times.size() == 9) loud = level;
        times.push_back(static_cast<double>(time) / GST_MSECOND);
        gst_message_unref(message);
    }
    ASSERT_EQ(times.size(), 20U);
    EXPECT_NEAR(times[3], 390.0, 1e-3);  // of the newest frame, that of 10 ms
    EXPECT_NEAR(loud, 70.3, 1.0);        // an RMS of 0.1
    EXPECT_NEAR(level, loud, 1.0);       // of what is heard, not of what is removed
}

TEST_F(Element, TakesTheModelThatIsNamed) {
    set("model", "NC_small_16k.mvw", "interval", guint64{0});
    begin();
    EXPECT_NE(gst_harness_query_latency(harness_), timeOf(kLatency));
    EXPECT_EQ(push(noise_, 0), GST_FLOW_OK);
    EXPECT_EQ(gst_bus_pop_filtered(bus_, GST_MESSAGE_ELEMENT), nullptr);
}

TEST_F(Element, RefusesAModelThatIsMissing) {
    set("model", "/nowhere/no.mvw");
    begin();
    EXPECT_EQ(push(noise_, 0), GST_FLOW_NOT_NEGOTIATED);
    EXPECT_NE(gst_bus_pop_filtered(bus_, GST_MESSAGE_ERROR), nullptr);
}

}  // namespace

TEST(StreamAdapter, AllocatesNothingWhileItRuns) {
    using namespace morva::plugins;
    StreamAdapter adapter({2, kRate, true, {}});
    Sound sound(6000);
    std::vector<Lane> const lanes{{sound.data(), sound.data() + 1, 2},
                                  {sound.data() + 1, sound.data(), 2}};
    test_support::Random random(2);
    auto const run = [&] {
        for (int i = 0; i < 100; ++i) {
            adapter.run(lanes, random.between(0, 3000), {random.uniform(0, 120), i % 8 == 0});
        }
    };
    run();
    EXPECT_EQ(test_support::countAllocations(run), 0U);
}
