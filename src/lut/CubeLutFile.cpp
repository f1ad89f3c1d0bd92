// The file side of CubeLut: the ".CUBE" and ".3DL" readers and the ".CUBE" writer.
//
// A ".CUBE" file is a header of keyword lines, then N^3 rows of three values with red changing
// fastest, scaled here to 0..255 by the width of the domain:
//
//   # comment lines start with '#' in their very first column
//   TITLE "Warm grade"
//   DOMAIN_MIN 0.0 0.0 0.0
//   DOMAIN_MAX 1.0 1.0 1.0
//   LUT_3D_SIZE 2
//   0.0 0.0 0.0          <- lattice[0][0][0]
//   1.0 0.0 0.0          <- lattice[1][0][0]
//   ...
//
// Each keyword may appear once; any other keyword (1-D sizes, input ranges) refuses the file.
// The first line whose first word starts like a number ends the header.
//
// A ".3DL" file is free text up to its first numeric line, the input-range line, whose count
// of space-separated pieces is N; then N^3 rows of 12-bit values with blue changing fastest:
//
//   3DMESH
//   Mesh 4 12
//   0 64 128 192 256 320 384 448 512 576 640 704 768 832 896 960 1023
//   0 0 0                <- lattice[0][0][0]
//   0 0 255              <- lattice[0][0][1]
//   ...
//
// Hostile files are the normal case: the readers never write outside the 64-point lattice, never
// allocate more than the input and an N <= 64 atlas, and every loop consumes input or stops.
// Reading stops at the first error, and the stream is left where it stopped. The readers count
// the physical lines they take, so that a caller can be told which line stopped them.
#include "lut/CubeLutFile.h"

#include <algorithm>
#include <cctype>
#include <climits>
#include <cmath>
#include <cstdint>
#include <cstdio>
#include <cstring>
#include <iomanip>
#include <locale>
#include <sstream>

#include "Utf8.h"
#include "tessarofx/CubeLut.h"

