#include "fs/operations.h"

#include <unistd.h>

#include <array>
#include <cerrno>
#include <cstddef>
#include <cstdio>
#include <initializer_list>
#include <string_view>

#include "fs/report.h"

namespace fs {
namespace {

/// Reports the call that has just failed and throws its error number.
[[noreturn]] void fail(std::string_view format, std::initializer_list<const char*> texts) {
  const int error = errno;
  report(error, format, texts);
  throw int{error};
}

}  // namespace

void remove(const char* path) {
  if (::unlink(path) != 0 && errno != ENOENT) fail("remove: could not remove %s", {path});
}

bool exists(const char* path) noexcept {
  return ::access(path, F_OK) == 0;
}

std::string read_symlink(const char* path) {
  std::array<char, 1024> content;
  const ssize_t length = ::readlink(path, content.data(), content.size());
  if (length >= 0) return {content.data(), static_cast<std::size_t>(length)};
  if (errno == ENOENT) return {};
  fail("read_symlink: %s", {path});
}

void create_symlink(const char* target, const char* link) {
  if (::symlink(target, link) != 0) fail("create_symlink: from %s to %s", {link, target});
}

bool replace_symlink(const char* target, const char* link, const char* new_link) noexcept {
  constexpr int waits = 10;
  for (int attempt = 0; attempt < 2 * waits; ++attempt) {
    if (::symlink(target, new_link) == 0) {
      if (::rename(new_link, link) == 0) return true;
      if (errno != ENOENT) break;  // else a run that had waited took it for a left-over
    } else if (errno != EEXIST) {
      return false;
    } else if (attempt == waits) {
      ::unlink(new_link);
    } else {
      ::usleep(1000);
    }
  }
  ::unlink(new_link);
  return false;
}

}  // namespace fs
