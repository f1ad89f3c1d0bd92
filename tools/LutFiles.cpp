#include "LutFiles.h"

#include <cctype>
#include <cmath>
#include <cstdio>
#include <fstream>
#include <locale>
#include <sstream>

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

// The plug-in's ".CUBE" reader with a physical line count: one instance per file.
class CubeReader {
 public:
  CubeReader(const std::string& path, std::ifstream& in) : path_(path), in_(in) {}

  Status Read(LutTable* table) {
    if (!ScanTerminator(in_, &terminator_)) return Fail(13, "");
    float lo[3] = {0, 0, 0}, hi[3] = {1, 1, 1};
    bool sawTitle = false, sawMin = false, sawMax = false;
    int size = 0;
    std::string row;  // the first table row, once the header has met it
    for (;;) {
      std::string line;
      if (Status s = NextLine(&line); !s.ok()) return s;
      std::istringstream words(line);
      words.imbue(std::locale::classic());
      std::string word;
      words >> word;
      if (word > "+" && word < ":") {
        row = line;
        break;
      }
      int status = 0;
      if (word == "TITLE" && !sawTitle) {
        sawTitle = true;
        char quote = 0;
        std::string title;
        if (!(words >> quote)) {
          status = 10;
        } else if (quote != '"') {
          status = 21;
        } else if (!std::getline(words, title, '"')) {
          status = 10;
        }
      } else if (word == "DOMAIN_MIN" && !sawMin) {
        sawMin = true;
        if (!(words >> lo[0] >> lo[1] >> lo[2])) status = 10;
      } else if (word == "DOMAIN_MAX" && !sawMax) {
        sawMax = true;
        if (!(words >> hi[0] >> hi[1] >> hi[2])) status = 10;
      } else if (word == "LUT_3D_SIZE" && size == 0) {
        int n = 0;
        if (!(words >> n)) {
          status = 10;
        } else if (n < 2 || n > kMaxCubeFileSize) {
          return Fail(23, "LUT_3D_SIZE outside 2.." + std::to_string(kMaxCubeFileSize));
        } else {
          size = n;
        }
      } else {
        status = 20;
      }
      if (status != 0) return Fail(status, LutStatusMeaning(status));
    }
    // Judged at the first table row, as the plug-in does.
    if (size == 0) return Fail(23, "no LUT_3D_SIZE before the table");
    for (int c = 0; c < 3; ++c) {
      if (!(hi[c] > lo[c])) return Fail(22, LutStatusMeaning(22));
    }

    float scale[3];
    for (int c = 0; c < 3; ++c) scale[c] = (hi[c] - lo[c]) * 255.0f;
    table->size = size;
    table->values.assign(static_cast<size_t>(size) * size * size * 3, 0.0f);
    float x = 0, y = 0, z = 0;  // a missing number keeps the previous row's
    for (int k = 0; k < size; ++k) {
      for (int j = 0; j < size; ++j) {
        for (int i = 0; i < size; ++i) {
          if (row.empty()) {
            if (Status s = NextLine(&row); !s.ok()) return s;
          }
          std::sscanf(row.c_str(), "%f %f %f", &x, &y, &z);
          row.clear();
          const float v[3] = {x * scale[0], y * scale[1], z * scale[2]};
          if (!std::isfinite(v[0]) || !std::isfinite(v[1]) || !std::isfinite(v[2])) {
            return Fail(24, LutStatusMeaning(24));
          }
          float* p = &table->values[((static_cast<size_t>(i) * size + j) * size + k) * 3];
          for (int c = 0; c < 3; ++c) p[c] = v[c];
        }
      }
    }
    return Status::Ok();
  }

 private:
  // The plug-in's readLine, counting every physical line it consumes.
  Status NextLine(std::string* line) {
    line->clear();
    while (line->empty() || (*line)[0] == '#' || *line == "\r") {
      if (in_.eof()) return Fail(12, LutStatusMeaning(12));
      std::getline(in_, *line, terminator_);
      if (in_.fail() || in_.bad()) return Fail(10, "the file ends before the table is complete");
      ++number_;
      text_ = *line;
    }
    return Status::Ok();
  }

