// Progress and messages on stderr, one voice for the whole run. On a terminal the progress is one
// line redrawn in place, and messages are written above it so that the two never share a line;
// elsewhere (a log, a pipe) progress is a plain line now and then, as a redrawn line would leave
// its every state in the file.
#pragma once

#include <chrono>
#include <cstdint>
#include <cstdio>
#include <mutex>
#include <string>

namespace tfxtool {

class Reporter {
 public:
  // `quiet` drops the progress display; messages still go out. `terminal` is whether `err` is
  // one (isatty), which decides between the redrawn line and the occasional plain one.
  Reporter(bool quiet, bool terminal, std::FILE* out = stdout, std::FILE* err = stderr);
  // The reporter for stderr as it is: a terminal or not.
  static bool StderrIsTerminal();

  // A task of `total` items (pictures, frames, steps) starts; `label` names it on the line.
  // Starting another task finishes the one before.
  void Start(const std::string& label, uint64_t total);
  // `n` more items are done. Safe from any thread, as items may finish on several.
  void Advance(uint64_t n = 1);
  // The task is over: the line is drawn complete and left in place.
  void Finish();

  // A line of the command's normal output (stdout), kept clear of the progress line.
  void Note(const std::string& text);
  // "tessarofx: warning: TEXT" and "tessarofx: error: TEXT" on stderr.
  void Warn(const std::string& text);
  void Error(const std::string& text);

 private:
  using Clock = std::chrono::steady_clock;

  std::string ProgressText(bool final) const;
  void Draw(bool final);      // the terminal line, in place
  void Clear();               // removes the terminal line before a message
  void MaybeLog(bool final);  // the plain line, now and then
  void Message(std::FILE* to, const std::string& line);

  const bool quiet_;
  const bool terminal_;
  std::FILE* const out_;
  std::FILE* const err_;

  std::mutex mutex_;
  bool active_ = false;
  std::string label_;
  uint64_t total_ = 0;
  uint64_t done_ = 0;
  Clock::time_point started_;
  Clock::time_point lastShown_;
  bool drawn_ = false;         // the terminal line is on screen
  uint64_t loggedTenths_ = 0;  // the last tenth of the task a plain line reported
  bool logged_ = false;        // a plain line has been written for this task
};

}  // namespace tfxtool