namespace {

constexpr int kTerminatorWindow = 252;  // characters searched for the first line end
// Every ".3DL" file is read as 12-bit, whatever its range line says.
constexpr float kDepth3dlMax = 4095.0f;

// Stores one lattice point, unless a value is infinite or NaN: "inf", "nan" or a number beyond
// float (scaled or not) is no colour, and a file holding one ends with status 24, like a row
// short of numbers, rather than loading a table that cannot be written back out.
bool StoreFinite(float* point, float red, float green, float blue) {
  if (!std::isfinite(red) || !std::isfinite(green) || !std::isfinite(blue)) return false;
  point[0] = red;
  point[1] = green;
  point[2] = blue;
  return true;
}

// The physical lines a read has taken, and the start of the last one, so that a failure can
// point at it.
struct LineCursor {
  long line = 0;
  std::string text;  // at most CubeLut::kStopTextBytes, without the line end
};

void Remember(const std::string& line, LineCursor* at) {
  ++at->line;
  size_t length = line.size();
  if (length > 0 && line[length - 1] == '\r') --length;
  at->text.assign(line, 0, std::min(length, CubeLut::kStopTextBytes));
}

// Finds the line terminator from the start of the stream: the first '\n' or '\r'; a '\r'
// followed by '\n' makes a CR-LF file, read with '\n' so that its lines keep their '\r'. Returns
// false when the first kTerminatorWindow characters hold neither, and then puts the start of
// that overlong first line in `at`. A file that ends sooner is read with '\n' and has at most
// one line. The stream goes back to its start either way.
bool DetectTerminator(std::ifstream& in, char* terminator, LineCursor* at) {
  using Traits = std::ifstream::traits_type;
  *terminator = '\n';
  bool found = false;
  std::string start;
  for (int count = 0; count < kTerminatorWindow; ++count) {
    const Traits::int_type c = in.get();
    if (Traits::eq_int_type(c, Traits::eof())) {
      found = true;
      break;
    }
    if (c == '\n') {
      found = true;
      break;
    }
    if (c == '\r') {
      *terminator = in.get() == '\n' ? '\n' : '\r';
      found = true;
      break;
    }
    if (start.size() < CubeLut::kStopTextBytes) start += Traits::to_char_type(c);
  }
  if (!found) {
    at->line = 1;
    at->text = start;
  }
  // Cleared before the seek as well: a stream that met its end refuses to seek.
  in.clear();
  in.seekg(0);
  in.clear();
  return found;
}

// readLine's loop, counting every physical line it takes in `at` (when there is one).
std::string NextLine(std::ifstream& in, char terminator, int32_t* status, LineCursor* at) {
  std::string line;
  for (;;) {
    // A '#' only comments out a line when it is the very first character.
    if (!line.empty() && line[0] != '#' && line != "\r") return line;
    // Kept on purpose: a last line without a terminator leaves the end flag set and the next
    // call reports 12, while one with a terminator lets getline fail first, which reports 10.
    if (in.eof()) {
      *status = 12;
      return line;
    }
    std::getline(in, line, terminator);
    if (in.fail() || in.bad()) {
      *status = 10;
      return line;
    }
    if (at) Remember(line, at);
  }
}

void Report(int32_t status, const LineCursor& at, int sizeLimit, CubeLut::Stop* stop) {
  if (!stop) return;
  stop->status = status;
  stop->line = at.line;
  stop->text = at.text;
  stop->sizeLimit = sizeLimit;
}

// The header's test for a numeric line: a first word that sorts after "+" and before ":", so a
// digit, '.', '-', ',', '/', or '+' with more after it.
bool IsNumericWord(const std::string& word) { return word > "+" && word < ":"; }

// The pieces splitString would cut `line` into, counted without building them: a hostile line of
// spaces would cost a string per byte.
size_t CountPieces(const std::string& line) {
  if (line.empty()) return 0;
  size_t pieces = 1;
  for (const char c : line) pieces += c == ' ';
  return pieces;
}

// Keyword values and table rows are read the same way whatever locale the host has set.
std::istringstream ClassicStream(const std::string& text) {
  std::istringstream in(text);
  in.imbue(std::locale::classic());
  return in;
}

struct CubeHeader {
  std::string title;
  float min[3] = {0.0f, 0.0f, 0.0f};
  float max[3] = {1.0f, 1.0f, 1.0f};
  int size = 0;  // 0 until a LUT_3D_SIZE line is taken
};

// A ".CUBE" header, up to and not including the first table row, which is put back for the row
// loop. The header is judged as a whole only once that row was met, and then the row is blamed.
void ReadCubeHeader(std::ifstream& in, char terminator, int maxSize, int32_t* status,
                    LineCursor* at, CubeHeader* header) {
  bool sawTitle = false, sawMin = false, sawMax = false, sawSize = false;
  LineCursor row;
  while (*status == 0) {
    const std::streampos start = in.tellg();
    const LineCursor before = *at;
    const std::string line = NextLine(in, terminator, status, at);
    if (*status != 0) break;
    std::istringstream words = ClassicStream(line);
    std::string word;
    words >> word;
    if (IsNumericWord(word)) {
      // The first table row: read again by the row loop, which counts its lines again.
      in.seekg(start);
      row = *at;
      *at = before;
      break;
    }
    // A failed extraction reports 10 before any check of the value it should have produced.
    if (word == "TITLE" && !sawTitle) {
      sawTitle = true;
      char quote = 0;
      if (!(words >> quote)) {
        *status = 10;
      } else if (quote != '"') {
        *status = 21;
      } else if (!std::getline(words, header->title, '"')) {
        *status = 10;
      }
    } else if (word == "DOMAIN_MIN" && !sawMin) {
      sawMin = true;
      if (!(words >> header->min[0] >> header->min[1] >> header->min[2])) *status = 10;
    } else if (word == "DOMAIN_MAX" && !sawMax) {
      sawMax = true;
      if (!(words >> header->max[0] >> header->max[1] >> header->max[2])) *status = 10;
    } else if (word == "LUT_3D_SIZE" && !sawSize) {
      sawSize = true;
      int n = 0;
      if (!(words >> n)) {
        *status = 10;
      } else if (n < 2 || n > maxSize) {
        // A refused size is never stored.
        *status = 23;
      } else {
        header->size = n;
      }
    } else {
      *status = 20;
    }
  }
  if (*status != 0) return;
  if (!sawSize) {
    *status = 23;
  } else {
    for (int c = 0; c < 3; ++c) {
      if (!(header->max[c] > header->min[c])) *status = 22;
    }
  }
  if (*status != 0) *at = row;
}

// The n^3 table rows, red fastest, each scaled by `scale`; point(i, j, k) says where the point
// for red index i, green j and blue k goes. A component that fails to convert keeps the previous
// row's value, 0 before the first row.
template <class Point>
void ReadCubeRows(std::ifstream& in, char terminator, int n, const float scale[3], int32_t* status,
                  LineCursor* at, Point point) {
  float x = 0.0f, y = 0.0f, z = 0.0f;
  for (int k = 0; *status == 0 && k < n; ++k) {
    for (int j = 0; *status == 0 && j < n; ++j) {
      for (int i = 0; *status == 0 && i < n; ++i) {
        const std::string line = NextLine(in, terminator, status, at);
        if (*status != 0) break;
        std::sscanf(line.c_str(), "%f %f %f", &x, &y, &z);
        if (!StoreFinite(point(i, j, k), x * scale[0], y * scale[1], z * scale[2])) *status = 24;
      }
    }
  }
}

// Deliberately only the domain's width: the minimum is not subtracted.
void DomainScale(const float min[3], const float max[3], float scale[3]) {
  for (int c = 0; c < 3; ++c) scale[c] = (max[c] - min[c]) * 255.0f;
}

}  // namespace

