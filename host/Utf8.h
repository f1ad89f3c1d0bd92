// The one conversion between wide strings (code points: wchar_t is 32 bits here) and UTF-8,
// compiled into the host kit, the plug-in, the frei0r modules and the tool alike, so that a name
// or path means the same bytes whichever of them converts it. Done without the C library, whose
// conversions follow the locale and fail on any non-ASCII text in the "C" locale a host that
// never calls setlocale runs in. Internal: the header is not installed.
//
// One policy, both ways:
//   - UTF-8 to wide: each byte that does not start a well-formed sequence becomes one U+FFFD and
//     decoding resumes at the next byte. Overlong forms ("\xC0\xAF"), encoded surrogates
//     ("\xED\xA0\x80"), values above U+10FFFF and sequences cut short are not well formed.
//   - wide to UTF-8: values that are not Unicode scalar values (surrogates, above U+10FFFF,
//     negative) become U+FFFD.
#pragma once

#include <cstddef>
#include <string>

namespace tfx::host {

// Appends `text` as UTF-8.
void AppendUtf8(std::string& out, const wchar_t* text, size_t length);

// Decodes UTF-8.
std::wstring DecodeUtf8(const char* text, size_t length);

}  // namespace tfx::host
