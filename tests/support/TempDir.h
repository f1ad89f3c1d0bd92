// Files a test writes for the code under test to read: a directory of its own, and ".cube"
// tables of a known shape.
#pragma once

#include <gtest/gtest.h>
#include <stdlib.h>

#include <algorithm>
#include <filesystem>
#include <fstream>
#include <iterator>
#include <sstream>
#include <string>
#include <vector>

namespace tfx_test {

// A fresh directory under the system's temporary directory, removed with everything in it.
struct TempDir {
  std::string path;

  TempDir() {
    std::string pattern = (std::filesystem::temp_directory_path() / "tfx-test-XXXXXX").string();
    if (mkdtemp(pattern.data())) {
      path = pattern;
    } else {
      ADD_FAILURE() << "cannot create " << pattern;
    }
  }
  ~TempDir() {
    std::error_code ignored;
    if (!path.empty()) std::filesystem::remove_all(path, ignored);
  }
  TempDir(const TempDir&) = delete;
  TempDir& operator=(const TempDir&) = delete;

  std::string Path(const std::string& name) const { return path + "/" + name; }

  // What the directory holds, in name order: a failed step must leave no output or temporary.
  std::vector<std::string> Names() const {
    std::vector<std::string> names;
    for (const auto& e : std::filesystem::directory_iterator(path)) {
      names.push_back(e.path().filename().string());
    }
    std::sort(names.begin(), names.end());
    return names;
  }

  // Writes `bytes` as they are to `name` and returns its full path.
  std::string Write(const std::string& name, const std::string& bytes) const {
    const std::string full = Path(name);
    std::ofstream(full, std::ios::binary) << bytes;
    return full;
  }
};

// The bytes of the file at `path`, or nothing.
inline std::string ReadFile(const std::string& path) {
  std::ifstream in(path, std::ios::binary);
  return {std::istreambuf_iterator<char>(in), std::istreambuf_iterator<char>()};
}

// Test paths are ASCII apart from the cases that build their wide path themselves.
inline std::wstring Wide(const std::string& ascii) {
  return std::wstring(ascii.begin(), ascii.end());
}

// A ".cube" table of n points per axis, red fastest, after `header` (lines ending in '\n') and
// its own LUT_3D_SIZE line. Each point holds scale * input + shift for its input in 0..1, the
// channels in the order (green, blue, red) when `rotate` is set.
inline std::string CubeText(int n, const std::string& header = "", double scale = 1,
                            double shift = 0, bool rotate = false) {
  std::ostringstream out;
  out << header << "LUT_3D_SIZE " << n << "\n";
  for (int b = 0; b < n; ++b) {
    for (int g = 0; g < n; ++g) {
      for (int r = 0; r < n; ++r) {
        const double v[3] = {r / double(n - 1), g / double(n - 1), b / double(n - 1)};
        const int first = rotate ? 1 : 0;
        for (int c = 0; c < 3; ++c) {
          out << v[(first + c) % 3] * scale + shift << (c < 2 ? ' ' : '\n');
        }
      }
    }
  }
  return out.str();
}

}  // namespace tfx_test
