// The ".CUBE" and ".3DL" readers and the ".CUBE" writer: result codes for damaged files, the
// quirks existing files rely on, paths, and where a reader leaves its stream.
#include "lut/CubeLutFile.h"

#include <gtest/gtest.h>

#include <algorithm>
#include <array>
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

// Data row r: sixteenths for ".CUBE" (exact as text and as floats), 12-bit integers for ".3DL".
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

// Data row r of a read: ".CUBE" rows run red fastest, ".3DL" rows blue fastest.
const float* Row(CubeLut& lut, bool dl, int r) {
  const int n = lut.getLutSize(), a = r / n / n, b = r / n % n, c = r % n;
  return dl ? Point(lut, a, b, c) : Point(lut, c, b, a);
}

// A file's value as stored: a cube's scaled by the domain's width, a 3dl's 4095 is full scale.
float Stored(float value, bool dl, float width = 1.0f) {
  return dl ? value / 4095.0f * 255.0f : value * (width * 255.0f);
}

void ExpectSample(CubeLut& lut, int n, bool dl, float width = 1.0f) {
  ASSERT_EQ(lut.getLutSize(), n);
  for (int r = 0; r < n * n * n; ++r) {
    for (int c = 0; c < 3; ++c) {
      const float value = dl ? static_cast<float>(Twelve(r, c)) : Sixteenth(r, c);
      ASSERT_EQ(Row(lut, dl, r)[c], Stored(value, dl, width)) << r << c;
    }
  }
}

