#include "ctl/copying.h"

#include <dirent.h>
#include <fcntl.h>
#include <sys/sendfile.h>
#include <sys/stat.h>
#include <unistd.h>

#include <algorithm>
#include <array>
#include <cerrno>
#include <climits>
#include <cstddef>
#include <filesystem>
#include <map>
#include <memory>
#include <vector>

#include "ctl/files.h"
#include "fs/descriptor.h"

namespace {

constexpr mode_t directory_mode = 0755;
constexpr mode_t file_mode = 0644;
constexpr int directory_flags = O_RDONLY | O_DIRECTORY | O_NOFOLLOW | O_CLOEXEC;
constexpr int file_flags = O_RDONLY | O_NOFOLLOW | O_NONBLOCK | O_CLOEXEC;

/// An open directory, and the path by which lines and exceptions call it.
struct place {
  int directory;
  std::string path;
  int levels_left = 64;  // so that no directory is too deep for the stack

  [[nodiscard]] std::string operator/(const std::string& name) const { return path + "/" + name; }
};

std::vector<std::string> names_in(const place& from) {
  // A descriptor of its own: closedir(3) closes it.
  const int directory = ::openat(from.directory, ".", directory_flags);
  check(directory >= 0, from.path);
  const std::unique_ptr<DIR, int (*)(DIR*)> list(::fdopendir(directory), ::closedir);
  check(list != nullptr, from.path);
  std::vector<std::string> names;
  while (true) {
    errno = 0;
    const dirent* const entry = ::readdir(list.get());
    check(entry != nullptr || errno == 0, from.path);
    if (entry == nullptr) return names;
    const std::string name = entry->d_name;
    if (name != "." && name != "..") names.push_back(name);
  }
}

/// Why an entry is not safe from others, who can exchange or write it meanwhile.
faults faults_of_owner(const struct stat& found, const std::string& path) {
  if (found.st_uid != 0 && found.st_uid != ::geteuid())
    return {fault("%s belongs to another user", {path}, "chown -R it")};
  if ((found.st_mode & (S_IWGRP | S_IWOTH)) != 0)
    return {fault("others than its owner can write %s", {path}, "chmod -R go-w it")};
  return {};
}

/// Why what is in a directory is not to be copied.
faults faults_of_directory(const place& from) {
  struct stat found {};
  check(::fstat(from.directory, &found) == 0, from.path);
  if (from.levels_left == 0) return {fault("%s lies too deep", {from.path})};
  return faults_of_owner(found, from.path);
}

void copy_file(const place& from, const place& to, const std::string& name) {
  const std::string path = from / name;
  const fs::descriptor source(::openat(from.directory, name.c_str(), file_flags));
  check(source.is_open(), path);
  const fs::descriptor copy(::openat(
      to.directory, name.c_str(), O_WRONLY | O_CREAT | O_EXCL | O_NOFOLLOW | O_CLOEXEC, file_mode));
  check(copy.is_open(), to / name);
  for (ssize_t count = 1; count > 0;) {
    count = ::sendfile(copy.get(), source.get(), nullptr, INT_MAX);
    check(count >= 0, path + " to " + (to / name));
  }
}

void copy_link(const place& from, const place& to, const std::string& name) {
  std::array<char, PATH_MAX> target;
  const ssize_t length = ::readlinkat(from.directory, name.c_str(), target.data(), target.size());
  check(length >= 0, from / name);
  const std::string content(target.data(), static_cast<std::size_t>(length));
  check(::symlinkat(content.c_str(), to.directory, name.c_str()) == 0, to / name);
}

/// The kind of an entry, as in st_mode; 0 where there is none.
mode_t kind_of(const place& from, const std::string& name) {
  struct stat found {};
  const int failed = ::fstatat(from.directory, name.c_str(), &found, AT_SYMLINK_NOFOLLOW);
  check(failed == 0 || errno == ENOENT, from / name);
  return found.st_mode & S_IFMT;
}

faults copy_directory(const place& from, const place& to, const std::string& name);

faults copy_entry(const place& from, const place& to, const std::string& name) {
  switch (kind_of(from, name)) {
    case S_IFDIR:
      return copy_directory(from, to, name);
    case S_IFREG:
      copy_file(from, to, name);
      return {};
    case S_IFLNK:
      copy_link(from, to, name);
      return {};
    default:
      return {fault("%s is neither a file, nor a directory, nor a link", {from / name})};
  }
}

faults copy_directory(const place& from, const place& to, const std::string& name) {
  const std::string path = to / name;
  const fs::descriptor source(::openat(from.directory, name.c_str(), directory_flags));
  check(source.is_open(), from / name);
  check(::mkdirat(to.directory, name.c_str(), directory_mode) == 0, path);
  const fs::descriptor copy(::openat(to.directory, name.c_str(), directory_flags));
  check(copy.is_open(), path);
  const place below{source.get(), from / name, from.levels_left - 1};
  faults found = faults_of_directory(below);
  if (found.empty()) {
    for (const std::string& entry : names_in(below))
      append(found, copy_entry(below, {copy.get(), path}, entry));
  }
  return found;
}

bool is_safe_below(const place& from) {
  if (!faults_of_directory(from).empty()) return false;
  return std::ranges::all_of(names_in(from), [&from](const std::string& name) {
    struct stat entry {};
    check(::fstatat(from.directory, name.c_str(), &entry, AT_SYMLINK_NOFOLLOW) == 0, from / name);
    if (!S_ISDIR(entry.st_mode))
      return S_ISLNK(entry.st_mode) || faults_of_owner(entry, from / name).empty();
    const fs::descriptor below(::openat(from.directory, name.c_str(), directory_flags));
    check(below.is_open(), from / name);
    return is_safe_below({below.get(), from / name, from.levels_left - 1});
  });
}

/// All that is in a tree: for each path, nothing for a directory, else what a link or a file holds.
std::map<std::string, std::string> contents_of(const std::filesystem::path& top) {
  std::map<std::string, std::string> all;
  if (!std::filesystem::is_directory(top)) return {};
  for (const auto& entry : std::filesystem::recursive_directory_iterator(top)) {
    std::string& content = all[entry.path().lexically_relative(top)];
    if (entry.is_symlink()) {
      content = "> " + link_target(entry.path());
    } else if (!entry.is_directory()) {
      content = "= " + read_file(entry.path()).value_or("unreadable " + entry.path().string());
    }
  }
  return all;
}

}  // namespace

faults copy_download(const std::string& from, const std::string& to) {
  const fs::descriptor source(::open(from.c_str(), O_RDONLY | O_DIRECTORY | O_CLOEXEC));
  check(source.is_open(), from);
  check(::mkdir(to.c_str(), directory_mode) == 0, to);
  const fs::descriptor copy(::open(to.c_str(), directory_flags));
  check(copy.is_open(), to);
  const place download{source.get(), from};
  faults found = faults_of_directory(download);
  if (!found.empty()) return found;
  for (const std::string name : {"zoneinfo", "icutz"}) {
    if (kind_of(download, name) == S_IFDIR) {
      append(found, copy_directory(download, {copy.get(), to}, name));
    } else {
      found.push_back(fault("%s is missing or no directory", {download / name}));
    }
  }
  return found;
}

bool is_safe_from_others(const std::string& path) {
  const fs::descriptor directory(::open(path.c_str(), directory_flags));
  check(directory.is_open(), path);
  return is_safe_below({directory.get(), path});
}

bool are_same(const std::string& one, const std::string& other) {
  return contents_of(one + "/zoneinfo") == contents_of(other + "/zoneinfo") &&
         contents_of(one + "/icutz") == contents_of(other + "/icutz");
}
