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
static_assert(sizeof(off_t) == 8 && sizeof(ino_t) == 8 && sizeof(time_t) == 8);

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
  struct stat found {};
  // Opening alone can set a device to work. O_NONBLOCK is for an entry that changes in between.
  if (::stat(path, &found) == 0 && !S_ISREG(found.st_mode)) return {};
  const descriptor file(::open(path, O_RDONLY | O_CLOEXEC | O_NONBLOCK));
  if (!file.is_open()) return {};
  try {
    return first_word(file.get());
  } catch (const std::bad_alloc&) {
    return {};
  }
}

void write_file(const char* path, std::string_view content) noexcept {
  struct stat old {};
  const bool keeps_mode = ::lstat(path, &old) == 0 && S_ISREG(old.st_mode);
  ::unlink(path);
  const descriptor file(::open(path, O_WRONLY | O_CREAT | O_EXCL | O_CLOEXEC, 0666));
  if (keeps_mode) ::fchmod(file.get(), old.st_mode & 0777);
  [[maybe_unused]] const ssize_t ignored = ::write(file.get(), content.data(), content.size());
}

}  // namespace fs