void ExpectFirstRows(CubeLut& lut, bool dl, const std::vector<std::array<float, 3>>& rows) {
  for (size_t r = 0; r < rows.size(); ++r) {
    for (int c = 0; c < 3; ++c) {
      EXPECT_EQ(Row(lut, dl, static_cast<int>(r))[c], Stored(rows[r][c], dl)) << r << c;
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
    EXPECT_STREQ(lut->getTitle(), dl ? "" : "Sample");
  }
}

TEST(CubeLutFile, CubeStatuses) {
  const auto cube = [](const std::string& from, const std::string& to) {
    return Replace(kCube, from, to);
  };
  const std::string truncated = WithoutLastLine(kCube);
  const std::string max110 = cube("DOMAIN_MAX 1.0 1.0 1.0", "DOMAIN_MAX 1 1 0");
  ExpectStatuses(
      {
          {"valid", kCube, 0, 14},
          {"CR-LF", ReplaceAll(kCube, "\n", "\r\n"), 0, 14},
          {"CR-LF, bare CR lines", ReplaceAll(kCube, "\n", "\r\n\r\n"), 0, 27},
          {"CR only", ReplaceAll(kCube, "\n", "\r"), 0, 14},
          {"last line unterminated", kCube.substr(0, kCube.size() - 1), 0, 14},
          {"junk after the table", kCube + "junk\n\x01\xff\n", 0, 14},
          {"two titles", cube("TITLE \"Sample\"\n", "TITLE \"Sample\"\nTITLE \"B\"\n"), 20, 3},
          {"1-D size", cube("LUT_3D_SIZE 2\n", "LUT_1D_SIZE 2\nLUT_3D_SIZE 2\n"), 20, 5},
          {"input range", cube("\n\n", "\nLUT_3D_INPUT_RANGE 0 1\n\n"), 20, 6},
          {"repeated size", cube("LUT_3D_SIZE 2\n", "LUT_3D_SIZE 2\nLUT_3D_SIZE 2\n"), 20, 6},
          {"blank line of spaces", cube("\n\n", "\n   \n"), 20, 6},
          {"size 1", cube("LUT_3D_SIZE 2", "LUT_3D_SIZE 1"), 23, 5},
          {"size 65", cube("LUT_3D_SIZE 2", "LUT_3D_SIZE 65"), 23, 5},
          {"size 257", cube("LUT_3D_SIZE 2", "LUT_3D_SIZE 257"), 23, 5},
          {"no size", cube("LUT_3D_SIZE 2\n", ""), 23, 6},
          {"size not a number", cube("LUT_3D_SIZE 2", "LUT_3D_SIZE two"), 10, 5},
          {"size past int", cube("LUT_3D_SIZE 2", "LUT_3D_SIZE 4294967298"), 10, 5},
          {"max 1 1 0", max110, 22, 7},
          {"max 1 1 0, CR-LF", ReplaceAll(max110, "\n", "\r\n"), 22, 7},
          {"max equal to min", cube("DOMAIN_MIN 0.0 0.0 0.0", "DOMAIN_MIN 0 1 0"), 22, 7},
          {"two domain values", cube("DOMAIN_MIN 0.0 0.0 0.0", "DOMAIN_MIN 0 0"), 10, 3},
          {"domain past float", cube("DOMAIN_MAX 1.0", "DOMAIN_MAX 1e39"), 10, 4},
          {"title without quote", cube("TITLE \"Sample\"", "TITLE Sample"), 21, 2},
          {"title alone", cube("TITLE \"Sample\"", "TITLE"), 10, 2},
          {"title quote alone", cube("TITLE \"Sample\"", "TITLE \""), 10, 2},
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
  const auto dl = [](const std::string& to) { return Replace(kDl, "0 2047 4095", to); };
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
          {"range with trailing space", dl("0 2047 4095 "), 10, 30},
          {"range with double space", dl("0  2047 4095"), 10, 30},
          {"range of two", dl("0 4095"), 24, 3},
          {"range of 65", dl(range65), 23, 3},
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

// Status 23 names the limit of the reader that gave it; the quoted line is escaped and cut.
TEST(CubeLutFile, StopMessagesNameTheReadersLimitAndQuoteTheLineSafely) {
  TempDir dir;
  std::ifstream tooBig(dir.Write("257.cube", "# big\nLUT_3D_SIZE 257\n"), std::ios::binary);
  std::vector<float> points;
  int size = -1;
  CubeLut::Stop stop;
  EXPECT_EQ(CubeLut::loadCubeLattice(tooBig, &points, &size, &stop), 23);
  EXPECT_EQ(size, 0);
  EXPECT_EQ(CubeLut::stopMessage("257.cube", stop),
            "257.cube, line 2 (\"LUT_3D_SIZE 257\"): status 23, the size is missing or outside "
            "2..256");
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
  // The domain's width scales, its minimum is not subtracted; the next read starts afresh.
  const auto lut =
      Load(dir, "narrow.cube", Replace(kCube, "DOMAIN_MIN 0.0 0.0 0.0", "DOMAIN_MIN 0.5 0.5 0.5"));
  ExpectSample(*lut, 2, false, 0.5f);
  ASSERT_TRUE(lut->loadFile(Wide(dir.Write("plain.cube", kCube)).c_str()));
  ExpectSample(*lut, 2, false);

  // A short row keeps the components it lacks from the row before; the first row from 0.
  const std::string shortRows = "0.5\n0.25 0.75\n1e20 -1e20 0\n99999999999999999999 1 1\n";
  ASSERT_TRUE(lut->loadFile(
      Wide(dir.Write("short.cube", kCubeHeader + shortRows + Rows(2, false))).c_str()));
  ExpectFirstRows(*lut, false,
                  {{0.5f, 0, 0}, {0.25f, 0.75f, 0}, {1e20f, -1e20f, 0}, {1e20f, 1, 1}});
  const auto dl = Load(dir, "white.3dl",
                       "0 1 2\n2047\n4095 4095 4095\n1e30 -1e30 1e20\n2047\n" + Rows(3, true));
  ASSERT_EQ(dl->getStatus(), 0);
  ExpectFirstRows(
      *dl, true, {{2047, 0, 0}, {4095, 4095, 4095}, {1e30f, -1e30f, 1e20f}, {2047, -1e30f, 1e20f}});
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

  // A row table takes the first rows as the file gives them, and the lattice none.
  lut->setRowTable(new float[CubeLut::kMaxSize][3]());
  const std::string narrow = Replace(kCube, "DOMAIN_MIN 0.0 0.0 0.0", "DOMAIN_MIN 0.5 0.5 0.5");
  ASSERT_TRUE(lut->loadFile(Wide(dir.Write("rows.cube", narrow)).c_str()));
  for (int r = 0; r < 2; ++r) {
    for (int c = 0; c < 3; ++c) EXPECT_EQ(lut->getRowTable()[r][c], Sixteenth(r, c));
  }
  EXPECT_EQ(lut->getRowTable()[2][0], 0.0f);
  EXPECT_EQ(Point(*lut, 1, 0, 0)[0], 0.0f);

  EXPECT_FALSE(lut->loadFile(
      Wide(dir.Write("short.cube", Replace(kCube, "\n\n", "\n\n0.5 0.25\n"))).c_str()));
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
  EXPECT_FALSE(lut->loadFile(Wide(dir.Write("swapped.3dl", kCube)).c_str()));

  dir.Write("F\xC3\xA4rg \xE3\x82\xB0\xF0\x9F\x98\x80.Cube", kCube);
  EXPECT_TRUE(lut->loadFile((Wide(dir.path) + L"/F\u00e4rg \u30b0\U0001F600.Cube").c_str()));
  // A wide extension character is left alone by the upper-casing.
  dir.Write("grade.\xD1\x81ube", kCube);
  EXPECT_FALSE(lut->loadFile((Wide(dir.path) + L"/grade.\u0441ube").c_str()));

  // The path stops before a character that would not fit whole, and nothing is written past it.
  const auto convert = [](const std::wstring& wide) {
    std::vector<char> out(tfx::kLutPathBufferBytes, 0);
    tfx::WideToUtf8Path(wide, out.data());
    EXPECT_TRUE(
        std::all_of(out.begin() + tfx::kLutPathMaxBytes, out.end(), [](char c) { return c == 0; }));
    return std::string(out.data());
  };
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
  // Red fastest; the generated lattice's points are steps of 255/31.
  const std::string z = "0.00000000", s = convertFloat2String(255.0f / 31.0f / 255.0f);
  std::string rows;
  for (int r = 0; r < 8; ++r) {
    rows += (r & 1 ? s : z) + " " + (r & 2 ? s : z) + " " + (r & 4 ? s : z) + "\n";
  }
  EXPECT_EQ(tfx_test::ReadFile(path), header + rows);

  ASSERT_TRUE(std::make_unique<CubeLut>()->writeLUT3D2File(path.c_str()));
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
    const auto out = std::make_unique<CubeLut>(), in = std::make_unique<CubeLut>();
    out->generateLUT3DData(n);
    const auto at = [n](CubeLut& l, int p) {
      return &Point(l, p / 3 / n / n, p / 3 / n % n, p / 3 % n)[p % 3];
    };
    for (int p = 0; p < n * n * n * 3; ++p) *at(*out, p) = value(random);
    const std::string round = dir.path + "/round" + std::to_string(n) + ".cube";
    ASSERT_TRUE(out->writeLUT3D2File(round.c_str()));
    ASSERT_TRUE(in->loadFile(Wide(round).c_str()));
    ASSERT_EQ(in->getLutSize(), n);
    for (int p = 0; p < n * n * n * 3; ++p) {
      const float text = std::strtof(convertFloat2String(*at(*out, p) / 255.0f).c_str(), nullptr);
      ASSERT_EQ(*at(*in, p), text * 255.0f) << p;
    }
  }
}

}  // namespace
