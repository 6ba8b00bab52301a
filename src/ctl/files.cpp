#include "ctl/files.h"

#include <fcntl.h>
#include <sys/stat.h>
#include <unistd.h>

#include <array>
#include <cstddef>
#include <deque>
#include <system_error>

#include "fs/descriptor.h"

namespace {

bool is_regular(int file) {
  struct stat found {};
  return ::fstat(file, &found) == 0 && S_ISREG(found.st_mode);
}

}  // namespace

std::optional<std::string> read_file(const std::string& path) {
  constexpr std::size_t limit = 16U << 20U;
  struct stat found {};
  if (::stat(path.c_str(), &found) != 0 || !S_ISREG(found.st_mode)) return {};
  // O_NONBLOCK and the second look are for an entry that changes in between.
  const fs::descriptor file(::open(path.c_str(), O_RDONLY | O_CLOEXEC | O_NONBLOCK));
  if (!file.is_open() || !is_regular(file.get())) return {};
  std::string content;
  std::array<char, 65536> block;
  while (content.size() <= limit) {
    const ssize_t count = ::read(file.get(), block.data(), block.size());
    if (count < 0) return {};
    if (count == 0) return content;
    content.append(block.data(), static_cast<std::size_t>(count));
  }
  return {};
}

std::string link_target(const std::string& path) {
  std::error_code error;
  return std::filesystem::read_symlink(path, error);
}

bool is_there(const std::string& path) {
  struct stat found {};
  return ::lstat(path.c_str(), &found) == 0;
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
    const bool is_last = way == real;
    const mode_t pass = S_ISDIR(found.st_mode) ? S_IXOTH : 0;
    if ((found.st_mode & pass) != pass || (is_last && (found.st_mode & S_IROTH) == 0)) return way;
  }
  return {};
}

std::optional<std::filesystem::path> resolve_inside(const std::filesystem::path& top,
                                                    const std::filesystem::path& inside) {
  int links_left = 40;
  std::deque<std::filesystem::path> names(inside.begin(), inside.end());
  std::filesystem::path way;
  while (!names.empty()) {
    const std::filesystem::path name = names.front();
    names.pop_front();
    if (name == "..") {
      if (way.empty()) return {};
      way = way.parent_path();
    } else if (const std::filesystem::path target = link_target(top / way / name); target.empty()) {
      if (!is_there(top / way / name)) return {};
      if (name != ".") way /= name;
    } else {
      if (target.is_absolute() || --links_left == 0) return {};
      names.insert(names.begin(), target.begin(), target.end());
    }
  }
  return top / way;
}