void tfx::WideToUtf8Path(const std::wstring& wide, char* out) {
  std::string utf8;
  for (const wchar_t& c : wide) {
    const size_t before = utf8.size();
    tfx::host::AppendUtf8(utf8, &c, 1);
    if (utf8.size() > kLutPathMaxBytes) {
      utf8.resize(before);
      break;
    }
  }
  std::memcpy(out, utf8.data(), utf8.size());
}

std::string convertFloat2String(float v) {
  std::ostringstream out;
  out.imbue(std::locale::classic());
  out << std::fixed << std::setprecision(8) << v;
  return out.str();
}

bool CubeLut::loadFile(const wchar_t* path) {
  if (!path) return false;
  const std::wstring wide(path);
  const size_t dot = wide.rfind(L'.');
  if (dot == std::wstring::npos) return false;
  std::wstring extension = wide.substr(dot);
  for (wchar_t& c : extension) {
    // toupper is defined only for values an unsigned char can hold; wider characters cannot be
    // part of ".3DL" or ".CUBE" anyway and stay as they are.
    if (c >= 0 && c <= UCHAR_MAX) c = static_cast<wchar_t>(std::toupper(static_cast<int>(c)));
  }
  char utf8[tfx::kLutPathBufferBytes] = {};
  tfx::WideToUtf8Path(wide, utf8);

  std::ifstream in(utf8, std::ios::in | std::ios::binary);
  if (!in.is_open()) return false;
  int result;
  if (extension == L".3DL") {
    result = load3DlFile(in);
  } else if (extension == L".CUBE") {
    result = loadCubeFile(in);
  } else {
    return false;
  }
  in.close();
  return result == 0;
}

std::string CubeLut::readLine(std::ifstream& in, char terminator) {
  return NextLine(in, terminator, &status_, nullptr);
}

void CubeLut::splitString(const std::string& line, std::vector<std::string>& out) {
  if (line.empty()) return;
  size_t start = 0;
  for (;;) {
    const size_t space = line.find(' ', start);
    if (space == std::string::npos) {
      out.push_back(line.substr(start));
      return;
    }
    out.push_back(line.substr(start, space - start));
    start = space + 1;
  }
}

std::vector<float> CubeLut::parseTableRow(const std::string& line) {
  std::vector<float> values(3, 0.0f);
  std::istringstream in = ClassicStream(line);
  for (float& value : values) {
    float read;
    if (!(in >> read)) {
      status_ = 24;
      break;
    }
    value = read;
  }
  return values;
}

