// The header of a WAV file that goes to a stream: the sound-file library wants to come back to it.
#pragma once

#include <sndfile.h>

#include <cstdint>
#include <string>

namespace morva::cli {

// Bytes of one sample of an uncompressed or companded type; 0 for every other.
int sampleBytes(int format);

// For `info`'s rate, channels and sample type. Of `frames` samples per channel; 0: not known.
std::string wavHeader(SF_INFO const& info, std::int64_t frames);

}  // namespace morva::cli
