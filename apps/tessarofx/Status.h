// Outcome of a tool step: success, or a one-line message for the user. A failure that came from
// the plug-in keeps its result code so that callers can tell "not implemented" from real faults.
#pragma once

#include <cstdint>
#include <string>
#include <utility>

namespace tfxtool {

class [[nodiscard]] Status {
 public:
  static Status Ok() { return Status(); }
  static Status Error(std::string message, int32_t code = 0) {
    Status s;
    s.failed_ = true;
    s.message_ = std::move(message);
    s.code_ = code;
    return s;
  }

  // The work was done as far as its input allowed, but not all of it (a damaged clip): the
  // output stands, and the exit status says it is incomplete.
  static Status Incomplete(std::string message) {
    Status s = Error(std::move(message));
    s.incomplete_ = true;
    return s;
  }

  bool ok() const { return !failed_; }
  bool incomplete() const { return incomplete_; }
  const std::string& message() const { return message_; }
  // The plug-in's result code behind the failure, 0 when the tool itself refused.
  int32_t code() const { return code_; }

 private:
  bool failed_ = false;
  bool incomplete_ = false;
  std::string message_;
  int32_t code_ = 0;
};

}  // namespace tfxtool
