// Any bytes as a control file: parsed with its promises checked, then registered beside a valid
// weight as the model's parameters, and run.
#include <cstddef>
#include <cstdint>

#include "harness.h"
#include "support/temp_dir.h"
#include "support/weight_writer.h"
#include "weights/control_file.h"

namespace {

constexpr auto whitespace = " \t\n\v\f\r";

test_support::NcShape smallShape() {
    test_support::NcShape shape;
    shape.sampleRate = 8000;
    shape.frameLength = 160;
    shape.filtrEnd = 64;
    shape.previewFrames = 1;
    shape.hidden = 4;
    shape.gates = 4;
    shape.layers = 2;
    return shape;
}

// Holds the weight that every control file names.
test_support::TempDir const& folder() {
    static test_support::TempDir const dir;
    static auto const weight = dir.write("weight.mvw", test_support::randomNcWeight(smallShape()));
    return dir;
}

void checkEntries(std::filesystem::path const& file) {
    std::vector<std::pair<std::string, std::string>> entries;
    MORVA::UTILS::readControlFile(entries, MORVA::UTILS::Path(file.wstring().c_str()));
    for (auto const& [key, value] : entries) {
        fuzz::require(!key.empty() && !value.empty(), "entries have a key and a value");
        fuzz::require(key.find_first_of(whitespace) == std::string::npos,
                      "keys hold no whitespace");
        fuzz::require(value.find('\n') == std::string::npos, "values hold no line end");
        fuzz::require(value.find_first_not_of(whitespace) == 0 &&
                          value.find_last_not_of(whitespace) + 1 == value.size(),
                      "values are trimmed");
    }
}

}  // namespace

extern "C" int LLVMFuzzerTestOneInput(std::uint8_t const* data, std::size_t size) {
    std::string const text(reinterpret_cast<char const*>(data), size);
    checkEntries(folder().write("model.cfg", "WEIGHT weight.mvw\n" + text));

    auto const workingPath = folder().path().wstring();
    fuzz::Engine const engine(workingPath.c_str());
    if (Morva_SDK_SetModel(L"model.cfg", "model") != 0) return 0;
    fuzz::NcSession session(8000, 8000, 10, "model");
    fuzz::TestSignal signal;
    for (int i = 0; session && i < 10; ++i) session.clean(signal.frame(session.inputSize()));
    return 0;
}