void CubeLut::beginRead() {
  status_ = 0;
  title_.clear();
  for (int c = 0; c < 3; ++c) {
    domainMin_[c] = 0.0f;
    domainMax_[c] = 1.0f;
  }
  std::memset(lattice_, 0, sizeof lattice_);
}

int CubeLut::load3DlFile(std::ifstream& in) { return load3DlFileWithStop(in, nullptr); }

int CubeLut::load3DlFileWithStop(std::ifstream& in, Stop* stop) {
  beginRead();
  LineCursor at;
  char terminator;
  if (!DetectTerminator(in, &terminator, &at)) status_ = 13;

  while (status_ == 0) {
    const std::string line = NextLine(in, terminator, &status_, &at);
    if (status_ != 0) break;
    std::istringstream words = ClassicStream(line);
    std::string word;
    // The mesh keyword is looked for in every header line, so a line of blanks alone, which has
    // no first word to extract, is a failed read.
    if (!(words >> word)) {
      status_ = 10;
      break;
    }
    if (word == "3DMESH" || word == "Mesh") continue;
    if (IsNumericWord(word)) {
      // The input range: one piece per lattice point. Empty pieces from doubled or trailing
      // blanks count, and the lattice holds no more than kMaxSize.
      const size_t pieces = CountPieces(line);
      if (pieces < 3) {
        status_ = 24;
      } else if (pieces > static_cast<size_t>(kMaxSize)) {
        status_ = 23;
      } else {
        size_ = static_cast<int32_t>(pieces);
      }
      break;
    }
  }

  pointCount_ = size_ * size_ * size_;
  allocateAtlas();
  if (status_ == 0) buildTables();

  // A component that fails to convert keeps the previous row's value; before the first row
  // that value is 0.
  float x = 0.0f, y = 0.0f, z = 0.0f;
  const int n = size_;
  for (int i = 0; status_ == 0 && i < n; ++i) {
    for (int j = 0; status_ == 0 && j < n; ++j) {
      for (int k = 0; status_ == 0 && k < n; ++k) {
        const std::string line = NextLine(in, terminator, &status_, &at);
        if (status_ != 0) break;
        std::sscanf(line.c_str(), "%f %f %f", &x, &y, &z);
        // Single precision: divided by the 12-bit maximum, then scaled to 0..255.
        if (!StoreFinite(lattice_[i][j][k], x / kDepth3dlMax * 255.0f, y / kDepth3dlMax * 255.0f,
                         z / kDepth3dlMax * 255.0f)) {
          status_ = 24;
        }
      }
    }
  }
  Report(status_, at, kMaxSize, stop);
  return status_;
}

int CubeLut::loadCubeFile(std::ifstream& in) { return loadCubeFileWithStop(in, nullptr); }

int CubeLut::loadCubeFileWithStop(std::ifstream& in, Stop* stop) {
  beginRead();
  LineCursor at;
  char terminator;
  if (!DetectTerminator(in, &terminator, &at)) status_ = 13;

  CubeHeader header;
  if (status_ == 0) ReadCubeHeader(in, terminator, kMaxSize, &status_, &at, &header);
  title_ = header.title;
  for (int c = 0; c < 3; ++c) {
    domainMin_[c] = header.min[c];
    domainMax_[c] = header.max[c];
  }
  if (header.size != 0) size_ = header.size;

  pointCount_ = size_ * size_ * size_;
  allocateAtlas();

  const int n = size_;
  if (rowTable_) {
    // The raw rows go to the attached table unscaled, and the lattice stays zeroed.
    for (int row = 0; status_ == 0 && row < n; ++row) {
      const std::string line = NextLine(in, terminator, &status_, &at);
      if (status_ != 0) break;
      const std::vector<float> values = parseTableRow(line);
      for (int c = 0; c < 3; ++c) rowTable_[row][c] = values[c];
    }
  } else {
    if (status_ == 0) buildTables();
    float scale[3];
    DomainScale(domainMin_, domainMax_, scale);
    ReadCubeRows(in, terminator, n, scale, &status_, &at,
                 [this](int i, int j, int k) { return lattice_[i][j][k]; });
  }
  Report(status_, at, kMaxSize, stop);
  return status_;
}

