#include "ctl/files.h"

#include <fcntl.h>
#include <sys/stat.h>
#include <unistd.h>

#include <algorithm>
#include <array>
#include <cstddef>
#include <deque>
#include <system_error>

#include "fs/descriptor.h"

bool is_hard(int error) {
  constexpr std::array soft = {0, ENOENT, ENOTDIR, EACCES, ELOOP, ENAMETOOLONG, EINVAL, ERANGE};
  return std::ranges::find(soft, error) == soft.end();
}

void check(bool done, const std::string& path) {
  if (!done) throw std::system_error(errno, std::generic_category(), path);
}

std::optional<std::string> read_file(const std::string& path) {
  constexpr off_t limit = 2L << 20;
  struct stat found {};
  check(::stat(path.c_str(), &found) == 0 || !is_hard(errno), path);
  if (!S_ISREG(found.st_mode) || found.st_size > limit) return {};
  // O_NONBLOCK is for an entry that changes in between.
  const fs::descriptor file(::open(path.c_str(), O_RDONLY | O_CLOEXEC | O_NONBLOCK));
  check(file.is_open() || !is_hard(errno), path);
  if (!file.is_open()) return {};
  std::string content(static_cast<std::size_t>(found.st_size), '\0');
  std::size_t size = 0;
  for (ssize_t count = 1; count > 0; size += static_cast<std::size_t>(count)) {
    count = ::read(file.get(), content.data() + size, content.size() - size);
    check(count >= 0, path);
  }
  content.resize(size);
  return content;
}

std::string link_target(const std::string& path) {
  std::error_code error;
  const std::filesystem::path target = std::filesystem::read_symlink(path, error);
  errno = error.value();
  check(!is_hard(errno), path);
  return target;
}

bool is_there(const std::string& path) {
  struct stat found {};
  const bool found_it = ::lstat(path.c_str(), &found) == 0;
  check(found_it || !is_hard(errno), path);
  return found_it;
}

bool leads_to_directory(const std::string& path) {
  struct stat found {};
  check(::stat(path.c_str(), &found) == 0 || !is_hard(errno), path);
  return S_ISDIR(found.st_mode);
}

std::string closed_part(const std::string& path) {
  std::error_code error;
  std::filesystem::path way;
  std::filesystem::path real = std::filesystem::canonical(path, error);
  // Where the caller cannot pass a directory itself, the way is looked at as it is written.
  if (error) real = path;
  struct stat found {};
  for (const auto& name : real) {
    way /= name;
    if (::stat(way.c_str(), &found) != 0) return {};
    const mode_t needed = (S_ISDIR(found.st_mode) ? 0111 : 0) | (way == real ? 0444 : 0);
    if ((found.st_mode & needed) != needed) return way;
  }
  return {};
}

std::optional<std::filesystem::path> resolve_inside(const std::filesystem::path& top,
                                                    const std::filesystem::path& inside) {
  int links_left = 38;  // readers follow 40, and come here through three
  std::deque<std::filesystem::path> names(inside.begin(), inside.end());
  std::filesystem::path way;
  while (!names.empty()) {
    if (!is_there(top / way / "") && errno != EACCES) return {};  // no directory
    const std::filesystem::path name = names.front();
    names.pop_front();
    if (name.empty() || name == ".") continue;
    if (name == "..") {
      if (way.empty()) return {};
      way = way.parent_path();
    } else if (const std::filesystem::path target = link_target(top / way / name); target.empty()) {
      if (!is_there(top / way / name) && errno != EACCES) return {};
      way /= name;
    } else {
      if (target.is_absolute() || --links_left == 0) return {};
      names.insert(names.begin(), target.begin(), target.end());
    }
  }
  return top / way;
}
