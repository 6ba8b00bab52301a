#include "fs/operations.h"

#include <sys/stat.h>
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

/// Whether the storage is a file system that can use a freed inode at once, and has none left.
bool removing_makes_room() noexcept {
  constexpr long tmpfs = 0x01021994;
  constexpr long ext4 = 0xef53;
  const int error = errno;
  struct statfs storage {};
  static_cast<void>(::statfs(paths::storage, &storage));
  errno = error;
  return (storage.f_type == tmpfs || storage.f_type == ext4) && storage.f_files != 0 &&
         storage.f_ffree == 0;
}

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
  if (length != -1) return {content.data(), static_cast<std::size_t>(length)};
  if (errno == ENOENT) return {};
  fail("read_symlink: %s", {path});
}

void create_symlink(const char* target, const char* link) {
  if (::symlink(target, link) != 0) fail("create_symlink: from %s to %s", {link, target});
}

bool is_symlink_to(const char* target, const char* link) noexcept {
  const int error = errno;
  std::array<char, PATH_MAX> content{};  // ends with a NUL, whatever is read
  [[maybe_unused]] const ssize_t ignored = ::readlink(link, content.data(), content.size() - 1);
  errno = error;
  return std::string_view(content.data()) == target;
}

bool stage_symlink(const char* target, const char* staged) noexcept {
  const auto stands = [target, staged] {
    return ::symlink(target, staged) == 0 || is_symlink_to(target, staged);
  };
  if (stands()) return true;
  if (errno != EEXIST) return false;
  unstage_symlink(staged);
  return stands();
}

void unstage_symlink(const char* staged) noexcept {
  const int error = errno;
  struct stat found {};
  if (::lstat(staged, &found) != 0 || S_ISLNK(found.st_mode)) ::unlink(staged);
  errno = error;
}

void require_room(const char* target, const char* link) {
  if ((errno == ENOSPC || errno == EDQUOT) && !removing_makes_room())
    fail("create_symlink: from %s to %s", {link, target});
}

bool replace_symlink(const char* target, const char* link, const char* staged) {
  if (stage_symlink(target, staged)) {
    if (::rename(staged, link) == 0) return true;
    if (errno == ENOENT && is_symlink_to(target, link)) return true;  // another run renamed it
  }
  require_room(target, link);
  unstage_symlink(staged);
  return false;
}

}  // namespace fs
