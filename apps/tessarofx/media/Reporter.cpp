#include "media/Reporter.h"

#include <unistd.h>

#include <algorithm>

namespace tfxtool {
namespace {

using Seconds = std::chrono::duration<double>;

// A terminal redraw costs a write; ten a second look continuous.
constexpr auto kRedrawEvery = std::chrono::milliseconds(100);
// A log gets a line per tenth of the task, or after this long without one; a task shorter than
// kLogAfter leaves no lines at all, so quick commands keep their logs clean.
constexpr auto kLogEvery = std::chrono::seconds(5);
constexpr auto kLogAfter = std::chrono::seconds(1);
constexpr int kBarWidth = 24;

std::string Duration(double seconds) {
  const long s = static_cast<long>(seconds + 0.5);
  char text[32];
  if (s >= 3600) {
    std::snprintf(text, sizeof text, "%ld:%02ld:%02ld", s / 3600, s / 60 % 60, s % 60);
  } else {
    std::snprintf(text, sizeof text, "%ld:%02ld", s / 60, s % 60);
  }
  return text;
}

}  // namespace

Reporter::Reporter(bool quiet, bool terminal, std::FILE* out, std::FILE* err)
    : quiet_(quiet), terminal_(terminal), out_(out), err_(err) {}

bool Reporter::StderrIsTerminal() { return isatty(STDERR_FILENO) == 1; }

void Reporter::Start(const std::string& label, uint64_t total) {
  Finish();
  std::lock_guard<std::mutex> lock(mutex_);
  active_ = true;
  label_ = label;
  total_ = total;
  done_ = 0;
  started_ = lastShown_ = Clock::now();
  drawn_ = false;
  loggedTenths_ = 0;
  logged_ = false;
  if (terminal_ && !quiet_) Draw(false);
}

void Reporter::Advance(uint64_t n) {
  std::lock_guard<std::mutex> lock(mutex_);
  if (!active_) return;
  done_ = std::min(done_ + n, total_);
  if (quiet_) return;
  if (terminal_) {
    if (Clock::now() - lastShown_ >= kRedrawEvery || done_ == total_) Draw(false);
  } else {
    MaybeLog(false);
  }
}

void Reporter::Finish() {
  std::lock_guard<std::mutex> lock(mutex_);
  if (!active_) return;
  if (!quiet_) {
    if (terminal_) {
      Draw(true);
      std::fputc('\n', err_);
      std::fflush(err_);
      drawn_ = false;
    } else {
      MaybeLog(true);
    }
  }
  active_ = false;
}

void Reporter::Note(const std::string& text) { Message(out_, text); }
void Reporter::Warn(const std::string& text) { Message(err_, "tessarofx: warning: " + text); }
void Reporter::Error(const std::string& text) { Message(err_, "tessarofx: error: " + text); }

void Reporter::Message(std::FILE* to, const std::string& line) {
  std::lock_guard<std::mutex> lock(mutex_);
  Clear();
  std::fprintf(to, "%s\n", line.c_str());
  std::fflush(to);
  if (active_ && terminal_ && !quiet_) Draw(false);
}

// A task of unknown size (total 0) shows what is done so far, or only the time while nothing
// countable happens.
std::string Reporter::ProgressText(bool final) const {
  const double elapsed = Seconds(Clock::now() - started_).count();
  const double rate = elapsed > 0 ? static_cast<double>(done_) / elapsed : 0;
  std::string text = label_;
  char counts[64] = "";
  if (total_ > 0) {
    std::snprintf(counts, sizeof counts, "  %llu/%llu", static_cast<unsigned long long>(done_),
                  static_cast<unsigned long long>(total_));
  } else if (done_ > 0) {
    std::snprintf(counts, sizeof counts, "  %llu", static_cast<unsigned long long>(done_));
  }
  text += counts;
  char numbers[96];
  if (done_ > 0) {
    std::snprintf(numbers, sizeof numbers, "  %.1f/s  %s elapsed", rate, Duration(elapsed).c_str());
  } else {
    std::snprintf(numbers, sizeof numbers, "  %s elapsed", Duration(elapsed).c_str());
  }
  text += numbers;
  if (!final && done_ > 0 && done_ < total_ && rate > 0) {
    text += "  " + Duration(static_cast<double>(total_ - done_) / rate) + " left";
  }
  return text;
}

void Reporter::Draw(bool final) {
  // \r returns to the line's start and \033[K clears what a longer line before left behind.
  if (total_ == 0) {
    std::fprintf(err_, "\r%s\033[K", ProgressText(final).c_str());
  } else {
    const uint64_t filled = done_ * kBarWidth / total_;
    std::string bar(kBarWidth, '-');
    std::fill(bar.begin(), bar.begin() + static_cast<long>(filled), '#');
    std::fprintf(err_, "\r%s [%s] %s\033[K", label_.c_str(), bar.c_str(),
                 ProgressText(final).substr(label_.size() + 2).c_str());
  }
  std::fflush(err_);
  drawn_ = true;
  lastShown_ = Clock::now();
}

void Reporter::Clear() {
  if (!drawn_) return;
  std::fputs("\r\033[K", err_);
  drawn_ = false;
}

void Reporter::MaybeLog(bool final) {
  const Clock::time_point now = Clock::now();
  if (now - started_ < kLogAfter && !logged_) return;
  const uint64_t tenths = total_ ? done_ * 10 / total_ : 0;
  if (!final && tenths == loggedTenths_ && now - lastShown_ < kLogEvery) return;
  std::fprintf(err_, "%s\n", ProgressText(final).c_str());
  std::fflush(err_);
  loggedTenths_ = tenths;
  lastShown_ = now;
  logged_ = true;
}

}  // namespace tfxtool