  Status Fail(int status, const std::string& reason) const {
    std::string text = text_;
    if (!text.empty() && text.back() == '\r') text.pop_back();
    return Status::Error(
        LutFileMessage(path_, number_, text, "status " + std::to_string(status) + ", " + reason));
  }

  const std::string& path_;
  std::ifstream& in_;
  char terminator_ = '\n';
  long number_ = 0;   // the physical line last read
  std::string text_;  // and its text
};

// doLUT's tetrahedra: the corner path from C000 to C111 follows the fractions in decreasing
// order, with strict comparisons tested in this order.
float Tetrahedral(float fr, float fg, float fb, const float* c000, const float* c001,
                  const float* c010, const float* c011, const float* c100, const float* c101,
                  const float* c110, const float* c111, int ch) {
  if (fr > fg) {
    if (fg > fb) {
      return (1 - fr) * c000[ch] + (fr - fg) * c100[ch] + (fg - fb) * c110[ch] + fb * c111[ch];
    }
    if (fr > fb) {
      return (1 - fr) * c000[ch] + (fr - fb) * c100[ch] + (fb - fg) * c101[ch] + fg * c111[ch];
    }
    return (1 - fb) * c000[ch] + (fb - fr) * c001[ch] + (fr - fg) * c101[ch] + fg * c111[ch];
  }
  if (fb > fg) {
    return (1 - fb) * c000[ch] + (fb - fg) * c001[ch] + (fg - fr) * c011[ch] + fr * c111[ch];
  }
  if (fb > fr) {
    return (1 - fg) * c000[ch] + (fg - fb) * c010[ch] + (fb - fr) * c011[ch] + fr * c111[ch];
  }
  return (1 - fg) * c000[ch] + (fg - fr) * c010[ch] + (fr - fb) * c110[ch] + fb * c111[ch];
}

// Where output index i of m falls in an axis of n points: the lower point and the fraction.
void Locate(int i, int m, int n, int* lower, float* fraction) {
  // In float, as doLUT's tables are; the last index lands exactly on the last point.
  const float s = static_cast<float>(i) * static_cast<float>(n - 1) / static_cast<float>(m - 1);
  *lower = static_cast<int>(s);
  if (*lower > n - 1) *lower = n - 1;
  *fraction = s - static_cast<float>(*lower);
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
      return "fewer than three numbers where three are needed, or one that is not finite";
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

Status ReadCubeTable(const std::string& path, LutTable* table) {
  std::ifstream in(path, std::ios::in | std::ios::binary);
  if (!in.is_open()) return Status::Error(LutFileMessage(path, 0, "", "cannot be opened"));
  return CubeReader(path, in).Read(table);
}

LutTable ResampleTable(const LutTable& in, int m) {
  LutTable out;
  out.size = m;
  out.values.resize(static_cast<size_t>(m) * m * m * 3);
  const int n = in.size;
  for (int i = 0; i < m; ++i) {
    int ri;
    float fr;
    Locate(i, m, n, &ri, &fr);
    const int ru = ri + 1 < n ? ri + 1 : n - 1;
    for (int j = 0; j < m; ++j) {
      int gi;
      float fg;
      Locate(j, m, n, &gi, &fg);
      const int gu = gi + 1 < n ? gi + 1 : n - 1;
      for (int k = 0; k < m; ++k) {
        int bi;
        float fb;
        Locate(k, m, n, &bi, &fb);
        const int bu = bi + 1 < n ? bi + 1 : n - 1;
        float* p = &out.values[((static_cast<size_t>(i) * m + j) * m + k) * 3];
        for (int ch = 0; ch < 3; ++ch) {
          p[ch] = Tetrahedral(fr, fg, fb, in.Point(ri, gi, bi), in.Point(ri, gi, bu),
                              in.Point(ri, gu, bi), in.Point(ri, gu, bu), in.Point(ru, gi, bi),
                              in.Point(ru, gi, bu), in.Point(ru, gu, bi), in.Point(ru, gu, bu), ch);
        }
      }
    }
  }
  return out;
}

}  // namespace tfxtool
