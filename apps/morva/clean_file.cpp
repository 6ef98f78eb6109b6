#include "clean_file.h"

#include <algorithm>
#include <vector>

#include "audio_file.h"
#include "channel_cleaner.h"

namespace morva::cli {
namespace {

constexpr std::size_t framesPerRead = 4096;

// The channels' cleaned samples, kept until all channels have them.
class Interleaver {
public:
    explicit Interleaver(std::size_t channels) : ready_(channels) {}

    std::vector<float>& channel(std::size_t index) { return ready_[index]; }

    void drainTo(SoundWriter& writer) {
        auto const shortest =
            std::ranges::min_element(ready_, {}, &std::vector<float>::size)->size();
        mixed_.resize(shortest * ready_.size());
        for (std::size_t c = 0; c < ready_.size(); ++c) {
            for (std::size_t i = 0; i < shortest; ++i) mixed_[i * ready_.size() + c] = ready_[c][i];
            ready_[c].erase(ready_[c].begin(),
                            ready_[c].begin() + static_cast<std::ptrdiff_t>(shortest));
        }
        writer.write(mixed_);
    }

private:
    std::vector<std::vector<float>> ready_;
    std::vector<float> mixed_;
};

std::vector<ChannelCleaner> openChannels(Engine& engine, SoundReader const& reader,
                                         SessionSetup const& setup) {
    std::vector<ChannelCleaner> channels;
    channels.reserve(static_cast<std::size_t>(reader.channels()));
    for (int c = 0; c < reader.channels(); ++c) {
        channels.emplace_back(engine, reader.rateHz(), setup);
    }
    return channels;
}

}  // namespace

CleanedFile cleanFile(Workbench& bench, Job const& job,
                      std::function<void(double)> const& advance) {
    SoundReader reader(job.input);
    auto const setup =
        bench.setup(ShippedKind::NC, bench.model, spokenInput(job.input), reader.rateHz());
    int const format =
        outputFormat(job.output, reader.format(), reader.channels(), reader.rateHz());
    CleanedFile result{0, reader.channels(), reader.rateHz(), setup.model, {}};
    auto channels = openChannels(bench.engine, reader, setup);
    SoundWriter writer(job.output, reader, format, bench.streams);

    Interleaver ready(channels.size());
    std::vector<float> block(framesPerRead * channels.size());
    std::vector<float> one;
    while (auto const frames = reader.read(block)) {
        for (std::size_t c = 0; c < channels.size(); ++c) {
            one.resize(frames);
            for (std::size_t i = 0; i < frames; ++i) one[i] = block[i * channels.size() + c];
            channels[c].push(one, ready.channel(c));
        }
        ready.drainTo(writer);
        result.frames += static_cast<std::int64_t>(frames);
        advance(static_cast<double>(frames) / reader.rateHz());
    }
    for (std::size_t c = 0; c < channels.size(); ++c) channels[c].finish(ready.channel(c));
    ready.drainTo(writer);
    writer.finish();
    result.damage = reader.damage();
    return result;
}

}  // namespace morva::cli
