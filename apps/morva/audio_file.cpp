#include "audio_file.h"

#include <unistd.h>

#include <algorithm>
#include <array>
#include <cctype>
#include <cmath>
#include <initializer_list>
#include <string>
#include <system_error>
#include <vector>

#include "descriptor.h"
#include "error.h"

namespace morva::cli {
namespace fs = std::filesystem;
namespace {

std::string lowerEnding(fs::path const& path) {
    auto ending = path.extension().string();
    std::ranges::transform(ending, ending.begin(),
                           [](unsigned char c) { return static_cast<char>(std::tolower(c)); });
    return ending;
}

int container(fs::path const& path) {
    auto const ending = lowerEnding(path);
    if (ending == ".wav") return SF_FORMAT_WAV;
    if (ending == ".flac") return SF_FORMAT_FLAC;
    if (ending == ".ogg" || ending == ".oga") return SF_FORMAT_OGG;
    return 0;
}

// Sample types that lose nothing of `type`, the tightest first.
std::initializer_list<int> typesHolding(int type) {
    static constexpr std::initializer_list<int> eight{SF_FORMAT_PCM_U8, SF_FORMAT_PCM_S8,
                                                      SF_FORMAT_PCM_16};
    static constexpr std::initializer_list<int> wide{SF_FORMAT_FLOAT, SF_FORMAT_PCM_24};
    static constexpr std::initializer_list<int> usual{SF_FORMAT_PCM_16, SF_FORMAT_VORBIS};
    switch (type) {
        case SF_FORMAT_PCM_U8:
        case SF_FORMAT_PCM_S8:
            return eight;
        case SF_FORMAT_PCM_32:
        case SF_FORMAT_FLOAT:
        case SF_FORMAT_DOUBLE:
            return wide;
        default:
            return usual;
    }
}

// WAV cannot hold more than 4 GiB; its 64-bit sister can.
int wavFor(std::int64_t frames, int channels) {
    constexpr std::int64_t limit = (std::int64_t{1} << 32) - (std::int64_t{1} << 20);
    return frames > limit / 8 / std::max(channels, 1) ? SF_FORMAT_RF64 : SF_FORMAT_WAV;
}

// Bits of an integer sample type; 0 for every other.
int integerBits(int format) {
    switch (format & SF_FORMAT_SUBMASK) {
        case SF_FORMAT_PCM_U8:
        case SF_FORMAT_PCM_S8:
            return 8;
        case SF_FORMAT_PCM_16:
            return 16;
        case SF_FORMAT_PCM_24:
            return 24;
        case SF_FORMAT_PCM_32:
            return 32;
        default:
            return 0;
    }
}

// The sample, rounded to `bits`, in the top bits of an integer. The library would cut the rest off.
int toInteger(float sample, int bits) {
    double const scale = std::ldexp(1.0, bits - 1);
    double const value = std::isnan(sample) ? 0.0 : std::rint(static_cast<double>(sample) * scale);
    auto const whole = static_cast<std::int64_t>(std::clamp(value, -scale, scale - 1.0));
    return static_cast<int>(whole * (std::int64_t{1} << (32 - bits)));
}

// False when not all were taken.
bool writeSamples(SNDFILE* file, int format, std::span<float const> samples) {
    auto const count = static_cast<sf_count_t>(samples.size());
    int const bits = integerBits(format);
    if (bits == 0) return sf_write_float(file, samples.data(), count) == count;
    std::vector<int> integers(samples.size());
    std::ranges::transform(samples, integers.begin(),
                           [bits](float sample) { return toInteger(sample, bits); });
    return sf_write_int(file, integers.data(), count) == count;
}

void copyTags(SNDFILE* from, SNDFILE* to) {
    for (int const tag :
         {SF_STR_TITLE, SF_STR_COPYRIGHT, SF_STR_ARTIST, SF_STR_COMMENT, SF_STR_DATE, SF_STR_ALBUM,
          SF_STR_LICENSE, SF_STR_TRACKNUMBER, SF_STR_GENRE}) {
        if (char const* text = sf_get_string(from, tag)) sf_set_string(to, tag, text);
    }
}

}  // namespace

SoundReader::SoundReader(fs::path const& path) : path_(path), file_(nullptr, &sf_close) {
    std::error_code error;
    auto const status = fs::status(path, error);
    if (!fs::exists(status)) throw Error(path.string() + ": no such file");
    if (fs::is_directory(status)) throw Error(path.string() + ": is a folder");
    file_.reset(sf_open(path.c_str(), SFM_READ, &info_));
    if (!file_) throw Error(path.string() + ": cannot be read: " + sf_strerror(nullptr));
}

std::size_t SoundReader::read(std::span<float> interleaved) {
    auto const wanted = static_cast<sf_count_t>(interleaved.size()) / info_.channels;
    auto const got = sf_readf_float(file_.get(), interleaved.data(), wanted);
    framesRead_ += got;
    bool const damaged = sf_error(file_.get()) != SF_ERR_NO_ERROR;
    bool const cut = got < wanted && info_.frames != SF_COUNT_MAX && framesRead_ < info_.frames;
    if (damaged || cut) {
        throw Error(path_.string() + ": damaged after " + std::to_string(framesRead_) + " samples" +
                    (damaged ? std::string(": ") + sf_strerror(file_.get()) : std::string()));
    }
    return static_cast<std::size_t>(got);
}

bool isWritableEnding(fs::path const& path) {
    return container(path) != 0;
}

int outputFormat(fs::path const& path, int sourceFormat, int channels, int rateHz) {
    int const major = container(path);
    if (major == 0) throw Error(path.string() + ": the output ends in .wav, .flac or .ogg");
    SF_INFO info{};
    info.channels = channels;
    info.samplerate = rateHz;
    auto const fits = [&](int type) {
        info.format = major | type;
        return sf_format_check(&info) != 0;
    };
    int const type = sourceFormat & SF_FORMAT_SUBMASK;
    bool const lossy = type == SF_FORMAT_VORBIS || type == SF_FORMAT_OPUS;
    bool const plain = type <= SF_FORMAT_ALAW;
    if ((plain || (lossy && major == SF_FORMAT_OGG)) && fits(type)) return info.format;
    for (int const candidate : typesHolding(type)) {
        if (fits(candidate)) return info.format;
    }
    if (fits(SF_FORMAT_VORBIS)) return info.format;
    throw Error(path.string() + ": this format cannot hold " + std::to_string(channels) +
                " channels of " + std::to_string(rateHz) + " Hz");
}

SoundWriter::SoundWriter(fs::path const& path, SoundReader const& source, int format)
    : path_(path),
      part_(path.string() + ".part-" + std::to_string(::getpid())),
      file_(nullptr, &sf_close) {
    std::error_code error;
    auto const status = fs::status(path, error);
    if (fs::is_directory(status)) throw Error(path.string() + ": is a folder");
    if (fs::exists(status) && !fs::is_regular_file(status)) {
        throw Error(path.string() + ": cannot be written: not a regular file");
    }
    info_.channels = source.channels();
    info_.samplerate = source.rateHz();
    info_.format = format;
    if ((format & SF_FORMAT_TYPEMASK) == SF_FORMAT_WAV) {
        info_.format = (format & ~SF_FORMAT_TYPEMASK) | wavFor(source.frames(), info_.channels);
    }
    file_.reset(sf_open(part_.path().c_str(), SFM_WRITE, &info_));
    if (!file_) throw Error(path.string() + ": cannot be written: " + sf_strerror(nullptr));
    sf_command(file_.get(), SFC_SET_CLIPPING, nullptr, SF_TRUE);
    double quality = 0.7;
    sf_command(file_.get(), SFC_SET_VBR_ENCODING_QUALITY, &quality, sizeof quality);
    copyTags(source.file_.get(), file_.get());
}

void SoundWriter::write(std::span<float const> interleaved) {
    if (!writeSamples(file_.get(), info_.format, interleaved)) {
        throw Error(path_.string() + ": cannot be written: " + sf_strerror(file_.get()));
    }
}

void SoundWriter::finish() {
    if (sf_close(file_.release()) != 0) throw Error(path_.string() + ": cannot be written");
    try {
        part_.become(path_);
    } catch (fs::filesystem_error const& error) {
        throw Error(path_.string() + ": cannot be written: " + error.code().message());
    }
}

std::string wavFile(std::span<float const> samples, int rateHz) {
    SF_INFO info{};
    info.channels = 1;
    info.samplerate = rateHz;
    info.format = SF_FORMAT_WAV | SF_FORMAT_PCM_16;
    Descriptor const memory = memoryFile();
    SoundHandle file(sf_open_fd(memory.get(), SFM_WRITE, &info, SF_FALSE), &sf_close);
    if (!file || !writeSamples(file.get(), info.format, samples) || sf_close(file.release()) != 0) {
        throw Error(std::string("a sound cannot be held in memory: ") + sf_strerror(file.get()));
    }
    return contentFrom(memory, 0);
}

}  // namespace morva::cli
