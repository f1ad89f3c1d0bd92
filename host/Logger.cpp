// The process-wide logger. Formatting happens on the caller's thread without a lock; only the
// hand-over to the sink is serialised, so lines from different threads never interleave and a
// sink sees one call at a time.

#include <strings.h>
#include <unistd.h>

#include <atomic>
#include <cerrno>
#include <cstdarg>
#include <cstdlib>
#include <cstring>
#include <cwchar>
#include <memory>
#include <mutex>
#include <string>

#include "HostInternal.h"
#include "Utf8.h"

namespace tfx::host {
namespace {

constexpr const char* kLevelVariable = "TESSAROFX_LOG_LEVEL";

// vswprintf cannot say how long its output would be, only that it did not fit (or that an
// argument could not be encoded, which looks the same). The buffer doubles up to this many
// characters; a message that still fails is reported by its format string.
constexpr size_t kFirstBuffer = 256;
constexpr size_t kMaxBuffer = size_t{1} << 20;

std::wstring FormatMessage(const wchar_t* format, va_list args) {
  for (size_t size = kFirstBuffer; size <= kMaxBuffer; size *= 2) {
    std::unique_ptr<wchar_t[]> buf(new wchar_t[size]);
    va_list attempt;
    va_copy(attempt, args);
    const int n = std::vswprintf(buf.get(), size, format, attempt);
    va_end(attempt);
    if (n >= 0) return std::wstring(buf.get(), static_cast<size_t>(n));
  }
  return std::wstring(L"(message could not be formatted) ") + format;
}

int32_t LevelFromEnvironment() {
  const char* text = std::getenv(kLevelVariable);
  if (!text || !*text) return kNLELogInfo;
  if (strcasecmp(text, "off") == 0) return kNLELogOff;
  char* end = nullptr;
  errno = 0;
  const long value = std::strtol(text, &end, 10);
  while (*end == ' ' || *end == '\t' || *end == '\n') ++end;
  // A setting that does not read as a level is ignored rather than silencing the log.
  if (end == text || *end != '\0' || errno == ERANGE || value < INT32_MIN || value > INT32_MAX) {
    return kNLELogInfo;
  }
  return static_cast<int32_t>(value);
}

std::string LevelTag(int32_t level) {
  switch (level) {
    case kNLELogTrace:
      return "trace";
    case kNLELogDebug:
      return "debug";
    case kNLELogInfo:
      return "info";
    case kNLELogWarning:
      return "warning";
    case kNLELogError:
      return "error";
    default:
      return std::to_string(level);
  }
}

// Writes to the descriptor rather than through stdio: whether the host has made stderr a wide
// stream or a narrow one, bytes written here are never mixed with its buffered output.
void WriteAll(int fd, const std::string& bytes) {
  const char* p = bytes.data();
  size_t left = bytes.size();
  while (left > 0) {
    const ssize_t n = ::write(fd, p, left);
    if (n < 0 && errno == EINTR) continue;
    if (n <= 0) return;  // nowhere left to report a failing stderr
    p += n;
    left -= static_cast<size_t>(n);
  }
}

void WriteToStderr(void* /*context*/, int32_t level, const wchar_t* message) {
  std::string line = "[" + LevelTag(level) + "] ";
  AppendUtf8(line, message, std::wcslen(message));
  line += '\n';
  WriteAll(STDERR_FILENO, line);
}

class DefaultLogger final : public INLELogger {
 public:
  DefaultLogger() : level_(LevelFromEnvironment()) {}

  bool IsLevelEnabled(int32_t level) override {
    const int32_t threshold = level_.load(std::memory_order_relaxed);
    return threshold < kNLELogOff && level >= threshold;
  }

  void Log(int32_t level, const wchar_t* format, ...) override {
    va_list args;
    va_start(args, format);
    LogV(level, format, args);
    va_end(args);
  }

  void LogV(int32_t level, const wchar_t* format, va_list args) override {
    if (!format || !IsLevelEnabled(level)) return;
    try {
      const std::wstring message = FormatMessage(format, args);
      // Recursive, so that a sink which logs, or which installs another sink, cannot deadlock.
      std::lock_guard<std::recursive_mutex> lock(mutex_);
      sink_(context_, level, message.c_str());
    } catch (const std::bad_alloc&) {
      // A message that cannot be built is dropped; logging never fails its caller.
    }
  }

  void SetLevel(int32_t level) override { level_.store(level, std::memory_order_relaxed); }
  int32_t GetLevel() override { return level_.load(std::memory_order_relaxed); }

  void SetSink(NLELogSink sink, void* context) override {
    std::lock_guard<std::recursive_mutex> lock(mutex_);
    sink_ = sink ? sink : &WriteToStderr;
    context_ = sink ? context : nullptr;
  }

 private:
  ~DefaultLogger() = default;  // never destroyed, see NLEGetDefaultLogger

  std::atomic<int32_t> level_;
  std::recursive_mutex mutex_;
  NLELogSink sink_ = &WriteToStderr;
  void* context_ = nullptr;
};

}  // namespace
}  // namespace tfx::host

extern "C" INLELogger* NLEGetDefaultLogger() {
  // Never destroyed: other libraries' static destructors may still log during exit.
  static INLELogger* const logger = new tfx::host::DefaultLogger();
  return logger;
}
