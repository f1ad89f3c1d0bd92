#include "LutFiles.h"

#include <cctype>
#include <cstdio>
#include <fstream>

namespace tfxtool {
namespace {

constexpr size_t kShownText = 60;       // bytes of a line a message quotes
constexpr int kTerminatorWindow = 252;  // as the plug-in's readers

// One physical line at a time, keeping only the start of each, so that a hostile file of one
// huge line costs no memory.
class LineScanner {
 public:
  LineScanner(std::ifstream& in, char terminator) : in_(in), terminator_(terminator) {
    in_.clear();
    in_.seekg(0);
  }

  // The next line and the offset just past it (past its terminator, or the end of the file).
  bool Next(LutLine* line, long long* end) {
    using Traits = std::ifstream::traits_type;
    Traits::int_type c = in_.get();
    if (Traits::eq_int_type(c, Traits::eof())) return false;
    line->number = ++number_;
    line->text.clear();
    for (; !Traits::eq_int_type(c, Traits::eof()); c = in_.get()) {
      ++offset_;
      if (Traits::to_char_type(c) == terminator_) break;
      if (line->text.size() <= kShownText) line->text.push_back(Traits::to_char_type(c));
    }
    if (!line->text.empty() && line->text.back() == '\r') line->text.pop_back();
    *end = offset_;
    return true;
  }

 private:
  std::ifstream& in_;
  char terminator_;
  long number_ = 0;
  long long offset_ = 0;
};

// The plug-in's search for the line terminator: the first '\n' or '\r' within the first
// kTerminatorWindow bytes, a '\r' followed by '\n' counting as '\n' (those lines keep their
// '\r'); '\n' when there is none, which a file shorter than the window may lack. False when the
// window holds neither. The stream goes back to its start.
bool ScanTerminator(std::ifstream& in, char* terminator) {
  using Traits = std::ifstream::traits_type;
  in.clear();
  in.seekg(0);
  *terminator = '\n';
  bool found = false;
  for (int i = 0; i < kTerminatorWindow && !found; ++i) {
    const Traits::int_type c = in.get();
    found = Traits::eq_int_type(c, Traits::eof()) || c == '\n';
    if (c == '\r') {
      *terminator = in.get() == '\n' ? '\n' : '\r';
      found = true;
    }
  }
  in.clear();
  in.seekg(0);
  return found;
}

bool StartsWith(const std::string& text, const char* prefix) {
  return text.compare(0, std::char_traits<char>::length(prefix), prefix) == 0;
}

}  // namespace

std::string LutFileMessage(const std::string& file, long line, const std::string& text,
                           const std::string& reason) {
  std::string message = file;
  if (line > 0) {
    std::string shown;
    for (size_t i = 0; i < text.size() && i < kShownText; ++i) {
      const unsigned char c = static_cast<unsigned char>(text[i]);
      if (c == '"' || c == '\\') {
        shown += '\\';
        shown += static_cast<char>(c);
      } else if (c < 0x20 || c == 0x7f) {
        char escaped[8];
        std::snprintf(escaped, sizeof escaped, "\\x%02x", c);
        shown += escaped;
      } else {
        shown += static_cast<char>(c);
      }
    }
    if (text.size() > kShownText) shown += "...";
    message += ", line " + std::to_string(line) + " (\"" + shown + "\")";
  }
  return message + ": " + reason;
}

std::string LutStatusMeaning(int status) {
  switch (status) {
    case 0:
      return "";
    case 1:
      return "nothing was loaded";
    case 10:
      return "a read failed: the table ends early, or a keyword's values cannot be read";
    case 12:
      return "the file ends before the table is complete";
    case 13:
      return "no line end in the first 252 bytes";
    case 20:
      return "unknown or repeated keyword";
    case 21:
      return "TITLE is not followed by '\"'";
    case 22:
      return "a DOMAIN_MAX value is not above its DOMAIN_MIN";
    case 23:
      return "the size is missing or outside 2..64";
    case 24:
      return "fewer than three numbers where three are needed";
  }
  return "unknown status";
}

LutFormat LutFormatOf(const std::string& path) {
  const size_t dot = path.rfind('.');
  if (dot == std::string::npos) return LutFormat::kNone;
  std::string ext = path.substr(dot);
  for (char& c : ext) c = static_cast<char>(std::toupper(static_cast<unsigned char>(c)));
  if (ext == ".CUBE") return LutFormat::kCube;
  if (ext == ".3DL") return LutFormat::k3dl;
  return LutFormat::kNone;
}

LutLine LocateStop(const std::string& path, LutFormat format, long long offset, int status) {
  std::ifstream in(path, std::ios::in | std::ios::binary);
  LutLine line;
  if (!in.is_open()) return line;
  char terminator;
  ScanTerminator(in, &terminator);  // a file without one has a single line, read to its end
  LineScanner scanner(in, terminator);
  const long long target = offset > 0 ? offset - 1 : 0;
  long long end = 0;
  while (scanner.Next(&line, &end) && end <= target) {
  }
  // The ".CUBE" header checks run after the first table row was read and put back.
  const bool headerCheck =
      format == LutFormat::kCube && offset > 0 && end == offset &&
      (status == 22 || (status == 23 && !StartsWith(line.text, "LUT_3D_SIZE")));
  if (headerCheck) {
    // The row was put back together with the comment and blank lines the reader skipped on the
    // way to it.
    LutLine next;
    while (scanner.Next(&next, &end)) {
      line = next;
      if (!next.text.empty() && next.text[0] != '#') break;
    }
  }
  return line;
}

}  // namespace tfxtool
