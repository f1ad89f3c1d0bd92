#include "Utf8.h"

#include <utf8.h>

#include <cstdint>

namespace tfx::host {
namespace {

static_assert(sizeof(wchar_t) == 4, "a wide character holds a whole code point");

constexpr uint32_t kReplacement = 0xFFFD;

bool IsScalarValue(uint32_t c) { return c < 0xD800 || (c > 0xDFFF && c <= 0x10FFFF); }

}  // namespace

void AppendUtf8(std::string& out, const wchar_t* text, size_t length) {
  for (size_t i = 0; i < length; ++i) {
    const uint32_t c = static_cast<uint32_t>(text[i]);
    // utfcpp throws on a value it cannot encode; the policy replaces it first.
    utf8::append(static_cast<char32_t>(IsScalarValue(c) ? c : kReplacement), out);
  }
}

std::wstring DecodeUtf8(const char* text, size_t length) {
  std::wstring out;
  out.reserve(length);
  const char* it = text;
  const char* const end = text + length;
  while (it != end) {
    // Everything before the first malformed sequence is decoded whole; that sequence's first
    // byte is replaced, and the search starts again just after it, so each stray continuation
    // byte of a broken sequence gets a replacement of its own.
    const char* const bad = utf8::find_invalid(it, end);
    while (it != bad) out += static_cast<wchar_t>(utf8::next(it, bad));
    if (it != end) {
      out += static_cast<wchar_t>(kReplacement);
      ++it;
    }
  }
  return out;
}

}  // namespace tfx::host
