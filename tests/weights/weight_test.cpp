// Reading well-formed weights, typed access, and the containers behind it.
#include "weights/weight.h"

#include <gtest/gtest.h>
#include <sys/stat.h>

#include <array>
#include <bit>
#include <random>
#include <thread>

#include "support/reference_reader.h"
#include "support/temp_dir.h"
#include "support/weight_writer.h"
#include "utils/exception.h"

namespace {

using namespace MORVA;
using namespace test_support;
using testing::internal::CaptureStdout;
using testing::internal::GetCapturedStdout;
using WEIGHTS::Weight;

Weight fromBlob(std::string const& bytes) {
    Weight weight;
    EXPECT_TRUE(weight.read(bytes.data(), bytes.size()));
    return weight;
}

// Records of every type in random order, sizes 0 and 1 included.
std::string randomRecords(unsigned seed) {
    std::mt19937 engine(seed);
    RandomValues random(seed);
    auto const upTo = [&engine](int limit) {
        return std::uniform_int_distribution(0, limit)(engine);
    };
    auto const floats = [&] { return random.vector(upTo(9), -1e6F, 1e6F); };
    auto const matrix = [&] {
        auto const rows = upTo(5);
        auto const cols = upTo(5);
        return CONTAINERS::Matrix{random.vector(rows * cols, -1, 1), static_cast<std::size_t>(rows),
                                  static_cast<std::size_t>(cols)};
    };
    auto const text = [&] {
        std::string bytes(static_cast<std::size_t>(upTo(12)), '\0');
        for (auto& byte : bytes) byte = static_cast<char>(upTo(255));
        return bytes;
    };
    auto const list = [&](auto const& make) {
        std::vector<decltype(make())> values(static_cast<std::size_t>(upTo(4)));
        for (auto& value : values) value = make();
        return values;
    };
    WeightWriter writer;
    for (int i = 0; i < 30; ++i) {
        auto const name = text();
        switch (upTo(6)) {
            case 0:
                writer.add(name, std::bit_cast<float>(static_cast<std::uint32_t>(engine())));
                break;
            case 1:
                writer.add(name, static_cast<int>(engine()));
                break;
            case 2:
                writer.add(name, text());
                break;
            case 3:
                writer.add(name, floats());
                break;
            case 4:
                writer.add(name, matrix());
                break;
            case 5:
                writer.add(name, list(floats));
                break;
            default:
                writer.add(name, list(matrix));
                break;
        }
    }
    return writer.bytes();
}

class RoundTrip : public testing::TestWithParam<unsigned> {};

TEST_P(RoundTrip, EveryTypeComesBackBitForBitFromBothSources) {
    auto const bytes = randomRecords(GetParam());
    auto const expected = ReferenceReader(bytes).read();
    ASSERT_GT(expected.size(), 10U);
    EXPECT_EQ(writeBack(fromBlob(bytes).values()), expected);

    TempDir const dir;
    Weight fromFile;
    EXPECT_TRUE(fromFile.read(UTILS::Path(dir.write("w.mvw", bytes).wstring().c_str())));
    EXPECT_EQ(writeBack(fromFile.values()), expected);
    EXPECT_EQ(fromFile.message(), "");
}

INSTANTIATE_TEST_SUITE_P(Seeds, RoundTrip, testing::Range(1U, 21U));

TEST(Weight, FirstOfTwoEqualNamesWinsWhateverTheTypes) {
    auto const bytes =
        WeightWriter().add("a", 1).add("a", 2).add("a", 3.0F).add("b", "x").add("b", "y").bytes();
    auto const weight = fromBlob(bytes);
    EXPECT_EQ(weight.values().size(), 2U);
    EXPECT_EQ(weight.getReference<int>("a"), 1);
    EXPECT_EQ(weight.getReference<std::string>("b"), "x");
}

TEST(Weight, SourcesWithoutARecord) {
    TempDir const dir;
    auto const empty = dir.write("empty.mvw", "").wstring();
    for (auto const& [path, readable] : {std::pair{empty, true},
                                         {L"/dev/null", true},
                                         {dir.path().wstring() + L"/missing.mvw", false},
                                         {dir.path().wstring(), false}}) {
        Weight weight;
        CaptureStdout();
        EXPECT_EQ(weight.read(UTILS::Path(path.c_str())), readable);
        EXPECT_EQ(GetCapturedStdout(), readable ? "Warning Nothing added from weight\n" : "");
        EXPECT_TRUE(weight.values().empty());
        EXPECT_EQ(weight.message(), readable ? "" : "Corrupted weight file!");
    }
}

TEST(Weight, APipeReadsLikeAFile) {
    TempDir const dir;
    auto const path = dir.path() / "pipe.mvw";
    ASSERT_EQ(mkfifo(path.c_str(), 0600), 0);
    auto const bytes = randomNcWeight({});
    std::thread writer([&] { writeFile(path, bytes); });
    Weight weight;
    bool const result = weight.read(UTILS::Path(path.wstring().c_str()));
    writer.join();
    EXPECT_TRUE(result);
    EXPECT_EQ(writeBack(weight.values()), ReferenceReader(bytes).read());
}

TEST(Weight, AnEmptyMatrixKeepsItsCounts) {
    WeightWriter writer;
    writer.header("rows", 4).number(3'000'000'000U).number(0);
    writer.header("cols", 4).number(0).number(2'000'000'000);
    auto const weight = fromBlob(writer.bytes());
    auto const& rows = weight.getReference<CONTAINERS::Matrix>("rows");
    auto const& cols = weight.getReference<CONTAINERS::Matrix>("cols");
    EXPECT_EQ(rows.rows, 3'000'000'000U);
    EXPECT_EQ(rows.cols, 0U);
    EXPECT_TRUE(rows.data.empty());
    EXPECT_EQ(cols.rows, 0U);
    EXPECT_EQ(cols.cols, 2'000'000'000U);
}

TEST(Weight, AccessorsHandOutOneObjectAndNamesEndInTheirException) {
    auto const weight = fromBlob(WeightWriter().add("gain", 1.5F).add("Version", 6).bytes());
    EXPECT_EQ(&weight.getReference<float>("gain"), &weight.getReference<float>("gain"));
    auto const refusal = [](auto call) -> std::string {
        try {
            call();
        } catch (UTILS::MORVA_Exception const& error) {
            return error.what();
        }
        return "nothing was thrown";
    };
    for (std::string const name : {"gain", "Gain", ""}) {
        EXPECT_EQ(refusal([&] { weight.getReference<int>(name); }),
                  "MORVA_Exeption in file src/weights/weight Line 90 Function getReference\n "
                  "messege ERROR DATA With Key: " +
                      name + "doesn't exists");
    }
    EXPECT_EQ(refusal([&] { weight.getWeightVersion(); }),
              "MORVA_Exeption in file src/weights/weight Line 348 Function getWeightVersion\n "
              "messege there are no Weight version in Weight ");
    EXPECT_EQ(refusal([&] { weight.getWeightInfo(); }),
              "MORVA_Exeption in file src/weights/weight Line 339 Function getWeightInfo\n "
              "messege there are no needing Weight information in Weight ");
}

// Rate and length, and the duration that follows from them; 0: refused.
TEST(Weight, DurationFollowsFromLengthAndRate) {
    for (auto const& [rate, length, duration] : {std::array{16000, 160, 10},
                                                 {16000, 175, 10},
                                                 {16000, 176, 0},
                                                 {8000, 120, 15},
                                                 {8000, 240, 30},
                                                 {16000, 512, 32},
                                                 {32000, 640, 20},
                                                 {32000, 1280, 40},
                                                 {16000, 400, 0},
                                                 {44100, 441, 0},
                                                 {48000, 480, 0},
                                                 {0, 160, 0},
                                                 {-16000, -160, 0},
                                                 {8000, INT32_MIN, 0},
                                                 {8000, 0, 0},
                                                 {8000, INT32_MAX, 0},
                                                 {16000, 536871072, 0}}) {  // x 1000 wraps round
        auto const weight =
            fromBlob(WeightWriter().add("SampleRate", rate).add("FrameLength", length).bytes());
        if (duration == 0) {
            EXPECT_THROW(weight.getWeightInfo(), UTILS::MORVA_Exception) << rate << ' ' << length;
            continue;
        }
        auto const info = weight.getWeightInfo();
        EXPECT_EQ(static_cast<int>(info.first), rate);
        EXPECT_EQ(static_cast<int>(info.second), duration) << rate << ' ' << length;
    }
}

TEST(Weight, ReadValueReportsAndKeepsOnlyWholeValues) {
    Weight weight;
    UTILS::SerializerSstream source(WeightWriter().number(5).number(1.0F).raw("cut").bytes());
    EXPECT_FALSE(weight.read_value("unknown", 7, source));
    EXPECT_FALSE(weight.read_value("negative", -1, source));
    EXPECT_TRUE(weight.read_value("five", 1, source));
    EXPECT_TRUE(weight.read_value("five", 0, source)) << "read, though the first value stays";
    EXPECT_FALSE(weight.read_value("cut", 1, source));
    EXPECT_EQ(weight.values().size(), 1U);
    EXPECT_EQ(weight.getReference<int>("five"), 5);
}

TEST(Serializer, WriteModeWritesWhatReadModeReads) {
    TempDir const dir;
    UTILS::Path const path((dir.path() / "m.mvw").wstring().c_str());
    {
        UTILS::SerializerFstream writer(UTILS::SerializeMode::write, path);
        writer.output() << WeightWriter().number(1).number(2).number(3.0F).number(4.0F).bytes();
        CONTAINERS::Matrix untouched{{1.0F}, 1, 1};
        writer >> untouched;
        EXPECT_EQ(untouched.data.size(), 1U);
    }
    UTILS::SerializerFstream reader(UTILS::SerializeMode::read, path);
    CONTAINERS::Matrix first{{9.0F}, 1, 1};
    CONTAINERS::Matrix second{{9.0F}, 1, 1};
    reader >> first >> second;
    EXPECT_EQ(first.data, (std::vector{3.0F, 4.0F}));
    EXPECT_EQ(first.rows, 1U);
    EXPECT_EQ(first.cols, 2U);
    EXPECT_EQ(second.data, std::vector{9.0F}) << "a cut block leaves its target alone";
}

TEST(AnyMap, InsertModesAndSharing) {
    using CONTAINERS::InsertMode;
    CONTAINERS::AnyMap map;
    auto const first = map.insert<std::string>("k", "one", InsertMode::keep);
    ASSERT_NE(first, nullptr);
    EXPECT_EQ(first, map.find<std::string>("k"));
    EXPECT_EQ(map.insert<std::string>("k", "two", InsertMode::keep), nullptr);
    EXPECT_EQ(*map.find<std::string>("k"), "one");
    EXPECT_EQ(map.insert<int>("k", 3, InsertMode::replace), nullptr);
    EXPECT_EQ(map.find<std::string>("k"), nullptr);
    EXPECT_EQ(*map.find<int>("k"), 3);
    EXPECT_EQ(*first, "one") << "a holder keeps the replaced value";
    EXPECT_NE(map.insert<float>("new", 1.0F, InsertMode::replace), nullptr);
}

}  // namespace
