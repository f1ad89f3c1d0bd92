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

  bool ok() const { return !failed_; }
  const std::string& message() const { return message_; }
  // The plug-in's result code behind the failure, 0 when the tool itself refused.
  int32_t code() const { return code_; }

 private:
  bool failed_ = false;
  std::string message_;
  int32_t code_ = 0;
};

}  // namespace tfxtool
