// Writes small seed inputs for the fuzzers, one folder per fuzzer: make_seeds FOLDER
#include <cstdio>
#include <exception>
#include <filesystem>
#include <random>
#include <string>

#include "support/weight_writer.h"

namespace {

namespace fs = std::filesystem;
using namespace test_support;

class Corpus {
public:
    Corpus(fs::path const& root, char const* fuzzer) : folder_(root / fuzzer) {
        fs::create_directories(folder_);
    }
    void add(std::string const& bytes) {
        writeFile(folder_ / ("seed" + std::to_string(count_++)), bytes);
    }

private:
    fs::path folder_;
    int count_ = 0;
};

NcShape small(std::string version, int layers, int gates) {
    NcShape shape;
    shape.version = std::move(version);
    shape.sampleRate = 8000;
    shape.frameLength = 160;
    shape.filtrEnd = 32;
    shape.previewFrames = 1;
    shape.hidden = 3;
    shape.layers = layers;
    shape.gates = gates;
    return shape;
}

void weights(Corpus corpus) {
    for (auto const* version : {"0.0.1", "0.0.2", "0.0.3", "0.0.4", "0.0.5", "0.0.6"}) {
        corpus.add(randomNcWeight(small(version, 2, 3)));
        corpus.add(randomNcWeight(small(version, 3, 1)));
        corpus.add(randomNcWeight(small(version, 1, 3)));
    }
    for (int const layers : {1, 2, 3}) {
        VadShape shape;
        shape.hidden = 2;
        shape.gates = layers == 2 ? 1 : 2;
        shape.layers = layers;
        corpus.add(randomVadWeight(shape));
    }
}

void controlFiles(Corpus corpus) {
    corpus.add("# a comment\n\nMORVA_SMOOT_COEF_v0_0_6 0.3\r\nMORVA_VOLUME_UP_v0_0_6   TRUE  \n");
    corpus.add("MORVA_ENABLE_BACKGROUND_SPEAKER_FIX_v0_0_6 TRUE\nMORVA_SKIP_FRAME_v0_0_6 TRUE");
    corpus.add("MORVA_ENABLE_THRESH_CUT_v0_0_6 TRUE\nMORVA_THRESH_CUT_REF_EN_v0_0_6 10\n");
    corpus.add("MORVA_COMPRESS_RATE_v0_0_6 2\nWEIGHT weight.mvw\nCONTROLFILE x\nword\n");
}

void paths(Corpus corpus) {
    corpus.add("1/a/b/../c//./");
    corpus.add(std::string("0/\0\0\0a\0\0\0", 9));
}

void calls(Corpus corpus) {
    std::string bytes;
    for (int i = 0; i < 400; ++i) bytes.push_back(static_cast<char>(i * 37 % 251));
    corpus.add(bytes);
}

void samples(Corpus corpus) {
    corpus.add(WeightWriter().number(0x00020202).number(0x7fc00000).number(0x7f800000).bytes());
    corpus.add(WeightWriter().number(0x01000506).number(0xff800000U).number(1).bytes());
    corpus.add(WeightWriter().number(0x00030008).number(0x7f7fffff).number(0xff7fffffU).bytes());
    // Half a second of each kind of hostile sample, then of any bits at all.
    std::mt19937 engine(1);
    for (auto const bits : {0x7fc00000U, 0x7f800000U, 0xff7fffffU, 0x00000001U, 0x4f000000U}) {
        WeightWriter writer;
        writer.number(static_cast<std::uint32_t>(engine()));
        for (int i = 0; i < 4000; ++i) writer.number(bits);
        corpus.add(writer.bytes());
    }
    WeightWriter writer;
    for (int i = 0; i < 4000; ++i) writer.number(static_cast<std::uint32_t>(engine()));
    corpus.add(writer.bytes());
}

}  // namespace

int main(int count, char** arguments) try {
    if (count != 2) {
        std::fprintf(stderr, "usage: make_seeds FOLDER\n");
        return 2;
    }
    fs::path const root = arguments[1];
    weights({root, "weight"});
    controlFiles({root, "control_file"});
    paths({root, "path"});
    calls({root, "api"});
    samples({root, "sample"});
    return 0;
} catch (std::exception const& error) {
    std::fprintf(stderr, "make_seeds: %s\n", error.what());
    return 1;
}
