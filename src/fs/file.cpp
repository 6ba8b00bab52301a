#include "fs/file.h"

#include <fcntl.h>
#include <sys/stat.h>
#include <unistd.h>

#include <algorithm>
#include <array>
#include <cstddef>
#include <new>

#include "fs/descriptor.h"

namespace fs {
namespace {

// With fewer bits, calls fail on large inode numbers and on dates after 2038.
static_assert(sizeof(off_t) == 8);
static_assert(sizeof(ino_t) == 8);
static_assert(sizeof(time_t) == 8);

/// Opens `path` unless it is something other than a regular file: opening alone can set a device to
/// work. O_NONBLOCK is for an entry that changes between the two calls.
descriptor open_regular(const char* path, int flags) noexcept {
  constexpr mode_t new_file_mode = 0666;
  struct stat found {};
  if (::stat(path, &found) == 0 && !S_ISREG(found.st_mode)) return descriptor(-1);
  return descriptor(::open(path, flags | O_CLOEXEC | O_NONBLOCK, new_file_mode));
}

/// The first word read from an open descriptor; may throw std::bad_alloc.
std::string first_word(int file) {
  constexpr ssize_t limit = 64L << 20;
  constexpr std::string_view blanks = " \t\n\v\f\r";
  std::string word;
  std::array<char, 4096> block;
  for (ssize_t total = 0; total < limit;) {
    const ssize_t count = ::read(file, block.data(), block.size());
    if (count < 0) break;
    if (count == 0) return word;
    total += count;
    std::string_view text(block.data(), static_cast<std::size_t>(count));
    if (word.empty()) text.remove_prefix(std::min(text.find_first_not_of(blanks), text.size()));
    const std::size_t end = text.find_first_of(blanks);
    word.append(text.substr(0, end));
    if (end != std::string_view::npos) return word;
  }
  return {};
}

}  // namespace

std::string read_first_word(const char* path) noexcept {
  const descriptor file = open_regular(path, O_RDONLY);
  if (!file.is_open()) return {};
  try {
    return first_word(file.get());
  } catch (const std::bad_alloc&) {
    return {};
  }
}

void write_file(const char* path, std::string_view content) noexcept {
  const descriptor file = open_regular(path, O_WRONLY | O_CREAT | O_NOFOLLOW);
  struct stat opened {};
  if (!file.is_open() || ::fstat(file.get(), &opened) != 0 || opened.st_nlink > 1) return;
  if (::ftruncate(file.get(), 0) != 0) return;
  [[maybe_unused]] const ssize_t ignored = ::write(file.get(), content.data(), content.size());
}

}  // namespace fs
