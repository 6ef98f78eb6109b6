// Any bytes as a control file: parsed with its promises checked, registered beside a valid weight
// as the model's parameters and run, and registered without one, so that they name weights, too.
#include "harness.h"
#include "support/temp_dir.h"
#include "weights/control_file.h"

namespace {

constexpr auto whitespace = " \t\n\v\f\r";

// Holds the weight that every control file names.
test_support::TempDir const& folder() {
    static test_support::TempDir const dir;
    static auto const weight =
        dir.write("weight.mvw", test_support::randomNcWeight(fuzz::smallShape()));
    return dir;
}

void checkEntries(std::filesystem::path const& file) {
    std::vector<std::pair<std::string, std::string>> entries;
    MORVA::UTILS::readControlFile(entries, MORVA::UTILS::Path(file.wstring().c_str()));
    for (auto const& [key, value] : entries) {
        fuzz::require(!key.empty() && !value.empty(), "entries have a key and a value");
        fuzz::require(key.find_first_of(whitespace) == std::string::npos,
                      "keys hold no whitespace");
        fuzz::require(value.find_first_not_of(whitespace) == 0 &&
                          value.find_last_not_of(whitespace) + 1 == value.size(),
                      "values are trimmed");
    }
}

}  // namespace

extern "C" int LLVMFuzzerTestOneInput(std::uint8_t const* data, std::size_t size) {
    std::string const text(reinterpret_cast<char const*>(data), size);
    checkEntries(folder().write("model.cfg", "WEIGHT weight.mvw\n" + text));
    folder().write("other.cfg", text);
    fuzz::Engine const engine(folder().path().wstring().c_str());
    if (Morva_SDK_SetModel(L"model.cfg", "model") == 0) fuzz::run(8000, 8000, 10, "model");
    Morva_SDK_SetModel(L"other.cfg", "other");
    return 0;
}
