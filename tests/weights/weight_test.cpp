// Weights, well-formed and hostile: whatever the bytes, reading ends with what a plain reference
// reader finds, from memory as from a file, and allocates no more than the bytes justify. (Changed
// and random bytes: see the weight fuzzer. What
// registration says and does, control files included: see the tests of the C interface.)
#include "weights/weight.h"

#include <gtest/gtest.h>

#include <cmath>
#include <sstream>

#include "support/allocation_counter.h"
#include "support/captured_output.h"
#include "support/reference_reader.h"
#include "support/temp_dir.h"
#include "support/weight_writer.h"
#include "utils/exception.h"
#include "weights/model_registry.h"

namespace {

using namespace MORVA;
using namespace test_support;
using WEIGHTS::Weight;

std::shared_ptr<Weight> fromBlob(std::string const& bytes) {
    auto weight = std::make_shared<Weight>();
    EXPECT_TRUE(weight->read(bytes.data(), bytes.size()));
    return weight;
}

// Names, nodes and growth cost a constant factor; a count that is believed without its bytes would
// cost millions.
void expectModestAndEqualToReference(std::string const& bytes) {
    Weight weight;
    CapturedOutput said(1);
    bool result = false;
    auto const sizes =
        measureAllocations([&] { result = weight.read(bytes.data(), bytes.size()); });
    auto const expected = ReferenceReader(bytes).read();
    EXPECT_EQ(said.text(), expected.empty() ? "Warning Nothing added from weight\n" : "");
    EXPECT_TRUE(result);
    EXPECT_LE(sizes.largest, 10 * bytes.size() + 1024);
    EXPECT_LE(sizes.total, 100 * bytes.size() + 4096);
    EXPECT_EQ(writeBack(weight.values()), expected);
    EXPECT_EQ(weight.message(), "");
}

// Records of every type, empty and equal ones included. After an unknown code the following bytes
// are taken as the next record, on purpose.
std::string everyType() {
    CONTAINERS::Matrix const matrix{{1, 2, 3, 4, 5, 6}, 2, 3};
    WeightWriter writer;
    writer.add("Version", "0.0.6").add("", "a\xff").add("rate", INT32_MIN).add("gain", NAN);
    for (auto const code : {7, 100, -1, INT32_MIN, INT32_MAX}) writer.header("unknown", code);
    writer.add("MU", std::vector{1.0F, 1e-40F}).add("none", WeightWriter::Vector{});
    writer.add("W", matrix)
        .add("W", 3)
        .add("rows", WeightWriter::Vectors{{1.0F}, {}, {2.0F, 3.0F}});
    writer.add("layers", WeightWriter::Matrices{matrix, {{}, 0, 4}, {{7}, 1, 1}});
    writer.header("wide", 4).number(3'000'000'000U).number(0);
    return writer.bytes();
}

TEST(Weight, CutAtEveryByteKeepsTheWholeRecordsBeforeTheCut) {
    TempDir const dir;
    auto const bytes = everyType();
    EXPECT_EQ(ReferenceReader(bytes).read().size(), 10U);
    for (std::size_t size = 0; size <= bytes.size(); ++size) {
        SCOPED_TRACE(size);
        auto const cut = bytes.substr(0, size);
        expectModestAndEqualToReference(cut);
        Weight weight;
        CapturedOutput said(1);
        EXPECT_TRUE(weight.read(UTILS::Path(dir.write("cut.mvw", cut).wstring().c_str())));
        said.text();
        EXPECT_EQ(writeBack(weight.values()), ReferenceReader(cut).read());
        if (testing::Test::HasFailure()) return;
    }
}

// The values of type code 2..6 begin with one or two counts.
TEST(Weight, HugeAndNegativeCountsAreCutRecords) {
    std::uint32_t const counts[] = {
        0, 1, 2, 5, 7, 0x3fffffffU, 0x40000000U, 0x7fffffffU, 0x80000000U, 0xffffffffU};
    for (unsigned i = 0; i < 5000; ++i) {
        WeightWriter writer;
        writer.add("before", 1).header("hostile", static_cast<int>(2 + i / 1000));
        for (unsigned const digit : {i / 100, i / 10, i}) writer.number(counts[digit % 10]);
        expectModestAndEqualToReference(writer.raw("some bytes after it").bytes());
        ASSERT_FALSE(testing::Test::HasFailure()) << i;
    }
}

// 1, -2, the smallest and the largest half; every cut inside the string drops that value alone.
TEST(Weight, HalvesAreTheSameValuesInHalfTheRoom) {
    std::vector const floats{1.0F, -2.0F, 0x1p-24F, -0x1p-24F, 65504.0F, 0.0F};
    std::string const halves("\x00\x3c\x00\xc0\x01\x00\x01\x80\xff\x7b\x00\x00", 12);
    auto const whole = WeightWriter().number(6).number(1).number(2).number(3).raw(halves).bytes();
    auto const holding = [](std::string const& inside) {
        WeightWriter writer;
        return fromBlob(writer.add("half:W", inside).add("after", 1).bytes());
    };
    WeightWriter plain;
    plain.add("W", WeightWriter::Matrices{{floats, 2, 3}}).add("after", 1);
    EXPECT_EQ(writeBack(holding(whole)->values()), ReferenceReader(plain.bytes()).read());
    auto const nested = WeightWriter().number(2).number(3).raw("abc").bytes();
    auto damaged = std::vector{nested};
    for (std::size_t size = 0; size < whole.size(); ++size)
        damaged.push_back(whole.substr(0, size));
    for (auto const& inside : damaged) {
        EXPECT_EQ(writeBack(holding(inside)->values()).size(), 1U) << inside.size();
    }
}

TEST(Weight, SourcesWithoutARecord) {
    TempDir const dir;
    auto const empty = dir.write("empty.mvw", "").wstring();
    for (auto const& [path, readable] : {std::pair{empty, true},
                                         {L"/dev/null", true},
                                         {dir.path().wstring() + L"/missing.mvw", false},
                                         {dir.path().wstring(), false}}) {
        Weight weight;
        CapturedOutput said(1);
        EXPECT_EQ(weight.read(UTILS::Path(path.c_str())), readable);
        EXPECT_EQ(said.text(), readable ? "Warning Nothing added from weight\n" : "");
        EXPECT_TRUE(weight.values().empty());
        EXPECT_EQ(weight.message(), readable ? "" : "Corrupted weight file!");
    }
}

// "none" for a refusal.
std::string identify(WeightWriter const& writer) {
    CapturedOutput said(1);
    auto const identifier = WEIGHTS::ModelRegistry::mvwUniqueIdGenerator(fromBlob(writer.bytes()));
    auto const printed = said.text();
    return printed == "ERROR INVALID WEIGHT\n" && identifier.empty() ? "none"
                                                                     : printed + identifier;
}

// Rate, length, the duration that follows from them (0: refused) and the identifier.
TEST(Weight, RateAndLengthGiveTheDurationAndTheIdentifier) {
    std::istringstream rows(
        "16000 160 10 v1016ms  16000 175 10 v1016ms  16000 176 0 v1116ms  8000 120 15 v158ms "
        "16000 512 32 v3216ms  32000 1280 40 v4032ms  16000 400 0 v2516ms  44100 441 0 v1044ms "
        "0 160 0 none  -16000 -160 0 none  8000 -2147483648 0 v-2684354568ms  999 160 0 none "
        "1000 -5 0 v-51ms "
        "2147483647 2147483647 0 v10002147483ms  -2147483648 -2147483648 0 none "
        "16000 536871072 0 v3355444216ms");  // this one wraps round x 1000
    int rate = 0;
    int length = 0;
    int duration = 0;
    for (std::string identifier; rows >> rate >> length >> duration >> identifier;) {
        SCOPED_TRACE(::testing::Message() << rate << " " << length);
        WeightWriter writer;
        writer.add("Version", "v").add("SampleRate", rate).add("FrameLength", length);
        writer.add("ModelName", "m").add("TimeStamp", "s");
        EXPECT_EQ(identify(writer), identifier);
        auto const weight = fromBlob(writer.bytes());
        if (duration == 0) {
            EXPECT_THROW(weight->getWeightInfo(), UTILS::MORVA_Exception);
        } else {
            EXPECT_EQ(weight->getWeightInfo(),
                      std::pair(static_cast<MorvaSamplingRate>(rate),
                                static_cast<MorvaFrameDuration>(duration)));
        }
    }
}

}  // namespace
