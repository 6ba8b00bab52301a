#include "fs/operations.h"

#include <sys/statfs.h>
#include <unistd.h>

#include <array>
#include <cerrno>
#include <climits>
#include <cstddef>
#include <initializer_list>
#include <string_view>

#include "fs/report.h"
#include "paths.h"

namespace fs {
namespace {

/// Whether the full storage has room for a link once another one is removed: it has run out of
/// inodes, and is one of the file systems that can use a freed inode at once. Others let a link be
/// removed and then refuse to make one: btrfs, and XFS even where it counts no free inode.
bool removing_makes_room() noexcept {
  constexpr long tmpfs = 0x01021994;
  constexpr long ext4 = 0xef53;
  const int error = errno;
  struct statfs found {};
  const bool known = ::statfs(paths::storage, &found) == 0;
  errno = error;
  return known && (found.f_type == tmpfs || found.f_type == ext4) && found.f_files > 0 &&
         found.f_ffree == 0;
}

/// Reports the call that has just failed and throws its error number.
[[noreturn]] void fail(std::string_view format, std::initializer_list<const char*> texts) {
  const int error = errno;
  report(error, format, texts);
  throw int{error};
}

[[noreturn]] void fail_to_link(const char* target, const char* link) {
  fail("create_symlink: from %s to %s", {link, target});
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
  if (::symlink(target, link) != 0) fail_to_link(target, link);
}

bool is_symlink_to(const char* target, const char* link) noexcept {
  std::array<char, PATH_MAX> content;
  const ssize_t length = ::readlink(link, content.data(), content.size());
  return length >= 0 &&
         std::string_view(content.data(), static_cast<std::size_t>(length)) == target;
}

bool stage_symlink(const char* target, const char* staged) noexcept {
  if (::symlink(target, staged) == 0 || is_symlink_to(target, staged)) return true;
  ::unlink(staged);
  return ::symlink(target, staged) == 0;
}

bool replace_symlink(const char* target, const char* link, const char* staged) {
  if (stage_symlink(target, staged)) {
    return ::rename(staged, link) == 0 ||
           (::unlink(staged) != 0 && errno == ENOENT);  // another run has renamed it
  }
  if ((errno == ENOSPC || errno == EDQUOT) && !removing_makes_room()) fail_to_link(target, link);
  return false;
}

}  // namespace fs
