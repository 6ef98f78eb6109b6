// Weights that lie: whatever the bytes, reading ends with what a plain reference reader finds, from
// a file as from memory, and allocates no more than the bytes justify.
#include <gtest/gtest.h>

#include <random>

#include "support/allocation_counter.h"
#include "support/reference_reader.h"
#include "support/temp_dir.h"
#include "weights/weight.h"

namespace {

using namespace MORVA;
using namespace test_support;
using WEIGHTS::Weight;

// A few small records of each type, the last one a list of matrices.
WeightWriter smallWeight() {
    CONTAINERS::Matrix const matrix{{1, 2, 3, 4, 5, 6}, 2, 3};
    WeightWriter writer;
    writer.add("Version", "0.0.6").add("rate", 8000).add("gain", 0.5F);
    writer.add("MU", std::vector{1.0F, 2.0F, 3.0F})
        .add("W", matrix)
        .add("none", WeightWriter::Vector{});
    writer.add("rows", WeightWriter::Vectors{{1.0F}, {}, {2.0F, 3.0F}});
    writer.add("layers", WeightWriter::Matrices{matrix, {{}, 0, 4}, {{7}, 1, 1}});
    return writer;
}

// Reads under the meter. Names, nodes and growth cost a constant factor; a count that is believed
// without its bytes would cost millions.
void expectModestAndEqualToReference(std::string const& bytes) {
    Weight weight;
    testing::internal::CaptureStdout();
    bool result = false;
    auto const sizes =
        measureAllocations([&] { result = weight.read(bytes.data(), bytes.size()); });
    EXPECT_TRUE(result);
    EXPECT_LE(sizes.largest, 10 * bytes.size() + 1024);
    EXPECT_LE(sizes.total, 100 * bytes.size() + 4096);
    auto const expected = ReferenceReader(bytes).read();
    EXPECT_EQ(testing::internal::GetCapturedStdout(),
              expected.empty() ? "Warning Nothing added from weight\n" : "");
    EXPECT_EQ(writeBack(weight.values()), expected);
    EXPECT_EQ(weight.message(), "");
}

TEST(HostileWeight, CutAtEveryByteKeepsTheWholeRecordsBeforeTheCut) {
    auto const writer = smallWeight();
    auto const& ends = writer.recordEnds();
    TempDir const dir;
    for (std::size_t size = 0; size <= writer.bytes().size(); ++size) {
        SCOPED_TRACE(size);
        auto const bytes = writer.bytes().substr(0, size);
        expectModestAndEqualToReference(bytes);

        testing::internal::CaptureStdout();
        Weight weight;
        EXPECT_TRUE(weight.read(UTILS::Path(dir.write("cut.mvw", bytes).wstring().c_str())));
        testing::internal::GetCapturedStdout();
        auto const whole =
            std::count_if(ends.begin(), ends.end(), [size](auto end) { return end <= size; });
        EXPECT_EQ(weight.values().size(), static_cast<std::size_t>(whole));
        if (HasFailure()) return;
    }
}

class BitFlips : public testing::TestWithParam<unsigned> {};

TEST_P(BitFlips, AgreeWithTheReference) {
    std::mt19937 engine(GetParam());
    auto const clean = smallWeight().bytes();
    for (int round = 0; round < 500; ++round) {
        auto bytes = clean;
        auto const flips = 1 + engine() % 8;
        for (unsigned i = 0; i < flips; ++i) {
            auto& byte = bytes[engine() % bytes.size()];
            byte = static_cast<char>(byte ^ (1 << engine() % 8));
        }
        expectModestAndEqualToReference(bytes);
        ASSERT_FALSE(HasFailure()) << "seed " << GetParam() << " round " << round;
    }
}
INSTANTIATE_TEST_SUITE_P(Seeds, BitFlips, testing::Range(1U, 5U));

// Bytes that are mostly small numbers and small type codes get deep into the format.
TEST(HostileWeight, RandomSmallNumbersAgreeWithTheReference) {
    for (unsigned seed = 1; seed <= 2000; ++seed) {
        std::mt19937 engine(seed);
        WeightWriter writer;
        auto const count = engine() % 64;
        for (unsigned i = 0; i < count; ++i) {
            auto const limit = i % 8 == 7 ? 1000U : 8U;
            writer.number(static_cast<std::uint32_t>(engine() % limit));
        };
        expectModestAndEqualToReference(writer.bytes());
        ASSERT_FALSE(HasFailure()) << "seed " << seed;
    }
}

// The values of type code 2..6 begin with one or two counts.
TEST(HostileWeight, HugeAndNegativeCountsAreCutRecords) {
    std::uint32_t const counts[] = {0,           1,           2,           5,           6,
                                    7,           0x3fffffffU, 0x40000000U, 0x7fffffffU, 0x80000000U,
                                    0x80000001U, 0xc0000000U, 0xfffffffeU, 0xffffffffU};
    for (int code = 2; code <= 6; ++code) {
        for (auto const first : counts) {
            for (auto const second : counts) {
                for (auto const third : counts) {
                    WeightWriter writer;
                    writer.add("before", 1).header("hostile", code);
                    writer.number(first).number(second).number(third).raw("some bytes after it");
                    expectModestAndEqualToReference(writer.bytes());
                    ASSERT_FALSE(HasFailure())
                        << "code " << code << ": " << first << ' ' << second << ' ' << third;
                }
            }
        }
    }
}

TEST(HostileWeight, ANameLengthBeyondTheDataEndsIt) {
    for (auto const length : {8U, 0x7fffffffU, 0x80000000U, 0xffffffffU}) {
        expectModestAndEqualToReference(
            WeightWriter().add("a", 1).number(length).raw("7 bytes").bytes());
    }
}

// After an unknown code the following bytes are taken as the next record, on purpose.
TEST(HostileWeight, AnUnknownTypeCodeMakesItsValueTheNextRecord) {
    for (auto const code : {7, 100, -1, INT32_MIN, INT32_MAX}) {
        WeightWriter writer;
        writer.add("a", 1).header("unknown", code).add("inside", 2).add("b", 3);
        Weight weight;
        EXPECT_TRUE(weight.read(writer.bytes().data(), writer.bytes().size()));
        EXPECT_EQ(weight.values().size(), 3U) << code;
        EXPECT_EQ(weight.getReference<int>("inside"), 2);
    }
}

// What was read already does not count as left.
TEST(HostileWeight, ACutRecordBehindABigOneAllocatesNothing) {
    auto const read = [](std::string const& bytes) {
        return measureAllocations([&] { Weight().read(bytes.data(), bytes.size()); }).total;
    };
    WeightWriter writer;
    writer.add("big", WeightWriter::Vector(10'000));
    auto const before = read(writer.bytes());
    for (auto const code : {3, 5, 6}) {
        auto cut = writer;
        auto const tail = code == 3 ? std::string() : std::string(4'000, '\0');
        cut.header("cut", code).number(9'000U).raw(tail);
        EXPECT_LE(read(cut.bytes()), before + 2 * tail.size() + 1'000) << code;
    }
}

TEST(HostileWeight, ManyEmptyElementsAreKept) {
    WeightWriter writer;
    writer.add("rows", WeightWriter::Vectors(10'000)).add("end", 1);
    expectModestAndEqualToReference(writer.bytes());
}

}  // namespace
