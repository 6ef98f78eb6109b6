#include "utils/path.h"

#include <gtest/gtest.h>

#include <filesystem>
#include <sstream>
#include <stdexcept>

#include "support/random.h"

using MORVA::UTILS::Path;

namespace {

struct Case {
    wchar_t const* path;
    wchar_t const* wanted;
};

std::wstring normalized(wchar_t const* text) {
    Path path(text);
    EXPECT_TRUE(path.normalize());
    return path.str();
}

}  // namespace

TEST(Path, NormalizesAbsolutePaths) {
    for (auto const& [path, wanted] : std::initializer_list<Case>{
             {L"/", L"/"},
             {L"/a", L"/a"},
             {L"/a/", L"/a/"},
             {L"/a/b/../c", L"/a/c"},
             {L"//a/./b//", L"/a/b/"},
             {L"///", L"/"},
             {L"/..", L"/"},
             {L"/../..", L"/"},
             {L"/../a", L"/a"},
             {L"/.", L"/"},
             {L"/a/.", L"/a/"},
             {L"/a/b/..", L"/a/"},
             {L"/a/../../b", L"/b"},
             {L"/a/b/../../..", L"/"},
             {L"/a/x.y/..z/.w", L"/a/x.y/..z/.w"},
             {L"/...", L"/..."},
             {L"/a/...", L"/a/..."},
             {L"/a\\..\\b", L"/a\\..\\b"},
             {L"/a/\x4f60\x597d/../\x1f600", L"/a/\x1f600"},
         }) {
        EXPECT_EQ(normalized(path), wanted) << Path(path).convertWString2MBString(path);
    }
}

TEST(Path, LeavesRelativePathsAlone) {
    for (wchar_t const* const text : {L"", L"x/../y", L"./a", L"..", L"a//b"}) {
        Path path(text);
        EXPECT_FALSE(path.isAbsolute());
        EXPECT_FALSE(path.normalize());
        EXPECT_EQ(path.str(), text);
    }
}

// Whatever the components, the result has none to remove and names the same place as the standard
// library's lexical form.
TEST(Path, AgreesWithTheStandardLibrary) {
    test_support::Random random(17);
    TRACE_SEED(random);
    wchar_t const* const parts[] = {L"a", L"bc", L".", L"..", L"", L".d", L"e..", L"..."};
    for (int i = 0; i < 2000; ++i) {
        std::wstring text;
        for (std::size_t n = random.between(0, 6); n > 0; --n) {
            text += L"/";
            text += parts[random.between(0, std::size(parts) - 1)];
        }
        text += random.chance(0.5) ? L"/f" : L"/..";
        Path path(text.c_str());
        ASSERT_TRUE(path.normalize());
        text.erase(0, text.find_first_not_of(L'/') - 1);  // a doubled root means something there
        std::wstring const once = path.str();
        ASSERT_EQ(once, std::filesystem::path(text).lexically_normal().wstring())
            << path.convertWString2MBString(text);
        path.normalize();
        ASSERT_EQ(path.str(), once);
    }
}

TEST(Path, PutsAFrontBeforeRelativePaths) {
    struct {
        wchar_t const* path;
        wchar_t const* front;
        wchar_t const* wanted;
    } const cases[] = {
        {L"/abs/file", L"/base", L"/abs/file"},
        {L"file", L"/base", L"/base/file"},
        {L"file", L"/base/", L"/base/file"},
        {L"file", L"", L"file"},
        {L"", L"/base", L"/base/"},
    };
    for (auto const& [text, front, wanted] : cases) {
        Path path(text);
        EXPECT_TRUE(path.pushFront(front));
        EXPECT_EQ(path.str(), wanted);
    }
}

TEST(Path, FindsTheExtensionOfTheLastComponent) {
    for (auto const& [path, wanted] : std::initializer_list<Case>{
             {L"model.mvw", L"mvw"},
             {L"/a/model.MVW", L"MVW"},
             {L"/a/model.v2.mvw", L"mvw"},
             {L"/dir.d/file", L""},
             {L"name.", L""},
             {L"/a/.mvw", L"mvw"},
             {L"", L""},
             {L"/a.b/", L""},
             {L"m.\x00e4", L"\x00e4"},
         }) {
        EXPECT_EQ(Path(path).getFileExtension(), wanted);
    }
}

TEST(Path, ConvertsUtf8BothWays) {
    Path const path(L"");
    for (auto const& [wide, bytes] : {std::pair<std::wstring, std::string>{L"", ""},
                                      {L"plain", "plain"},
                                      {L"\x00e4\x20ac", "\xc3\xa4\xe2\x82\xac"},
                                      {L"\x1f600", "\xf0\x9f\x98\x80"},
                                      {L"\x10ffff", "\xf4\x8f\xbf\xbf"}}) {
        EXPECT_EQ(path.convertWString2MBString(wide), bytes);
        EXPECT_EQ(path.convertMBString2WString(bytes), wide);
    }
    EXPECT_THROW(path.convertWString2MBString(L"\x110000"), std::range_error);
    EXPECT_THROW(path.convertMBString2WString("\xff"), std::range_error);
    EXPECT_THROW(path.convertMBString2WString("\xc3("), std::range_error);
}

TEST(Path, OpensFilesUnderTheirUtf8Name) {
    std::filesystem::path const folder =
        std::filesystem::path(testing::TempDir()) / "path_test_\xc3\xa4\xe4\xbd\xa0";
    std::filesystem::create_directories(folder);
    std::wstring const name =
        Path(L"").convertMBString2WString((folder / "\xf0\x9f\x98\x80.bin").string());
    Path const path(name.c_str());

    std::ofstream out;
    ASSERT_TRUE(path.openOfstream(out, std::ios_base::binary));
    out << "content";
    out.close();
    std::ifstream in;
    in.setstate(std::ios_base::failbit);  // an earlier failure is forgotten
    ASSERT_TRUE(path.openIfstream(in, std::ios_base::binary));
    EXPECT_TRUE(in.good());
    std::ostringstream content;
    content << in.rdbuf();
    EXPECT_EQ(content.str(), "content");

    std::ifstream missing;
    EXPECT_FALSE(Path((name + L".no").c_str()).openIfstream(missing, {}));
    EXPECT_TRUE(missing.fail());
    std::ofstream refused;
    EXPECT_FALSE(Path((name + L"/no").c_str()).openOfstream(refused, {}));
    EXPECT_TRUE(refused.fail());
    std::filesystem::remove_all(folder);
}
