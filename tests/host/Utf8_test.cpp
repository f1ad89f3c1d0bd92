// The one UTF-8 conversion the host kit, the plug-in and the tool share: its edge cases, each of
// which one of the conversions it replaced got wrong.
#include "Utf8.h"

#include <gtest/gtest.h>

#include <string>

namespace {

using tfx::host::AppendUtf8;
using tfx::host::DecodeUtf8;

std::wstring Decode(const std::string& s) { return DecodeUtf8(s.data(), s.size()); }

std::string Encode(const std::wstring& w) {
  std::string out;
  AppendUtf8(out, w.data(), w.size());
  return out;
}

TEST(Utf8, DecodesWellFormedTextAndReplacesEachStrayByte) {
  const struct {
    const char* name;
    std::string in;
    std::wstring out;
  } cases[] = {
      {"one to four bytes", "a\xC3\xA9\xE2\x82\xAC\xF0\x9F\x98\x80", L"a\u00E9\u20AC\U0001F600"},
      {"largest scalar value", "\xF4\x8F\xBF\xBF", L"\U0010FFFF"},
      {"above U+10FFFF", "\xF4\x90\x80\x80", L"\uFFFD\uFFFD\uFFFD\uFFFD"},
      {"overlong '/'", "\xC0\xAF", L"\uFFFD\uFFFD"},
      {"overlong three-byte NUL", "\xE0\x80\x80z", L"\uFFFD\uFFFD\uFFFDz"},
      {"encoded surrogate", "\xED\xA0\x80", L"\uFFFD\uFFFD\uFFFD"},
      {"cut short mid-text",
       "\xE2\x82"
       "a",
       L"\uFFFD\uFFFDa"},
      {"cut short at the end", "a\xF0\x9F\x98", L"a\uFFFD\uFFFD\uFFFD"},
      {"lone continuation, invalid lead", "\x80\xFF", L"\uFFFD\uFFFD"},
      {"embedded NUL", std::string("a\0b", 3), std::wstring(L"a\0b", 3)},
  };
  for (const auto& c : cases) {
    SCOPED_TRACE(c.name);
    EXPECT_EQ(Decode(c.in), c.out);
  }
}

TEST(Utf8, EncodesScalarValuesAndReplacesTheRest) {
  EXPECT_EQ(Encode(L"a\u00E9\u20AC\U0010FFFF"), "a\xC3\xA9\xE2\x82\xAC\xF4\x8F\xBF\xBF");
  const std::string fffd = "\xEF\xBF\xBD";
  EXPECT_EQ(Encode(std::wstring{wchar_t(0xD800), wchar_t(0xDFFF), wchar_t(0x110000), wchar_t(-1)}),
            fffd + fffd + fffd + fffd);
  // Appends to what is there.
  std::string out = "x";
  const wchar_t e = L'\u00E9';
  AppendUtf8(out, &e, 1);
  EXPECT_EQ(out, "x\xC3\xA9");
}

}  // namespace
