// Temporary outputs that an interrupt must be able to remove. A signal handler may touch neither
// the heap nor locks, so the registry is a fixed table of paths in static storage, each slot
// handed over by an atomic state.
#pragma once

#include <cstdint>
#include <string>

namespace tfxtool::media {

class TemporaryFiles {
 public:
  // A slot number, or -1 when the path is too long or the table is full (the file then escapes
  // an interrupt's cleanup, never a normal Abort()).
  static int RegisterFile(const std::string& path);
  // A hidden directory holding an image sequence written as `pattern` (a printf-style %d or
  // %0Nd) from `first` on; Advance() tells how many files exist so far.
  static int RegisterSequence(const std::string& directory, const std::string& pattern,
                              int64_t first);
  static void Advance(int slot, int64_t files);
  static void Release(int slot);
  static void RemoveAll() noexcept;
  // Unlinks the files `first` .. `first + count - 1` of a sequence and then its directory.
  static void RemoveSequence(const char* directory, const char* pattern, int64_t first,
                             int64_t count) noexcept;

  // The name a sequence's file `number` gets, as the image2 muxer writes it; false when it does
  // not fit. Signal-safe.
  static bool FormatNumber(const char* pattern, int64_t number, char* out, size_t size) noexcept;
};

}  // namespace tfxtool::media
