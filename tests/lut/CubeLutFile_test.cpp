// The ".CUBE" and ".3DL" readers and the ".CUBE" writer: result codes for damaged files, the
// quirks existing files rely on, paths, and where a reader leaves its stream.
#include "lut/CubeLutFile.h"

#include <gtest/gtest.h>

#include <algorithm>
#include <cstdio>
#include <cstdlib>
#include <fstream>
#include <memory>
#include <random>
#include <string>
#include <vector>

#include "support/ImageBuilders.h"
#include "support/TempDir.h"
#include "tessarofx/CubeLut.h"

namespace {

using tfx_test::TempDir;
using tfx_test::Wide;

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

constexpr auto Point = tfx_test::LatticePoint;

// Whatever a read did, the size is one the lattice holds and the atlas matches it.
void ExpectBounded(const CubeLut& lut) {
  const int n = lut.getLutSize();
  EXPECT_GE(n, 0);
  EXPECT_LE(n, CubeLut::kMaxSize);
  int bytes = -1;
  lut.getAtlasData(&bytes);
  EXPECT_EQ(bytes, 8 * n * ((n + 7) / 8) * n * 3);
}

// Sample values of data row r: sixteenths for ".CUBE" (exact as text and as floats), twelve-bit
// integers for ".3DL".
float Sixteenth(int r, int c) { return static_cast<float>((r * 3 + c * 5) % 17) / 16.0f; }
int Twelve(int r, int c) { return ((r * 3 + c) * 151) % 4096; }

std::string Rows(int n, bool dl) {
  std::string rows;
  for (int r = 0; r < n * n * n; ++r) {
    for (int c = 0; c < 3; ++c) {
      char v[32];
      if (dl) {
        std::snprintf(v, sizeof v, "%d%c", Twelve(r, c), c < 2 ? ' ' : '\n');
      } else {
        std::snprintf(v, sizeof v, "%g%c", Sixteenth(r, c), c < 2 ? ' ' : '\n');
      }
      rows += v;
    }
  }
  return rows;
}

const std::string kCubeHeader =
    "# sample\nTITLE \"Sample\"\nDOMAIN_MIN 0.0 0.0 0.0\nDOMAIN_MAX 1.0 1.0 1.0\n"
    "LUT_3D_SIZE 2\n\n";
const std::string kCube = kCubeHeader + Rows(2, false);
const std::string kDl = "3DMESH\nMesh 0 12\n0 2047 4095\n" + Rows(3, true);

// ".CUBE" rows run red fastest, ".3DL" rows blue fastest; a cube's values scale by the domain's
// width, a 3dl's 4095 is full scale.
void ExpectSample(CubeLut& lut, int n, bool dl, float width = 1.0f) {
  ASSERT_EQ(lut.getLutSize(), n);
  for (int i = 0; i < n; ++i) {
    for (int j = 0; j < n; ++j) {
      for (int k = 0; k < n; ++k) {
        for (int c = 0; c < 3; ++c) {
          const int r = dl ? (i * n + j) * n + k : (k * n + j) * n + i;
          const float want = dl ? static_cast<float>(Twelve(r, c)) / 4095.0f * 255.0f
                                : Sixteenth(r, c) * (width * 255.0f);
          ASSERT_EQ(Point(lut, i, j, k)[c], want) << i << j << k << c;
        }
      }
    }
  }
}

struct Mutation {
  const char* name;
  std::string bytes;
  int status;
  int line;  // the physical line where the reader stopped, as a caller holding the stream finds it
};

void ExpectStatuses(const std::vector<Mutation>& cases, const char* file, bool dl) {
  TempDir dir;
  for (const Mutation& m : cases) {
    SCOPED_TRACE(m.name);
    const std::string path = dir.Write(file, m.bytes);
    const auto lut = std::make_unique<CubeLut>();
    std::ifstream in(path, std::ios::binary);
    CubeLut::Stop stop;
    EXPECT_EQ(dl ? lut->load3DlFileWithStop(in, &stop) : lut->loadCubeFileWithStop(in, &stop),
              m.status);
    EXPECT_EQ(lut->getStatus(), m.status);
    EXPECT_EQ(stop.status, m.status);
    EXPECT_EQ(stop.line, m.line);
    ExpectBounded(*lut);
    // The reader of tables up to 256 points follows the same rules to the same line.
    if (!dl && m.bytes.find("LUT_3D_SIZE 65") == std::string::npos) {
      std::ifstream again(path, std::ios::binary);
      std::vector<float> points;
      int size = -1;
      CubeLut::Stop big;
      EXPECT_EQ(CubeLut::loadCubeLattice(again, &points, &size, &big), m.status);
      EXPECT_EQ(big.line, m.line);
      EXPECT_EQ(size, m.status == 0 ? 2 : 0);
      EXPECT_EQ(points.size(), m.status == 0 ? 24u : 0u);
    }
    if (m.status != 0) continue;
    ExpectSample(*lut, dl ? 3 : 2, dl);
    if (!dl) {
      EXPECT_STREQ(lut->getTitle(), "Sample");
    }
  }
}

TEST(CubeLutFile, CubeStatuses) {
  const std::string truncated = WithoutLastLine(kCube);
  const std::string unterminated = kCube.substr(0, kCube.size() - 1);
  ExpectStatuses(
      {
          {"valid", kCube, 0, 14},
          {"CR-LF", ReplaceAll(kCube, "\n", "\r\n"), 0, 14},
          {"CR-LF, bare CR lines", ReplaceAll(kCube, "\n", "\r\n\r\n"), 0, 27},
          {"CR only", ReplaceAll(kCube, "\n", "\r"), 0, 14},
          {"last line unterminated", unterminated, 0, 14},
          {"junk after the table", kCube + "junk\n\x01\xff\n", 0, 14},
          {"two titles", Replace(kCube, "TITLE \"Sample\"\n", "TITLE \"Sample\"\nTITLE \"B\"\n"),
           20, 3},
          {"1-D size", Replace(kCube, "LUT_3D_SIZE 2\n", "LUT_1D_SIZE 2\nLUT_3D_SIZE 2\n"), 20, 5},
          {"input range", Replace(kCube, "\n\n", "\nLUT_3D_INPUT_RANGE 0 1\n\n"), 20, 6},
          {"repeated size", Replace(kCube, "LUT_3D_SIZE 2\n", "LUT_3D_SIZE 2\nLUT_3D_SIZE 2\n"), 20,
           6},
          {"blank line of spaces", Replace(kCube, "\n\n", "\n   \n"), 20, 6},
          {"size 1", Replace(kCube, "LUT_3D_SIZE 2", "LUT_3D_SIZE 1"), 23, 5},
          {"size 65", Replace(kCube, "LUT_3D_SIZE 2", "LUT_3D_SIZE 65"), 23, 5},
          {"size 257", Replace(kCube, "LUT_3D_SIZE 2", "LUT_3D_SIZE 257"), 23, 5},
          {"no size", Replace(kCube, "LUT_3D_SIZE 2\n", ""), 23, 6},
          {"size not a number", Replace(kCube, "LUT_3D_SIZE 2", "LUT_3D_SIZE two"), 10, 5},
          {"size past int", Replace(kCube, "LUT_3D_SIZE 2", "LUT_3D_SIZE 4294967298"), 10, 5},
          {"max 1 1 0", Replace(kCube, "DOMAIN_MAX 1.0 1.0 1.0", "DOMAIN_MAX 1 1 0"), 22, 7},
          {"max 1 1 0, CR-LF",
           ReplaceAll(Replace(kCube, "DOMAIN_MAX 1.0 1.0 1.0", "DOMAIN_MAX 1 1 0"), "\n", "\r\n"),
           22, 7},
          {"max equal to min", Replace(kCube, "DOMAIN_MIN 0.0 0.0 0.0", "DOMAIN_MIN 0 1 0"), 22, 7},
          {"two domain values", Replace(kCube, "DOMAIN_MIN 0.0 0.0 0.0", "DOMAIN_MIN 0 0"), 10, 3},
          {"domain past float", Replace(kCube, "DOMAIN_MAX 1.0", "DOMAIN_MAX 1e39"), 10, 4},
          {"title without quote", Replace(kCube, "TITLE \"Sample\"", "TITLE Sample"), 21, 2},
          {"title alone", Replace(kCube, "TITLE \"Sample\"", "TITLE"), 10, 2},
          {"title quote alone", Replace(kCube, "TITLE \"Sample\"", "TITLE \""), 10, 2},
          {"truncated, terminated", truncated, 10, 13},
          {"truncated, unterminated", truncated.substr(0, truncated.size() - 1), 12, 13},
          {"number past float", truncated + "1e39 0 0\n", 24, 14},
          {"past float once scaled", truncated + "0 3e37 0\n", 24, 14},
          {"nan", truncated + "0 0 nan\n", 24, 14},
          {"empty", "", 10, 0},
          {"line of 251 then LF", std::string(251, '#') + "\n" + kCube, 0, 15},
          {"line of 251 then CR-LF",
           std::string(251, '#') + "\r\n" + ReplaceAll(kCube, "\n", "\r\n"), 0, 15},
          {"line of 252", std::string(252, '#') + "\n" + kCube, 13, 1},
          {"no terminator at all", std::string(300, ' '), 13, 1},
      },
      "case.cube", false);
}

TEST(CubeLutFile, DlStatuses) {
  const std::string truncated = WithoutLastLine(kDl);
  std::string range65 = "0";
  for (int i = 1; i < 65; ++i) range65 += " " + std::to_string(i);
  ExpectStatuses(
      {
          {"valid", kDl, 0, 30},
          {"CR-LF", ReplaceAll(kDl, "\n", "\r\n"), 0, 30},
          {"CR only", ReplaceAll(kDl, "\n", "\r"), 0, 30},
          {"text and keywords skipped", "# note\nsome words\n+ alone\nMesh 4 12\n" + kDl, 0, 34},
          {"last line unterminated", kDl.substr(0, kDl.size() - 1), 0, 30},
          {"range with trailing space", Replace(kDl, "0 2047 4095", "0 2047 4095 "), 10, 30},
          {"range with double space", Replace(kDl, "0 2047 4095", "0  2047 4095"), 10, 30},
          {"range of two", Replace(kDl, "0 2047 4095", "0 4095"), 24, 3},
          {"range of 65", Replace(kDl, "0 2047 4095", range65), 23, 3},
          {"blank header line", Replace(kDl, "3DMESH\n", "3DMESH\n  \n"), 10, 2},
          {"truncated, terminated", truncated, 10, 29},
          {"truncated, unterminated", truncated.substr(0, truncated.size() - 1), 12, 29},
          {"no range line", "3DMESH\nMesh 0 12\n", 10, 2},
          {"number past float", truncated + "1e39 0 0\n", 24, 30},
          {"empty", "", 10, 0},
          {"line of 252", std::string(252, 'x') + "\n" + kDl, 13, 1},
      },
      "case.3dl", true);
}

// Tables above the lattice's 64 points are read whole, in lattice order and with the domain's
// scale; 257 points are too many even for them, and the message names that limit and quotes the
// line safely.
TEST(CubeLutFile, LatticeReaderTakesEverySizeTheFormatAllowsAndStopsQuoteTheLine) {
  constexpr int n = 65;
  std::string text = "DOMAIN_MAX 2 2 2\nLUT_3D_SIZE 65\n";
  for (int r = 0; r < n * n * n; ++r) {
    char row[64];
    std::snprintf(row, sizeof row, "%g %g %g\n", r % n / 64.0, r / n % n / 64.0, r / n / n / 64.0);
    text += row;
  }
  TempDir dir;
  std::ifstream in(dir.Write("big.cube", text), std::ios::binary);
  std::vector<float> points;
  int size = 0;
  CubeLut::Stop stop;
  ASSERT_EQ(CubeLut::loadCubeLattice(in, &points, &size, &stop), 0);
  ASSERT_EQ(size, n);
  EXPECT_EQ(stop.line, 2 + n * n * n);
  for (const int i : {0, 1, 17, 64}) {
    for (const int k : {0, 3, 64}) {
      const float* p = &points[((static_cast<size_t>(i) * n + 5) * n + k) * 3];
      EXPECT_EQ(p[0], static_cast<float>(i) / 64.0f * 510.0f);
      EXPECT_EQ(p[1], 5.0f / 64.0f * 510.0f);
      EXPECT_EQ(p[2], static_cast<float>(k) / 64.0f * 510.0f);
    }
  }

  std::ifstream tooBig(dir.Write("257.cube", Replace(text, "SIZE 65", "SIZE 257")),
                       std::ios::binary);
  EXPECT_EQ(CubeLut::loadCubeLattice(tooBig, &points, &size, &stop), 23);
  EXPECT_EQ(size, 0);
  EXPECT_EQ(CubeLut::stopMessage("257.cube", stop),
            "257.cube, line 2 (\"LUT_3D_SIZE 257\"): status 23, the size is missing or outside "
            "2..256");
  // The line is quoted with its quotes, backslashes and controls escaped, cut at 48 characters.
  stop.status = 20;
  stop.line = 7;
  stop.text = "TITLE \"a\\b\"\t" + std::string(49, 'x');
  EXPECT_EQ(CubeLut::stopMessage("f.cube", stop),
            "f.cube, line 7 (\"TITLE \\\"a\\\\b\\\"\\x09" + std::string(48, 'x') +
                "...\"): status 20, unknown or repeated keyword");
  stop.status = 10;
  stop.line = 0;
  EXPECT_EQ(CubeLut::stopMessage("f.cube", stop),
            "f.cube: status 10, a read failed: the table ends early, or a keyword's values cannot "
            "be read");
  EXPECT_STREQ(CubeLut::statusText(99), "unknown status");
}

TEST(CubeLutFile, ValuesScaleAndShortRowsKeepTheRowBefore) {
  TempDir dir;
  // The domain's width scales, its minimum is not subtracted.
  const auto lut =
      Load(dir, "narrow.cube", Replace(kCube, "DOMAIN_MIN 0.0 0.0 0.0", "DOMAIN_MIN 0.5 0.5 0.5"));
  ASSERT_EQ(lut->getStatus(), 0);
  ExpectSample(*lut, 2, false, 0.5f);
  float lo[3], hi[3];
  lut->getDomain(lo, hi);
  EXPECT_EQ(lo[1], 0.5f);
  EXPECT_EQ(hi[1], 1.0f);
  // The next read starts from the default domain again.
  ASSERT_TRUE(lut->loadFile(Wide(dir.Write("plain.cube", kCube)).c_str()));
  lut->getDomain(lo, hi);
  EXPECT_EQ(lo[0], 0.0f);
  ExpectSample(*lut, 2, false);

  // A short row keeps the components it lacks from the row before; the first row from 0.
  ASSERT_TRUE(lut->loadFile(Wide(dir.Write("short.cube", kCubeHeader +
                                                             "0.5\n0.25 0.75\n1e20 -1e20 0\n"
                                                             "99999999999999999999 1 1\n" +
                                                             Rows(2, false)))
                                .c_str()));
  const float expected[4][3] = {{0.5f, 0, 0}, {0.25f, 0.75f, 0}, {1e20f, -1e20f, 0}, {1e20f, 1, 1}};
  const int at[4][3] = {{0, 0, 0}, {1, 0, 0}, {0, 1, 0}, {1, 1, 0}};
  for (int r = 0; r < 4; ++r) {
    for (int c = 0; c < 3; ++c) {
      EXPECT_EQ(Point(*lut, at[r][0], at[r][1], at[r][2])[c], expected[r][c] * 255.0f) << r << c;
    }
  }

  // A ".3DL" file's trailing blank is one more lattice point, whatever the data holds.
  EXPECT_EQ(Load(dir, "a.3dl", Replace(kDl, "0 2047 4095", "0 2047 4095 "))->getLutSize(), 4);

  // Seventeen range values make N = 17, and 4095 is full scale whatever the range's top.
  const std::string range17 = "0 64 128 192 256 320 384 448 512 576 640 704 768 832 896 960 1023\n";
  ExpectSample(*Load(dir, "17.3dl", range17 + Rows(17, true)), 17, true);
  const auto full =
      Load(dir, "full.3dl", range17 + WithoutLastLine(Rows(17, true)) + "4095 4095 4095");
  ASSERT_EQ(full->getStatus(), 0);
  for (int c = 0; c < 3; ++c) EXPECT_EQ(Point(*full, 16, 16, 16)[c], 255.0f);

  // A lone number keeps the other two components of the row before, on the first row 0.
  const auto dl = Load(dir, "white.3dl",
                       "0 1 2\n2047\n4095 4095 4095\n1e30 -1e30 1e20\n2047\n" + Rows(3, true));
  ASSERT_EQ(dl->getStatus(), 0);
  const float dlExpected[4][3] = {
      {2047, 0, 0}, {4095, 4095, 4095}, {1e30f, -1e30f, 1e20f}, {2047, -1e30f, 1e20f}};
  for (int r = 0; r < 4; ++r) {
    for (int c = 0; c < 3; ++c) {
      EXPECT_EQ(Point(*dl, 0, r / 3, r % 3)[c], dlExpected[r][c] / 4095.0f * 255.0f) << r << c;
    }
  }
}

TEST(CubeLutFile, FailedReadsKeepWhatTheyReadAndTheRowTableTakesTheFirstRowsUnscaled) {
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

  // A row table takes the first rows as the file gives them.
  lut->setRowTable(new float[CubeLut::kMaxSize][3]());
  const std::string narrow = Replace(kCube, "DOMAIN_MIN 0.0 0.0 0.0", "DOMAIN_MIN 0.5 0.5 0.5");
  ASSERT_TRUE(lut->loadFile(Wide(dir.Write("rows.cube", narrow)).c_str()));
  for (int r = 0; r < 2; ++r) {
    for (int c = 0; c < 3; ++c) EXPECT_EQ(lut->getRowTable()[r][c], Sixteenth(r, c));
  }
  EXPECT_EQ(lut->getRowTable()[2][0], 0.0f);
  EXPECT_EQ(Point(*lut, 1, 0, 0)[0], 0.0f);

  const std::string shortRow = Replace(kCube, "\n\n", "\n\n0.5 0.25\n");
  EXPECT_FALSE(lut->loadFile(Wide(dir.Write("short.cube", shortRow)).c_str()));
  EXPECT_EQ(lut->getStatus(), 24);
  EXPECT_EQ(lut->getRowTable()[0][1], 0.25f);
  EXPECT_EQ(lut->getRowTable()[0][2], 0.0f);
}

TEST(CubeLutFile, ExtensionPicksTheReaderAndWidePathsBecomeUtf8) {
  const struct {
    const char* name;
    bool dl, loads;
  } cases[] = {
      {"grade.cube", false, true}, {"grade.Cube", false, true},     {"grade.CUBE", false, true},
      {"grade.3dl", true, true},   {"grade.3Dl", true, true},       {"grade", false, false},
      {"a.3dl.bak", true, false},  {"grade.cub", false, false},     {"grade.cube ", false, false},
      {"cube", false, false},      {"grade.3dl.cube", false, true}, {"grade.cube.3dl", true, true},
  };
  TempDir dir;
  for (const auto& c : cases) {
    SCOPED_TRACE(c.name);
    bool loaded = false;
    const auto lut = Load(dir, c.name, c.dl ? kDl : kCube, &loaded);
    EXPECT_EQ(loaded, c.loads);
    // Neither reader runs on a refused name: the status is still the constructor's.
    EXPECT_EQ(lut->getStatus(), c.loads ? 0 : 1);
  }
  const auto lut = std::make_unique<CubeLut>();
  EXPECT_FALSE(lut->loadFile(nullptr));
  EXPECT_FALSE(lut->loadFile(Wide(dir.path + "/missing.cube").c_str()));
  // The wrong reader fails on the other format.
  EXPECT_FALSE(lut->loadFile(Wide(dir.Write("swapped.3dl", kCube)).c_str()));

  dir.Write("F\xC3\xA4rg \xE3\x82\xB0\xF0\x9F\x98\x80.Cube", kCube);
  EXPECT_TRUE(lut->loadFile((Wide(dir.path) + L"/F\u00e4rg \u30b0\U0001F600.Cube").c_str()));
  // A wide extension character is left alone by the upper-casing.
  dir.Write("grade.\xD1\x81ube", kCube);
  EXPECT_FALSE(lut->loadFile((Wide(dir.path) + L"/grade.\u0441ube").c_str()));

  const auto convert = [](const std::wstring& wide) {
    std::vector<char> out(tfx::kLutPathBufferBytes, 0);
    tfx::WideToUtf8Path(wide, out.data());
    EXPECT_TRUE(
        std::all_of(out.begin() + tfx::kLutPathMaxBytes, out.end(), [](char c) { return c == 0; }));
    return std::string(out.data());
  };
  // The characters are encoded as the host's UTF-8 tests check; the path stops before one that
  // would not fit whole.
  EXPECT_EQ(convert(std::wstring(2045, L'a') + L"\u00e9").size(), 2047u);
  EXPECT_EQ(convert(std::wstring(2046, L'a') + L"\u00e9").size(), 2046u);
  EXPECT_EQ(convert(std::wstring(2044, L'a') + L"\U0001F600").size(), 2044u);
  EXPECT_EQ(convert(std::wstring(3000, L'a')).size(), 2047u);

  // Through loadFile: a 2047-byte path opens, one more byte cuts the name.
  const std::string tail = "/long.cube";
  dir.Write("long.cube", kCube);
  const std::string fits = dir.path + std::string(2047 - dir.path.size() - tail.size(), '/') + tail;
  ASSERT_EQ(fits.size(), 2047u);
  EXPECT_TRUE(lut->loadFile(Wide(fits).c_str()));
  EXPECT_FALSE(lut->loadFile(Wide("/" + fits).c_str()));
}

TEST(CubeLutFile, WriterHeaderRowsAndRoundTrip) {
  EXPECT_EQ(convertFloat2String(-0.25f), "-0.25000000");
  EXPECT_EQ(convertFloat2String(1.0f / 3.0f), "0.33333334");  // the float, not the double third
  EXPECT_EQ(convertFloat2String(1e10f), "10000000000.00000000");

  TempDir dir;
  const std::string header =
      "#LUT size\nLUT_3D_SIZE 2\n\n#data domain\nDOMAIN_MIN 0.0 0.0 0.0\nDOMAIN_MAX 1.0 1.0 1.0\n\n"
      "#LUT data points\n";
  const auto lut = std::make_unique<CubeLut>();
  lut->generateLUT3DData(2);
  const std::string path = dir.path + "/out.cube";
  ASSERT_TRUE(lut->writeLUT3D2File(path.c_str()));
  // Red fastest, and the generated lattice divides by 31: row r is (r & 1, r & 2, r & 4) steps
  // of 255/31.
  const std::string z = "0.00000000", s = convertFloat2String(255.0f / 31.0f / 255.0f);
  std::string rows;
  for (int r = 0; r < 8; ++r) {
    rows += (r & 1 ? s : z) + " " + (r & 2 ? s : z) + " " + (r & 4 ? s : z) + "\n";
  }
  EXPECT_EQ(tfx_test::ReadFile(path), header + rows);

  const auto empty = std::make_unique<CubeLut>();
  ASSERT_TRUE(empty->writeLUT3D2File(path.c_str()));
  EXPECT_EQ(tfx_test::ReadFile(path), Replace(header, "LUT_3D_SIZE 2", "LUT_3D_SIZE 0"));

  testing::internal::CaptureStdout();
  EXPECT_FALSE(lut->writeLUT3D2File(nullptr));
  EXPECT_FALSE(lut->writeLUT3D2File((dir.path + "/no/such/dir.cube").c_str()));
  const std::string said = testing::internal::GetCapturedStdout();
  EXPECT_NE(said.find("Path cannot be NULL!"), std::string::npos);
  EXPECT_NE(said.find("Cannot open the path file!"), std::string::npos);

  // Written and loaded again, a lattice comes back as its text says.
  std::mt19937 random(77u);
  std::uniform_real_distribution<float> value(0.0f, 255.0f);
  for (const int n : {17, 64}) {
    SCOPED_TRACE(n);
    const auto outOwned = std::make_unique<CubeLut>();
    CubeLut& out = *outOwned;
    const auto inOwned = std::make_unique<CubeLut>();
    CubeLut& in = *inOwned;
    out.generateLUT3DData(n);
    const auto at = [n](CubeLut& l, int p) {
      return &Point(l, p / 3 / n / n, p / 3 / n % n, p / 3 % n)[p % 3];
    };
    for (int p = 0; p < n * n * n * 3; ++p) *at(out, p) = value(random);
    const std::string round = dir.path + "/round" + std::to_string(n) + ".cube";
    ASSERT_TRUE(out.writeLUT3D2File(round.c_str()));
    ASSERT_TRUE(in.loadFile(Wide(round).c_str()));
    ASSERT_EQ(in.getLutSize(), n);
    for (int p = 0; p < n * n * n * 3; ++p) {
      const float written = *at(out, p) / 255.0f;
      const float text = std::strtof(convertFloat2String(written).c_str(), nullptr);
      ASSERT_EQ(*at(in, p), text * 255.0f) << p;
      ASSERT_NEAR(*at(in, p) / 255.0f, written, 1.5e-7) << p;
    }
  }
}

}  // namespace
