#include "wav_header.h"

#include <limits>

namespace morva::cli {
namespace {

std::string number(std::uint64_t value, int bytes) {
    std::string text;
    for (int i = 0; i < bytes; ++i) text += static_cast<char>(value >> (8 * i) & 0xFFU);
    return text;
}

unsigned int tagOf(int format) {
    switch (format & SF_FORMAT_SUBMASK) {
        case SF_FORMAT_FLOAT:
        case SF_FORMAT_DOUBLE:
            return 3;
        case SF_FORMAT_ALAW:
            return 6;
        case SF_FORMAT_ULAW:
            return 7;
        default:
            return 1;
    }
}

}  // namespace

int sampleBytes(int format) {
    switch (format & SF_FORMAT_SUBMASK) {
        case SF_FORMAT_PCM_S8:
        case SF_FORMAT_PCM_U8:
        case SF_FORMAT_ALAW:
        case SF_FORMAT_ULAW:
            return 1;
        case SF_FORMAT_PCM_16:
            return 2;
        case SF_FORMAT_PCM_24:
            return 3;
        case SF_FORMAT_PCM_32:
        case SF_FORMAT_FLOAT:
            return 4;
        case SF_FORMAT_DOUBLE:
            return 8;
        default:
            return 0;
    }
}

std::string wavHeader(SF_INFO const& info, std::int64_t frames) {
    constexpr std::uint64_t unknown = std::numeric_limits<std::uint32_t>::max();
    constexpr std::uint64_t rest = 36;  // of the header, after the length of all
    auto const bytes = static_cast<std::uint64_t>(sampleBytes(info.format));
    auto const frameBytes = bytes * static_cast<std::uint64_t>(info.channels);
    auto const rate = static_cast<std::uint64_t>(info.samplerate);
    auto length = static_cast<std::uint64_t>(frames) * frameBytes;
    if (length == 0 || length + rest > unknown) length = unknown - rest;
    return "RIFF" + number(length + rest, 4) + "WAVEfmt " + number(16, 4) +
           number(tagOf(info.format), 2) + number(static_cast<std::uint64_t>(info.channels), 2) +
           number(rate, 4) + number(rate * frameBytes, 4) + number(frameBytes, 2) +
           number(8 * bytes, 2) + "data" + number(length, 4);
}

}  // namespace morva::cli
