// Conversions between the kit's wide strings and the UTF-8 bytes of the outside world (the
// environment, stderr). Done by hand because the C library's conversions follow the locale, and
// a host that never calls setlocale runs in the "C" locale, where they fail on any non-ASCII text.
#pragma once

#include <cstddef>
#include <string>

namespace tfx::host {

// Appends `text` (code points, as wchar_t holds them on this platform) as UTF-8. Values that
// are not Unicode scalar values (surrogates, above U+10FFFF) become U+FFFD.
void AppendUtf8(std::string& out, const wchar_t* text, size_t length);

// Decodes UTF-8; each byte that does not start a well-formed sequence becomes U+FFFD.
std::wstring DecodeUtf8(const char* text, size_t length);

}  // namespace tfx::host
