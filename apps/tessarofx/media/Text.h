// Small text conversions shared by the commands.
#pragma once

#include <cstdint>
#include <string>

namespace tfxtool {

// Whole-string parses: no trailing characters, no blanks, finite values only.
bool ParseNumber(const std::string& text, double* value);
bool ParseInteger(const std::string& text, long long* value);

// Shortest text that reads back as the same value for the numbers the tool deals in ("0", "1.5").
std::string FormatNumber(double value);

// UTF-8 to wide (UTF-32 on the target) and back, by the host kit's policy (host/Utf8.h):
// malformed bytes and values that are no Unicode scalar value become U+FFFD.
std::wstring Widen(const std::string& utf8);
std::string Narrow(const std::wstring& wide);

// A result code as "0x80000001 (not implemented)".
std::string DescribeResult(int32_t code);

}  // namespace tfxtool
