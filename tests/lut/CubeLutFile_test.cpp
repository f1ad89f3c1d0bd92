#include "lut/CubeLutFile.h"

#include <gtest/gtest.h>
#include <stdlib.h>

#include <algorithm>
#include <cmath>
#include <cstdio>
#include <cstring>
#include <filesystem>
#include <fstream>
#include <memory>
#include <random>
#include <string>
#include <vector>

#include "tessarofx/CubeLut.h"

namespace {

namespace fs = std::filesystem;

// A fresh directory for one test's files, removed with everything in it.
class TempDir {
 public:
  TempDir() {
    std::string pattern = (fs::temp_directory_path() / "tfx-lut-XXXXXX").string();
    if (mkdtemp(pattern.data())) path_ = pattern;
  }
  ~TempDir() {
    std::error_code ignored;
    if (!path_.empty()) fs::remove_all(path_, ignored);
  }
  const std::string& path() const { return path_; }
  // Writes `bytes` to `name` inside the directory and returns the full path.
  std::string Write(const std::string& name, const std::string& bytes) const {
    const std::string full = path_ + "/" + name;
    std::ofstream(full, std::ios::binary) << bytes;
    return full;
  }

 private:
  std::string path_;
};

// Test paths are ASCII apart from the cases that build their wide path themselves.
std::wstring Wide(const std::string& ascii) { return std::wstring(ascii.begin(), ascii.end()); }

// `text` without its last line.
std::string WithoutLastLine(const std::string& text) {
  return text.substr(0, text.rfind('\n', text.size() - 2) + 1);
}

std::string Replace(std::string text, const std::string& from, const std::string& to) {
  const size_t at = text.find(from);
  if (at != std::string::npos) text.replace(at, from.size(), to);
  return text;
}

std::string ReplaceAll(std::string text, const std::string& from, const std::string& to) {
  for (size_t at = 0; (at = text.find(from, at)) != std::string::npos; at += to.size()) {
    text.replace(at, from.size(), to);
  }
  return text;
}

std::unique_ptr<CubeLut> Load(const TempDir& dir, const std::string& name, const std::string& bytes,
                              bool* loaded = nullptr) {
  auto lut = std::make_unique<CubeLut>();
  const bool ok = lut->loadFile(Wide(dir.Write(name, bytes)).c_str());
  if (loaded) *loaded = ok;
  return lut;
}

float* Point(CubeLut& lut, int i, int j, int k) {
  return lut.getLut3DData(nullptr, nullptr, nullptr, nullptr) + ((i * 64 + j) * 64 + k) * 3;
}

// Whatever a read did, the size is one the lattice holds and the atlas matches it.
void ExpectBounded(const CubeLut& lut) {
  const int n = lut.getLutSize();
  EXPECT_GE(n, 0);
  EXPECT_LE(n, CubeLut::kMaxSize);
  int bytes = -1;
  lut.getAtlasData(&bytes);
  EXPECT_EQ(bytes, 8 * n * ((n + 7) / 8) * n * 3);
}

// Sample values are sixteenths, exact as text and as floats. Row r is the r-th data line.
float Sixteenth(int r, int c) { return static_cast<float>((r * 3 + c * 5) % 17) / 16.0f; }

std::string CubeRows(int n) {
  std::string rows;
  for (int r = 0; r < n * n * n; ++r) {
    char line[64];
    std::snprintf(line, sizeof line, "%g %g %g\n", Sixteenth(r, 0), Sixteenth(r, 1),
                  Sixteenth(r, 2));
    rows += line;
  }
  return rows;
}

const std::string kCubeHeader =
    "# sample\nTITLE \"Sample\"\nDOMAIN_MIN 0.0 0.0 0.0\nDOMAIN_MAX 1.0 1.0 1.0\n"
    "LUT_3D_SIZE 2\n\n";
const std::string kCube = kCubeHeader + CubeRows(2);

// Twelve-bit sample values; row r is the r-th data line.
int Twelve(int r, int c) { return ((r * 3 + c) * 151) % 4096; }

std::string DlRows(int n) {
  std::string rows;
  for (int r = 0; r < n * n * n; ++r) {
    rows += std::to_string(Twelve(r, 0)) + " " + std::to_string(Twelve(r, 1)) + " " +
            std::to_string(Twelve(r, 2)) + "\n";
  }
  return rows;
}

const std::string kDl = "3DMESH\nMesh 0 12\n0 2047 4095\n" + DlRows(3);

void ExpectCubeSample(CubeLut& lut, float width = 1.0f) {
  ASSERT_EQ(lut.getLutSize(), 2);
  for (int k = 0, r = 0; k < 2; ++k) {
    for (int j = 0; j < 2; ++j) {
      for (int i = 0; i < 2; ++i, ++r) {
        for (int c = 0; c < 3; ++c) {
          ASSERT_EQ(Point(lut, i, j, k)[c], Sixteenth(r, c) * (width * 255.0f)) << i << j << k << c;
        }
      }
    }
  }
}

void ExpectDlSample(CubeLut& lut, int n) {
  ASSERT_EQ(lut.getLutSize(), n);
  for (int i = 0, r = 0; i < n; ++i) {
    for (int j = 0; j < n; ++j) {
      for (int k = 0; k < n; ++k, ++r) {
        for (int c = 0; c < 3; ++c) {
          ASSERT_EQ(Point(lut, i, j, k)[c], static_cast<float>(Twelve(r, c)) / 4095.0f * 255.0f)
              << i << j << k << c;
        }
      }
    }
  }
}

struct Mutation {
  const char* name;
  std::string bytes;
  int status;
};

TEST(CubeLutFile, CubeMutations) {
  const std::string truncated = WithoutLastLine(kCube);
  const Mutation cases[] = {
      {"valid", kCube, 0},
      {"two titles", Replace(kCube, "TITLE \"Sample\"\n", "TITLE \"Sample\"\nTITLE \"B\"\n"), 20},
      {"1-D size", Replace(kCube, "LUT_3D_SIZE 2\n", "LUT_1D_SIZE 2\nLUT_3D_SIZE 2\n"), 20},
      {"input range", Replace(kCube, "\n\n", "\nLUT_3D_INPUT_RANGE 0 1\n\n"), 20},
      {"repeated size", Replace(kCube, "LUT_3D_SIZE 2\n", "LUT_3D_SIZE 2\nLUT_3D_SIZE 2\n"), 20},
      {"indented comment", Replace(kCube, "# sample", "  # sample"), 20},
      {"blank line of spaces", Replace(kCube, "\n\n", "\n   \n"), 20},
      {"size 1", Replace(kCube, "LUT_3D_SIZE 2", "LUT_3D_SIZE 1"), 23},
      {"size 65", Replace(kCube, "LUT_3D_SIZE 2", "LUT_3D_SIZE 65"), 23},
      {"size 256", Replace(kCube, "LUT_3D_SIZE 2", "LUT_3D_SIZE 256"), 23},
      {"size -3", Replace(kCube, "LUT_3D_SIZE 2", "LUT_3D_SIZE -3"), 23},
      {"no size", Replace(kCube, "LUT_3D_SIZE 2\n", ""), 23},
      {"size not a number", Replace(kCube, "LUT_3D_SIZE 2", "LUT_3D_SIZE two"), 10},
      {"size past int", Replace(kCube, "LUT_3D_SIZE 2", "LUT_3D_SIZE 4294967298"), 10},
      {"max 1 1 0", Replace(kCube, "DOMAIN_MAX 1.0 1.0 1.0", "DOMAIN_MAX 1 1 0"), 22},
      {"max equal to min", Replace(kCube, "DOMAIN_MIN 0.0 0.0 0.0", "DOMAIN_MIN 0 1 0"), 22},
      {"two domain values", Replace(kCube, "DOMAIN_MIN 0.0 0.0 0.0", "DOMAIN_MIN 0 0"), 10},
      {"domain past float", Replace(kCube, "DOMAIN_MAX 1.0", "DOMAIN_MAX 1e39"), 10},
      {"title without quote", Replace(kCube, "TITLE \"Sample\"", "TITLE Sample"), 21},
      {"title alone", Replace(kCube, "TITLE \"Sample\"", "TITLE"), 10},
      {"title quote alone", Replace(kCube, "TITLE \"Sample\"", "TITLE \""), 10},
      {"truncated, terminated", truncated, 10},
      {"truncated, unterminated", truncated.substr(0, truncated.size() - 1), 12},
      {"last line unterminated", kCube.substr(0, kCube.size() - 1), 0},
      {"junk after the table", kCube + "junk\n\x01\xff\n", 0},
      {"number past float", truncated + "1e39 0 0\n", 24},
      {"past float once scaled", truncated + "0 3e37 0\n", 24},
      {"inf", truncated + "0 inf 0\n", 24},
      {"nan", truncated + "0 0 nan\n", 24},
      {"header only", kCubeHeader, 10},
      {"empty", "", 10},
      {"line of 251 then LF", std::string(251, '#') + "\n" + kCube, 0},
      {"line of 251 then CR-LF", std::string(251, '#') + "\r\n" + ReplaceAll(kCube, "\n", "\r\n"),
       0},
      {"line of 252", std::string(252, '#') + "\n" + kCube, 13},
      {"no terminator at all", std::string(300, ' '), 13},
  };
  TempDir dir;
  for (const Mutation& m : cases) {
    SCOPED_TRACE(m.name);
    bool loaded = false;
    const auto lut = Load(dir, "case.cube", m.bytes, &loaded);
    EXPECT_EQ(lut->getStatus(), m.status);
    EXPECT_EQ(loaded, m.status == 0);
    ExpectBounded(*lut);
    if (m.status == 0) ExpectCubeSample(*lut);
  }
}

TEST(CubeLutFile, CubeLineEndsAndValues) {
  TempDir dir;
  const Mutation cases[] = {
      {"LF", kCube, 0},
      {"CR-LF", ReplaceAll(kCube, "\n", "\r\n"), 0},
      {"CR-LF, bare CR lines", ReplaceAll(kCube, "\n", "\r\n\r\n"), 0},
      {"CR only", ReplaceAll(kCube, "\n", "\r"), 0},
      {"CR only, unterminated", ReplaceAll(kCube.substr(0, kCube.size() - 1), "\n", "\r"), 0},
  };
  for (const Mutation& m : cases) {
    SCOPED_TRACE(m.name);
    bool loaded = false;
    const auto lut = Load(dir, "grade.cube", m.bytes, &loaded);
    EXPECT_TRUE(loaded);
    EXPECT_STREQ(lut->getTitle(), "Sample");
    ExpectCubeSample(*lut);
  }

  // The domain's width scales, its minimum is not subtracted.
  const auto narrow =
      Load(dir, "narrow.cube", Replace(kCube, "DOMAIN_MIN 0.0 0.0 0.0", "DOMAIN_MIN 0.5 0.5 0.5"));
  ASSERT_EQ(narrow->getStatus(), 0);
  ExpectCubeSample(*narrow, 0.5f);
  float lo[3], hi[3];
  narrow->getDomain(lo, hi);
  EXPECT_EQ(lo[1], 0.5f);
  EXPECT_EQ(hi[1], 1.0f);
  // The next read starts from the default domain again.
  ASSERT_TRUE(narrow->loadFile(Wide(dir.Write("plain.cube", kCube)).c_str()));
  narrow->getDomain(lo, hi);
  EXPECT_EQ(lo[0], 0.0f);
  ExpectCubeSample(*narrow);

  // A short row keeps the components it lacks from the row before; the first row from 0.
  std::string rows = kCubeHeader + "0.5\n" + "0.25 0.75\n" + "1e20 -1e20 0\n" +
                     "99999999999999999999 1 1\n" + CubeRows(2);
  const auto shortRows = Load(dir, "short.cube", rows);
  ASSERT_EQ(shortRows->getStatus(), 0);
  const float* p = Point(*shortRows, 0, 0, 0);
  EXPECT_EQ(p[0], 0.5f * 255.0f);
  EXPECT_EQ(p[1], 0.0f);
  EXPECT_EQ(p[2], 0.0f);
  p = Point(*shortRows, 1, 0, 0);
  EXPECT_EQ(p[0], 0.25f * 255.0f);
  EXPECT_EQ(p[1], 0.75f * 255.0f);
  EXPECT_EQ(p[2], 0.0f);
  p = Point(*shortRows, 0, 1, 0);
  EXPECT_EQ(p[0], 1e20f * 255.0f);
  EXPECT_EQ(p[1], -1e20f * 255.0f);
  EXPECT_EQ(Point(*shortRows, 1, 1, 0)[0], 1e20f * 255.0f);
}

TEST(CubeLutFile, DlMutations) {
  const std::string range17 = "0 64 128 192 256 320 384 448 512 576 640 704 768 832 896 960 1023\n";
  const std::string truncated = WithoutLastLine(kDl);
  std::string range65 = "0";
  for (int i = 1; i < 65; ++i) range65 += " " + std::to_string(i);
  const Mutation cases[] = {
      {"valid", kDl, 0},
      {"CR-LF", ReplaceAll(kDl, "\n", "\r\n"), 0},
      {"CR only", ReplaceAll(kDl, "\n", "\r"), 0},
      {"text and keywords skipped", "# note\nsome words\n+ alone\nMesh 4 12\n" + kDl, 0},
      {"last line unterminated", kDl.substr(0, kDl.size() - 1), 0},
      {"range with trailing space", Replace(kDl, "0 2047 4095", "0 2047 4095 "), 10},
      {"range with double space", Replace(kDl, "0 2047 4095", "0  2047 4095"), 10},
      {"range of two", Replace(kDl, "0 2047 4095", "0 4095"), 24},
      {"range of 65", Replace(kDl, "0 2047 4095", range65), 23},
      {"blank header line", Replace(kDl, "3DMESH\n", "3DMESH\n  \n"), 10},
      {"truncated, terminated", truncated, 10},
      {"truncated, unterminated", truncated.substr(0, truncated.size() - 1), 12},
      {"no range line", "3DMESH\nMesh 0 12\n", 10},
      {"number past float", truncated + "1e39 0 0\n", 24},
      {"empty", "", 10},
      {"line of 252", std::string(252, 'x') + "\n" + kDl, 13},
  };
  TempDir dir;
  for (const Mutation& m : cases) {
    SCOPED_TRACE(m.name);
    bool loaded = false;
    const auto lut = Load(dir, "case.3dl", m.bytes, &loaded);
    EXPECT_EQ(lut->getStatus(), m.status);
    EXPECT_EQ(loaded, m.status == 0);
    ExpectBounded(*lut);
    if (m.status == 0) ExpectDlSample(*lut, 3);
  }
  // The trailing blank is one more lattice point, whatever the data holds.
  EXPECT_EQ(Load(dir, "a.3dl", Replace(kDl, "0 2047 4095", "0 2047 4095 "))->getLutSize(), 4);

  // Seventeen range values make N = 17, and 4095 is full scale whatever the range's top.
  const auto lut17 = Load(dir, "17.3dl", range17 + DlRows(17));
  ASSERT_EQ(lut17->getStatus(), 0);
  ExpectDlSample(*lut17, 17);
  const auto full = Load(dir, "full.3dl", range17 + WithoutLastLine(DlRows(17)) + "4095 4095 4095");
  ASSERT_EQ(full->getStatus(), 0);
  for (int c = 0; c < 3; ++c) EXPECT_EQ(Point(*full, 16, 16, 16)[c], 255.0f);

  const auto white =
      Load(dir, "white.3dl",
           "0 1 2\n4095 4095 4095\n1e30 -1e30 1e20\n" + std::string("2047\n") + DlRows(3));
  ASSERT_EQ(white->getStatus(), 0);
  EXPECT_EQ(Point(*white, 0, 0, 0)[0], 255.0f);
  EXPECT_EQ(Point(*white, 0, 0, 1)[0], 1e30f / 4095.0f * 255.0f);
  EXPECT_EQ(Point(*white, 0, 0, 1)[1], -1e30f / 4095.0f * 255.0f);
  EXPECT_EQ(Point(*white, 0, 0, 1)[2], 1e20f / 4095.0f * 255.0f);
  // A lone number keeps the other two components of the row before.
  EXPECT_EQ(Point(*white, 0, 0, 2)[0], 2047.0f / 4095.0f * 255.0f);
  EXPECT_EQ(Point(*white, 0, 0, 2)[2], 1e20f / 4095.0f * 255.0f);
  // ...and on the first row those are 0.
  const auto first = Load(dir, "first.3dl", "0 1 2\n2047\n" + DlRows(3));
  ASSERT_EQ(first->getStatus(), 0);
  EXPECT_EQ(Point(*first, 0, 0, 0)[1], 0.0f);
  EXPECT_EQ(Point(*first, 0, 0, 0)[2], 0.0f);
}

TEST(CubeLutFile, FailedReadKeepsRowsReadSoFar) {
  TempDir dir;
  const auto lut = Load(dir, "grade.cube", WithoutLastLine(kCube));
  EXPECT_EQ(lut->getStatus(), 10);
  EXPECT_EQ(Point(*lut, 1, 0, 0)[1], Sixteenth(1, 1) * 255.0f);
  EXPECT_EQ(Point(*lut, 1, 1, 1)[0], 0.0f);
  EXPECT_STREQ(lut->getTitle(), "Sample");

  // A refused size leaves the one held before, and the lattice zeroed.
  ASSERT_TRUE(lut->loadFile(Wide(dir.Write("ok.cube", kCube)).c_str()));
  EXPECT_FALSE(lut->loadFile(
      Wide(dir.Write("big.cube", Replace(kCube, "LUT_3D_SIZE 2", "LUT_3D_SIZE 200"))).c_str()));
  EXPECT_EQ(lut->getLutSize(), 2);
  EXPECT_EQ(Point(*lut, 1, 0, 0)[1], 0.0f);
  ExpectBounded(*lut);
}

TEST(CubeLutFile, RowTableTakesTheFirstRowsUnscaled) {
  TempDir dir;
  CubeLut lut;
  lut.setRowTable(new float[CubeLut::kMaxSize][3]());
  const std::string narrow = Replace(kCube, "DOMAIN_MIN 0.0 0.0 0.0", "DOMAIN_MIN 0.5 0.5 0.5");
  ASSERT_TRUE(lut.loadFile(Wide(dir.Write("rows.cube", narrow)).c_str()));
  for (int r = 0; r < 2; ++r) {
    for (int c = 0; c < 3; ++c) EXPECT_EQ(lut.getRowTable()[r][c], Sixteenth(r, c));
  }
  EXPECT_EQ(lut.getRowTable()[2][0], 0.0f);
  EXPECT_EQ(Point(lut, 1, 0, 0)[0], 0.0f);

  const std::string shortRow = Replace(kCube, "\n\n", "\n\n0.5 0.25\n");
  EXPECT_FALSE(lut.loadFile(Wide(dir.Write("short.cube", shortRow)).c_str()));
  EXPECT_EQ(lut.getStatus(), 24);
  EXPECT_EQ(lut.getRowTable()[0][1], 0.25f);
  EXPECT_EQ(lut.getRowTable()[0][2], 0.0f);
}

TEST(CubeLutFile, SplitAndParse) {
  CubeLut lut;
  std::vector<std::string> pieces;
  lut.splitString("", pieces);
  EXPECT_TRUE(pieces.empty());
  lut.splitString(" a  b ", pieces);
  EXPECT_EQ(pieces, (std::vector<std::string>{"", "a", "", "b", ""}));

  EXPECT_EQ(lut.parseTableRow("0.5 -2 1e3 9"), (std::vector<float>{0.5f, -2.0f, 1000.0f}));
  EXPECT_EQ(lut.getStatus(), 1);
  EXPECT_EQ(lut.parseTableRow("0.5 x 3"), (std::vector<float>{0.5f, 0.0f, 0.0f}));
  EXPECT_EQ(lut.getStatus(), 24);
}

TEST(CubeLutFile, ExtensionPicksTheReader) {
  struct Case {
    const char* name;
    const std::string* bytes;
    bool loads;
  };
  const Case cases[] = {
      {"grade.cube", &kCube, true},   {"grade.Cube", &kCube, true},
      {"grade.CUBE", &kCube, true},   {"grade.3dl", &kDl, true},
      {"grade.3Dl", &kDl, true},      {"grade", &kCube, false},
      {"a.3dl.bak", &kDl, false},     {"grade.cub", &kCube, false},
      {"grade.cube ", &kCube, false}, {"grade.3dl.cube", &kCube, true},
      {"grade.cube.3dl", &kDl, true}, {"cube", &kCube, false},
  };
  TempDir dir;
  for (const Case& c : cases) {
    SCOPED_TRACE(c.name);
    bool loaded = false;
    const auto lut = Load(dir, c.name, *c.bytes, &loaded);
    EXPECT_EQ(loaded, c.loads);
    // Neither reader runs on a refused name: the status is still the constructor's.
    EXPECT_EQ(lut->getStatus(), c.loads ? 0 : 1);
  }
  CubeLut lut;
  EXPECT_FALSE(lut.loadFile(nullptr));
  EXPECT_FALSE(lut.loadFile(Wide(dir.path() + "/missing.cube").c_str()));
  // The wrong reader fails on the other format.
  EXPECT_FALSE(lut.loadFile(Wide(dir.Write("swapped.3dl", kCube)).c_str()));
}

TEST(CubeLutFile, WidePathsBecomeUtf8) {
  TempDir dir;
  CubeLut lut;
  dir.Write("F\xC3\xA4rg \xE3\x82\xB0\xF0\x9F\x98\x80.Cube", kCube);
  EXPECT_TRUE(lut.loadFile((Wide(dir.path()) + L"/F\u00e4rg \u30b0\U0001F600.Cube").c_str()));
  // A wide extension character is left alone by the upper-casing.
  dir.Write("grade.\xD1\x81ube", kCube);
  EXPECT_FALSE(lut.loadFile((Wide(dir.path()) + L"/grade.\u0441ube").c_str()));

  const auto convert = [](const std::wstring& wide) {
    std::vector<char> out(tfx::kLutPathBufferBytes, 0);
    tfx::WideToUtf8Path(wide, out.data());
    EXPECT_TRUE(
        std::all_of(out.begin() + tfx::kLutPathMaxBytes, out.end(), [](char c) { return c == 0; }));
    return std::string(out.data());
  };
  EXPECT_EQ(convert(L"a\u00e9\u20ac\U0001F600"), "a\xC3\xA9\xE2\x82\xAC\xF0\x9F\x98\x80");
  EXPECT_EQ(convert(std::wstring{wchar_t(0x110000), wchar_t(-1), wchar_t(0x10FFFF)}),
            "\xEF\xBF\xBD\xEF\xBF\xBD\xF4\x8F\xBF\xBF");
  // Stops before a character that would not fit whole.
  EXPECT_EQ(convert(std::wstring(2045, L'a') + L"\u00e9").size(), 2047u);
  EXPECT_EQ(convert(std::wstring(2046, L'a') + L"\u00e9").size(), 2046u);
  EXPECT_EQ(convert(std::wstring(2044, L'a') + L"\U0001F600").size(), 2044u);
  EXPECT_EQ(convert(std::wstring(3000, L'a')).size(), 2047u);

  // Through loadFile: a 2047-byte path opens, one more byte cuts the name.
  const std::string tail = "/grade.cube";
  dir.Write("grade.cube", kCube);
  const size_t slashes = 2047 - dir.path().size() - tail.size();
  const std::string fits = dir.path() + std::string(slashes, '/') + tail;
  ASSERT_EQ(fits.size(), 2047u);
  EXPECT_TRUE(lut.loadFile(Wide(fits).c_str()));
  EXPECT_FALSE(lut.loadFile(Wide("/" + fits).c_str()));
}

// What a caller holding the stream does to name the physical line where reading stopped: clear
// the flags, take the position, and find the line that holds the last byte consumed, counting
// the terminator the readers detect ('\n' unless the first line break is a lone '\r').
int StoppedAtLine(std::ifstream& in, const std::string& bytes) {
  in.clear();
  const std::streamoff pos = in.tellg();
  const size_t brk = bytes.find_first_of("\r\n");
  const char term =
      brk != std::string::npos && bytes[brk] == '\r' && bytes.compare(brk, 2, "\r\n") != 0 ? '\r'
                                                                                           : '\n';
  const auto end = bytes.begin() + std::max<std::streamoff>(pos - 1, 0);
  return 1 + static_cast<int>(std::count(bytes.begin(), end, term));
}

TEST(CubeLutFile, StreamStopsAtTheLineReadLast) {
  const std::string bad = "# c\n\nTITLE \"x\"\n\nBOGUS 1\nLUT_3D_SIZE 2\n" + CubeRows(2);
  const std::string rows = kCubeHeader + CubeRows(2);
  const int lastRow = static_cast<int>(std::count(rows.begin(), rows.end(), '\n'));
  struct Case {
    const char* name;
    std::string bytes;
    bool cube;
    int status;
    int line;
  };
  const Case cases[] = {
      {"keyword on line 5", bad, true, 20, 5},
      {"keyword on line 5, CR-LF", ReplaceAll(bad, "\n", "\r\n"), true, 20, 5},
      {"keyword on line 5, CR", ReplaceAll(bad, "\n", "\r"), true, 20, 5},
      {"success, extra lines", rows + "junk\njunk\n", true, 0, lastRow},
      {"success, unterminated", rows.substr(0, rows.size() - 1), true, 0, lastRow},
      {"truncated", WithoutLastLine(rows), true, 10, lastRow - 1},
      {"size on line 6", Replace(bad, "BOGUS 1\nLUT_3D_SIZE 2", "\nLUT_3D_SIZE 99"), true, 23, 6},
      {"no line end", std::string(400, 'x'), true, 13, 1},
      {"range of two on line 3", "3DMESH\n\n0 1\n", false, 24, 3},
  };
  TempDir dir;
  for (const Case& c : cases) {
    SCOPED_TRACE(c.name);
    CubeLut lut;
    std::ifstream in(dir.Write("stream", c.bytes), std::ios::binary);
    EXPECT_EQ(c.cube ? lut.loadCubeFile(in) : lut.load3DlFile(in), c.status);
    EXPECT_EQ(StoppedAtLine(in, c.bytes), c.line);
  }
}

TEST(CubeLutFile, HostileBytesStayBounded) {
  std::mt19937 random(20240611u);
  const std::string alphabet = "0123456789 .-+e\n\r#\"TITLE_DOMAINMAXSIZE3D";
  TempDir dir;
  for (int round = 0; round < 300; ++round) {
    std::string bytes(random() % 700, '\0');
    for (char& b : bytes) {
      b = round % 2 ? static_cast<char>(random())
                    : alphabet[random() % static_cast<unsigned>(alphabet.size())];
    }
    if (round % 3 == 0) bytes = (round % 6 ? kDl : kCube).substr(0, random() % 200) + bytes;
    for (const char* name : {"junk.cube", "junk.3dl"}) {
      SCOPED_TRACE(round);
      bool loaded = false;
      const auto lut = Load(dir, name, bytes, &loaded);
      ExpectBounded(*lut);
      uint8_t pixels[4 * 4] = {0, 64, 128, 255, 255, 1, 2, 3, 9, 99, 199, 7, 250, 251, 252, 253};
      if (loaded) {
        EXPECT_EQ(lut->doLUT(pixels, 4, 1, 16, 4), 0);
      }
    }
  }
}

TEST(CubeLutFile, ConvertFloat2String) {
  EXPECT_EQ(convertFloat2String(1.0f), "1.00000000");
  EXPECT_EQ(convertFloat2String(0.5f), "0.50000000");
  EXPECT_EQ(convertFloat2String(0.0f), "0.00000000");
  EXPECT_EQ(convertFloat2String(-0.25f), "-0.25000000");
  EXPECT_EQ(convertFloat2String(1.0f / 3.0f), "0.33333334");  // the float, not the double third
  EXPECT_EQ(convertFloat2String(1e10f), "10000000000.00000000");
}

std::string ReadAll(const std::string& path) {
  std::ifstream in(path, std::ios::binary);
  return std::string(std::istreambuf_iterator<char>(in), {});
}

TEST(CubeLutFile, WriterHeaderAndRows) {
  TempDir dir;
  const std::string header = std::string("#LUT size\nLUT_3D_SIZE 2\n\n#data domain\n") +
                             "DOMAIN_MIN 0.0 0.0 0.0\nDOMAIN_MAX 1.0 1.0 1.0\n\n" +
                             "#LUT data points\n";
  CubeLut lut;
  lut.generateLUT3DData(2);
  const std::string path = dir.path() + "/out.cube";
  ASSERT_TRUE(lut.writeLUT3D2File(path.c_str()));
  const std::string text = ReadAll(path);
  ASSERT_EQ(text.substr(0, header.size()), header);
  // Red fastest: the second row is lattice[1][0][0] = 255/31 red, the last is all 255/31.
  const std::string step = convertFloat2String(255.0f / 31.0f / 255.0f);
  EXPECT_EQ(text.substr(header.size()),
            "0.00000000 0.00000000 0.00000000\n" + step + " 0.00000000 0.00000000\n" +
                "0.00000000 " + step + " 0.00000000\n" + step + " " + step + " 0.00000000\n" +
                "0.00000000 0.00000000 " + step + "\n" + step + " 0.00000000 " + step + "\n" +
                "0.00000000 " + step + " " + step + "\n" + step + " " + step + " " + step + "\n");

  CubeLut empty;
  ASSERT_TRUE(empty.writeLUT3D2File(path.c_str()));
  EXPECT_EQ(ReadAll(path), Replace(header, "LUT_3D_SIZE 2", "LUT_3D_SIZE 0"));

  testing::internal::CaptureStdout();
  EXPECT_FALSE(lut.writeLUT3D2File(nullptr));
  EXPECT_FALSE(lut.writeLUT3D2File((dir.path() + "/no/such/dir.cube").c_str()));
  const std::string said = testing::internal::GetCapturedStdout();
  EXPECT_NE(said.find("Path cannot be NULL!"), std::string::npos);
  EXPECT_NE(said.find("Cannot open the path file!"), std::string::npos);
}

TEST(CubeLutFile, WriteThenLoadGivesTheLatticeBack) {
  TempDir dir;
  std::mt19937 random(77u);
  std::uniform_real_distribution<float> value(0.0f, 255.0f);
  for (const int n : {2, 17, 33, 64}) {
    SCOPED_TRACE(n);
    CubeLut out;
    out.generateLUT3DData(n);
    for (int i = 0; i < n; ++i) {
      for (int j = 0; j < n; ++j) {
        for (int k = 0; k < n; ++k) {
          float* p = Point(out, i, j, k);
          for (int c = 0; c < 3; ++c) p[c] = value(random);
        }
      }
    }
    const std::string path = dir.path() + "/round" + std::to_string(n) + ".cube";
    ASSERT_TRUE(out.writeLUT3D2File(path.c_str()));
    CubeLut in;
    ASSERT_TRUE(in.loadFile(Wide(path).c_str()));
    ASSERT_EQ(in.getLutSize(), n);
    for (int i = 0; i < n; ++i) {
      for (int j = 0; j < n; ++j) {
        for (int k = 0; k < n; ++k) {
          for (int c = 0; c < 3; ++c) {
            const float written = Point(out, i, j, k)[c] / 255.0f;
            const float text = std::strtof(convertFloat2String(written).c_str(), nullptr);
            const float back = Point(in, i, j, k)[c];
            ASSERT_EQ(back, text * 255.0f) << i << " " << j << " " << k;
            ASSERT_NEAR(back / 255.0f, written, 1.5e-7) << i << " " << j << " " << k;
          }
        }
      }
    }
  }
}

}  // namespace
