#include "TemporaryFiles.h"

#include <limits.h>
#include <unistd.h>

#include <atomic>
#include <cstring>

namespace tfxtool::media {

namespace {

enum SlotState : int { kFree, kFilling, kFile, kSequence };

struct Slot {
  std::atomic<int> state{kFree};
  std::atomic<int64_t> files{0};
  int64_t first = 0;
  char path[PATH_MAX] = {};
  char pattern[NAME_MAX + 1] = {};
};

constexpr int kSlots = 16;
Slot slots[kSlots];
static_assert(std::atomic<int>::is_always_lock_free && std::atomic<int64_t>::is_always_lock_free,
              "a signal handler may only read lock-free atomics");

int Claim(const std::string& path, const std::string& pattern) {
  if (path.size() >= PATH_MAX || pattern.size() > NAME_MAX) return -1;
  for (int i = 0; i < kSlots; ++i) {
    int expected = kFree;
    if (slots[i].state.compare_exchange_strong(expected, kFilling)) {
      std::memcpy(slots[i].path, path.c_str(), path.size() + 1);
      std::memcpy(slots[i].pattern, pattern.c_str(), pattern.size() + 1);
      slots[i].files.store(0);
      return i;
    }
  }
  return -1;
}

// Joins directory and name into out; false when it does not fit.
bool Join(const char* directory, const char* name, char* out, size_t size) noexcept {
  const size_t a = std::strlen(directory);
  const size_t b = std::strlen(name);
  if (a + 1 + b + 1 > size) return false;
  std::memcpy(out, directory, a);
  out[a] = '/';
  std::memcpy(out + a + 1, name, b + 1);
  return true;
}

}  // namespace

int TemporaryFiles::RegisterFile(const std::string& path) {
  const int slot = Claim(path, "");
  if (slot >= 0) slots[slot].state.store(kFile);
  return slot;
}

int TemporaryFiles::RegisterSequence(const std::string& directory, const std::string& pattern,
                                     int64_t first) {
  const int slot = Claim(directory, pattern);
  if (slot >= 0) {
    slots[slot].first = first;
    slots[slot].state.store(kSequence);
  }
  return slot;
}

void TemporaryFiles::Advance(int slot, int64_t files) {
  if (slot >= 0) slots[slot].files.store(files);
}

void TemporaryFiles::Release(int slot) {
  if (slot >= 0) slots[slot].state.store(kFree);
}

void TemporaryFiles::RemoveAll() noexcept {
  for (Slot& slot : slots) {
    const int state = slot.state.load();
    if (state == kFile) {
      unlink(slot.path);
    } else if (state == kSequence) {
      // One past the count: the muxer may have begun the next file.
      RemoveSequence(slot.path, slot.pattern, slot.first, slot.files.load() + 1);
    }
  }
}

void TemporaryFiles::RemoveSequence(const char* directory, const char* pattern, int64_t first,
                                    int64_t count) noexcept {
  char name[NAME_MAX + 1];
  char full[PATH_MAX];
  for (int64_t n = 0; n < count; ++n)
    if (FormatNumber(pattern, first + n, name, sizeof name) &&
        Join(directory, name, full, sizeof full))
      unlink(full);
  rmdir(directory);
}

bool TemporaryFiles::FormatNumber(const char* pattern, int64_t number, char* out,
                                  size_t size) noexcept {
  size_t used = 0;
  auto put = [&](char c) {
    if (used + 1 >= size) return false;
    out[used++] = c;
    return true;
  };
  for (const char* p = pattern; *p != '\0'; ++p) {
    if (*p != '%') {
      if (!put(*p)) return false;
      continue;
    }
    ++p;
    if (*p == '%') {
      if (!put('%')) return false;
      continue;
    }
    int width = 0;
    while (*p >= '0' && *p <= '9') width = width * 10 + (*p++ - '0');
    if (*p != 'd' || number < 0) return false;
    char digits[24];
    int count = 0;
    int64_t rest = number;
    do {
      digits[count++] = char('0' + rest % 10);
      rest /= 10;
    } while (rest > 0);
    for (int i = count; i < width; ++i)
      if (!put('0')) return false;
    while (count > 0)
      if (!put(digits[--count])) return false;
  }
  out[used] = '\0';
  return true;
}

}  // namespace tfxtool::media
