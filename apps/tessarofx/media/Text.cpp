#include "media/Text.h"

#include <cctype>
#include <cerrno>
#include <cmath>
#include <cstdio>
#include <cstdlib>

#include "Utf8.h"
#include "tessarofx/NLEComBase.h"

namespace tfxtool {

bool ParseNumber(const std::string& text, double* value) {
  if (text.empty() || std::isspace(static_cast<unsigned char>(text[0]))) return false;
  char* end = nullptr;
  errno = 0;
  const double v = std::strtod(text.c_str(), &end);
  if (*end != '\0' || errno == ERANGE || !std::isfinite(v)) return false;
  *value = v;
  return true;
}

bool ParseInteger(const std::string& text, long long* value) {
  if (text.empty() || std::isspace(static_cast<unsigned char>(text[0]))) return false;
  char* end = nullptr;
  errno = 0;
  const long long v = std::strtoll(text.c_str(), &end, 10);
  if (*end != '\0' || errno == ERANGE) return false;
  *value = v;
  return true;
}

std::string FormatNumber(double value) {
  char buf[64];
  std::snprintf(buf, sizeof buf, "%.10g", value);
  return buf;
}

std::wstring Widen(const std::string& utf8) {
  return tfx::host::DecodeUtf8(utf8.data(), utf8.size());
}

std::string Narrow(const std::wstring& wide) {
  std::string out;
  tfx::host::AppendUtf8(out, wide.data(), wide.size());
  return out;
}

std::string DescribeResult(int32_t code) {
  char buf[32];
  std::snprintf(buf, sizeof buf, "0x%08X", static_cast<unsigned>(code));
  const char* meaning = NLEResultText(code);
  return std::string(buf) + " (" + (meaning ? meaning : "unknown result") + ")";
}

}  // namespace tfxtool
