#include "utils/path.h"

#include <gtest/gtest.h>

#include <algorithm>
#include <array>
#include <filesystem>
#include <stdexcept>

#include "support/random.h"
#include "support/temp_dir.h"

using MORVA::UTILS::Path;

// Whatever the components, the result has none to remove and names the same place as the standard
// library's lexical form. A relative path stays.
TEST(Path, NormalizesLikeTheStandardLibrary) {
    test_support::Random random(17);
    TRACE_SEED(random);
    wchar_t const* const parts[] = {L"a", L".", L"..", L"", L".d", L"e..", L"...", L"b\\.."};
    auto const main = Path::separator_.substr(0, 1);
    for (int i = 0; i < 2000; ++i) {
        std::wstring text;
        for (std::size_t n = random.between(0, 6); n > 0; --n) {
            text += main;
            text += parts[random.between(0, std::size(parts) - 1)];
        }
        text += main + (random.chance(0.5) ? L"f" : L"..");
        Path relative((L"r" + text).c_str());
        ASSERT_FALSE(relative.normalize());
        ASSERT_EQ(relative.str(), L"r" + text);
        // A doubled root means something to the standard library, and to both on Windows.
        auto const single = text.substr(text.find_first_not_of(main) - 1);
        Path path((main == L"/" ? text : single).c_str());
        ASSERT_TRUE(path.normalize());
        ASSERT_EQ(path.str(), std::filesystem::path(single).lexically_normal().wstring())
            << path.convertWString2MBString(text);
    }
    EXPECT_FALSE(Path(L"").normalize());
}

TEST(Path, PutsAFrontBeforeRelativePathsAndFindsTheExtension) {
    using Row = std::array<wchar_t const*, 4>;
    auto const here = [](std::wstring text) {  // joined by the system's separator
        std::replace(text.begin(), text.end(), L'|', Path::separator_.front());
        return text;
    };
    for (auto const& [text, front, wanted, extension] :
         {Row{L"/a.b/file", L"/base", L"/a.b/file", L""},
          Row{L"f.v2.MVW", L"/b", L"/b|f.v2.MVW", L"MVW"}, Row{L".mvw", L"/b/", L"/b/.mvw", L"mvw"},
          Row{L"m.\x00e4", L"", L"m.\x00e4", L"\x00e4"}, Row{L"", L"/b", L"/b|", L""}}) {
        Path path(text);
        EXPECT_TRUE(path.pushFront(front));
        EXPECT_EQ(path.str(), here(wanted));
        EXPECT_EQ(path.getFileExtension(), extension);
    }
}

TEST(Path, OpensFilesUnderTheirUtf8Name) {
    test_support::TempDir const dir;
    std::wstring const name = dir.path().wstring() + L"/\u00e4\u4f60 \U0001F600.bin";
    std::ofstream out;
    ASSERT_TRUE(Path(name.c_str()).openOfstream(out, std::ios_base::binary));
    out << "content";
    out.close();
    EXPECT_TRUE(std::filesystem::exists(dir.path() / "\xc3\xa4\xe4\xbd\xa0 \xf0\x9f\x98\x80.bin"));
    Path const path(name.c_str());
    EXPECT_EQ(path.convertMBString2WString(path.convertWString2MBString(name)), name);
    EXPECT_THROW(path.convertWString2MBString(L"\xd800"), std::range_error);
    for (auto const bytes : {"\xff", "\xc3("})
        EXPECT_THROW(path.convertMBString2WString(bytes), std::range_error);
    std::ifstream in;
    in.setstate(std::ios_base::failbit);  // an earlier failure is forgotten
    ASSERT_TRUE(path.openIfstream(in, std::ios_base::binary));
    std::string content;
    in >> content;
    EXPECT_EQ(content, "content");
}