int CubeLut::loadCubeLattice(std::ifstream& in, std::vector<float>* points, int* size, Stop* stop) {
  int32_t status = 0;
  LineCursor at;
  char terminator;
  if (!DetectTerminator(in, &terminator, &at)) status = 13;
  CubeHeader header;
  if (status == 0) ReadCubeHeader(in, terminator, kMaxFileSize, &status, &at, &header);
  const int n = status == 0 ? header.size : 0;

  // Rows are kept in file order as they arrive, so that memory follows the input rather than a
  // size the header merely claims, and are put in lattice order once all are in.
  points->clear();
  float scale[3];
  DomainScale(header.min, header.max, scale);
  ReadCubeRows(in, terminator, n, scale, &status, &at, [points](int, int, int) {
    points->resize(points->size() + 3);
    return points->data() + points->size() - 3;
  });
  if (status == 0) {
    // File order has red fastest and blue slowest; lattice order the reverse. Swapping the red
    // and blue indices of every point pairs them up.
    const auto at3 = [n](int a, int b, int c) {
      return ((static_cast<size_t>(a) * n + b) * n + c) * 3;
    };
    for (int k = 0; k < n; ++k) {
      for (int j = 0; j < n; ++j) {
        for (int i = 0; i < k; ++i) {
          std::swap_ranges(points->begin() + at3(k, j, i), points->begin() + at3(k, j, i) + 3,
                           points->begin() + at3(i, j, k));
        }
      }
    }
  } else {
    points->clear();
  }
  *size = status == 0 ? n : 0;
  Report(status, at, kMaxFileSize, stop);
  return status;
}

const char* CubeLut::statusText(int status) {
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

std::string CubeLut::stopMessage(const std::string& file, const Stop& stop) {
  constexpr size_t kShown = 60;  // bytes of the line a message quotes
  std::string message = file;
  if (stop.line > 0) {
    std::string shown;
    for (size_t i = 0; i < stop.text.size() && i < kShown; ++i) {
      const unsigned char c = static_cast<unsigned char>(stop.text[i]);
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
    if (stop.text.size() > kShown) shown += "...";
    message += ", line " + std::to_string(stop.line) + " (\"" + shown + "\")";
  }
  // Status 23 names the limit of the reader that gave it.
  const std::string meaning =
      stop.status == 23 ? "the size is missing or outside 2.." + std::to_string(stop.sizeLimit)
                        : statusText(stop.status);
  return message + ": status " + std::to_string(stop.status) + ", " + meaning;
}

bool CubeLut::writeLUT3D2File(const char* path) {
  if (!path) {
    std::puts("Path cannot be NULL!");
    return false;
  }
  std::FILE* file = std::fopen(path, "wt+");
  if (!file) {
    std::puts("Cannot open the path file!");
    return false;
  }
  std::fputs("#LUT size\n", file);
  std::fprintf(file, "%s%d%s", "LUT_3D_SIZE ", size_, "\n\n");
  std::fputs("#data domain\n", file);
  std::fputs("DOMAIN_MIN 0.0 0.0 0.0\n", file);
  std::fputs("DOMAIN_MAX 1.0 1.0 1.0\n\n", file);
  std::fputs("#LUT data points\n", file);

  const int n = size_;
  for (int k = 0; k < n; ++k) {
    for (int j = 0; j < n; ++j) {
      for (int i = 0; i < n; ++i) {
        // Single precision, as the lattice is.
        const float* p = lattice_[i][j][k];
        const std::string row = convertFloat2String(p[0] / 255.0f) + " " +
                                convertFloat2String(p[1] / 255.0f) + " " +
                                convertFloat2String(p[2] / 255.0f) + "\n";
        std::fputs(row.c_str(), file);
      }
    }
  }
  std::fclose(file);
  return true;
}
