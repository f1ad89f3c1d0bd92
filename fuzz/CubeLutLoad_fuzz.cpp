// libFuzzer target for the LUT readers: every input is a file on disk, read through loadFile as
// a host reads it. The first byte picks the reader: a digit or 'M' (how "3DMESH", "Mesh" and
// bare range lines begin) makes a ".3dl" file, anything else a ".cube" file, so one mutated byte
// moves an input between the two. A file that loads is applied to a small image and written
// back out; the written file must load again with the same size.
#include <unistd.h>

#include <cstdint>
#include <cstdio>
#include <cstdlib>
#include <string>

#include "tessarofx/CubeLut.h"

namespace {

std::string g_base;  // per-process file name stem in the temporary directory

void RemoveFiles() {
  for (const char* suffix : {".cube", ".3dl", "-out.cube"}) std::remove((g_base + suffix).c_str());
}

// Temporary paths are ASCII, so widening byte by byte is their wide form.
std::wstring Wide(const std::string& path) { return std::wstring(path.begin(), path.end()); }

bool WriteFile(const std::string& path, const uint8_t* data, size_t size) {
  std::FILE* file = std::fopen(path.c_str(), "wb");
  if (!file) return false;
  const bool ok = std::fwrite(data, 1, size, file) == size;
  return std::fclose(file) == 0 && ok;
}

}  // namespace

extern "C" int LLVMFuzzerInitialize(int*, char***) {
  const char* dir = std::getenv("TMPDIR");
  g_base = std::string(dir && *dir ? dir : "/tmp") + "/tfx-lut-fuzz-" + std::to_string(getpid());
  std::atexit(RemoveFiles);
  return 0;
}

extern "C" int LLVMFuzzerTestOneInput(const uint8_t* data, size_t size) {
  const bool dl = size > 0 && ((data[0] >= '0' && data[0] <= '9') || data[0] == 'M');
  const std::string path = g_base + (dl ? ".3dl" : ".cube");
  if (!WriteFile(path, data, size)) std::abort();

  // One object for the whole run: a fresh 3 MiB lattice per input costs the sanitizer more
  // than the read itself. Every read rewrites all it uses, and a failed read's left-overs are
  // never looked at.
  static CubeLut* const lut = new CubeLut();
  static CubeLut* const again = new CubeLut();
  if (!lut->loadFile(Wide(path).c_str())) return 0;
  const int n = lut->getLutSize();
  if (n < 2 || n > CubeLut::kMaxSize) std::abort();

  // Eight BGRA pixels per row over most byte values, rows padded past their pixels.
  constexpr int kWidth = 8, kHeight = 8, kPitch = kWidth * 4 + 12;
  uint8_t image[kPitch * kHeight];
  for (int i = 0; i < kPitch * kHeight; ++i) image[i] = static_cast<uint8_t>(i * 37 + 11);
  if (lut->doLUT(image, kWidth, kHeight, kPitch, 4) != 0) std::abort();

  const std::string out = g_base + "-out.cube";
  if (!lut->writeLUT3D2File(out.c_str())) std::abort();
  if (!again->loadFile(Wide(out).c_str()) || again->getLutSize() != n) std::abort();
  return 0;
}
