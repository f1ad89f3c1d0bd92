// Helpers of the LUT file code that tests and tools reach but the plug-in does not export.
#pragma once

#include <cstddef>
#include <string>

// v in fixed notation with exactly eight decimals ("1.00000000", "0.50000000"), whatever the
// host's locale: the form of every value the ".CUBE" writer emits.
std::string convertFloat2String(float v);

namespace tfx {

constexpr size_t kLutPathBufferBytes = 8192;
constexpr size_t kLutPathMaxBytes = 2047;

// The UTF-8 form of a wide path into `out`, which the caller zero-fills with
// kLutPathBufferBytes bytes. At most kLutPathMaxBytes bytes are written: conversion stops before
// the first character that would not fit whole. Converted by the host kit's one policy
// (host/Utf8.h): surrogates and values from 0x110000 up become U+FFFD.
void WideToUtf8Path(const std::wstring& wide, char* out);

}  // namespace tfx
