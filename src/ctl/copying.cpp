#include "ctl/copying.h"

#include <dirent.h>
#include <fcntl.h>
#include <sys/stat.h>
#include <unistd.h>

#include <array>
#include <cerrno>
#include <climits>
#include <cstddef>
#include <filesystem>
#include <map>
#include <memory>
#include <system_error>
#include <vector>

#include "ctl/files.h"
#include "ctl/workplace.h"
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

  [[nodiscard]] std::string path_of(const std::string& name) const { return path + "/" + name; }
};

std::vector<std::string> names_in(const place& from) {
  // A descriptor of its own: closedir(3) closes it.
  const std::unique_ptr<DIR, int (*)(DIR*)> list(
      ::fdopendir(::openat(from.directory, ".", directory_flags)), ::closedir);
  check(list != nullptr, from.path.c_str());
  std::vector<std::string> names;
  while (const dirent* const entry = ::readdir(list.get())) {
    const std::string name = entry->d_name;
    if (name != "." && name != "..") names.push_back(name);
  }
  return names;
}

/// Why what is in a directory is not to be copied: others can exchange it meanwhile, for example.
faults faults_of_directory(const place& from) {
  struct stat found {};
  check(::fstat(from.directory, &found) == 0, from.path.c_str());
  const uid_t owner = found.st_uid;
  if (owner != 0 && owner != ::getuid() && owner != ::geteuid())
    return {fault("%s belongs to another user", {from.path}, "chown -R it")};
  if (from.levels_left == 0) return {fault("%s lies too deep", {from.path})};
  if ((found.st_mode & (S_IWGRP | S_IWOTH)) != 0)
    return {fault("others than its owner can write %s", {from.path}, "chmod -R go-w it")};
  return {};
}

void copy_file(const place& from, const place& to, const std::string& name) {
  const std::string path = from.path_of(name);
  const fs::descriptor source(::openat(from.directory, name.c_str(), file_flags));
  struct stat found {};
  check(source.is_open() && ::fstat(source.get(), &found) == 0, path.c_str());
  if (!S_ISREG(found.st_mode)) errno = EINVAL;
  check(S_ISREG(found.st_mode), path.c_str());
  const fs::descriptor copy(::openat(
      to.directory, name.c_str(), O_WRONLY | O_CREAT | O_EXCL | O_NOFOLLOW | O_CLOEXEC, file_mode));
  check(copy.is_open() && ::fchmod(copy.get(), file_mode) == 0, to.path_of(name).c_str());
  std::array<char, 65536> block;
  for (ssize_t count = 1; count > 0;) {
    count = ::read(source.get(), block.data(), block.size());
    check(count >= 0, path.c_str());
    for (ssize_t done = 0; done < count;) {
      const ssize_t written =
          ::write(copy.get(), block.data() + done, static_cast<std::size_t>(count - done));
      check(written > 0, to.path_of(name).c_str());
      done += written;
    }
  }
}

void copy_link(const place& from, const place& to, const std::string& name) {
  std::array<char, PATH_MAX> target;
  const ssize_t length = ::readlinkat(from.directory, name.c_str(), target.data(), target.size());
  check(length >= 0, from.path_of(name).c_str());
  const std::string content(target.data(), static_cast<std::size_t>(length));
  check(::symlinkat(content.c_str(), to.directory, name.c_str()) == 0, to.path_of(name).c_str());
}

/// The kind of an entry, as in st_mode; 0 where there is none.
mode_t kind_of(const place& from, const std::string& name) {
  struct stat found {};
  const bool is_there = ::fstatat(from.directory, name.c_str(), &found, AT_SYMLINK_NOFOLLOW) == 0;
  check(is_there || errno == ENOENT, from.path_of(name).c_str());
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
      return {fault("%s is neither a file, nor a directory, nor a link", {from.path_of(name)})};
  }
}

void append(faults& all, const faults& more) {
  all.insert(all.end(), more.begin(), more.end());
}

faults copy_directory(const place& from, const place& to, const std::string& name) {
  const std::string path = to.path_of(name);
  const fs::descriptor source(::openat(from.directory, name.c_str(), directory_flags));
  check(source.is_open(), from.path_of(name).c_str());
  check(::mkdirat(to.directory, name.c_str(), S_IRWXU) == 0, path.c_str());
  const fs::descriptor copy(::openat(to.directory, name.c_str(), directory_flags));
  check(copy.is_open(), path.c_str());
  const place below{source.get(), from.path_of(name), from.levels_left - 1};
  faults found = faults_of_directory(below);
  if (found.empty()) {
    for (const std::string& entry : names_in(below))
      append(found, copy_entry(below, {copy.get(), path}, entry));
  }
  check(::fchmod(copy.get(), directory_mode) == 0, path.c_str());
  return found;
}

faults set_modes_below(const place& from) {
  check(::fchmod(from.directory, directory_mode) == 0, from.path.c_str());
  faults found = faults_of_directory(from);
  if (!found.empty()) return found;
  for (const std::string& name : names_in(from)) {
    const mode_t kind = kind_of(from, name);
    if (kind != S_IFDIR && kind != S_IFREG) continue;
    const fs::descriptor entry(
        ::openat(from.directory, name.c_str(), kind == S_IFDIR ? directory_flags : file_flags));
    check(entry.is_open(), from.path_of(name).c_str());
    if (kind == S_IFREG) {
      check(::fchmod(entry.get(), file_mode) == 0, from.path_of(name).c_str());
    } else {
      append(found, set_modes_below({entry.get(), from.path_of(name), from.levels_left - 1}));
    }
  }
  return found;
}

/// All that is in a tree: for each path, "/" for a directory, else a link's or a file's content.
std::map<std::string, std::string> contents_of(const std::filesystem::path& top) {
  std::map<std::string, std::string> all;
  std::error_code error;
  std::filesystem::recursive_directory_iterator entry(top, error);
  for (const decltype(entry) end; !error && entry != end; entry.increment(error)) {
    std::string& content = all[entry->path().lexically_relative(top)];
    if (entry->is_symlink(error)) {
      content = "> " + link_target(entry->path());
    } else if (entry->is_directory(error)) {
      content = "/";
    } else {
      content = "= " + read_file(entry->path()).value_or("unreadable " + entry->path().string());
    }
  }
  if (error) all[""] = "unreadable " + top.string();
  return all;
}

}  // namespace

faults copy_download(const std::string& from, const std::string& to) {
  const fs::descriptor source(::open(from.c_str(), O_RDONLY | O_DIRECTORY | O_CLOEXEC));
  check(source.is_open(), from.c_str());
  check(::mkdir(to.c_str(), directory_mode) == 0, to.c_str());
  const fs::descriptor copy(::open(to.c_str(), directory_flags));
  check(copy.is_open() && ::fchmod(copy.get(), directory_mode) == 0, to.c_str());
  const place download{source.get(), from};
  faults found = faults_of_directory(download);
  if (!found.empty()) return found;
  for (const std::string name : {"zoneinfo", "icutz"}) {
    if (kind_of(download, name) == S_IFDIR) {
      append(found, copy_directory(download, {copy.get(), to}, name));
    } else {
      found.push_back(fault("%s is missing or no directory", {download.path_of(name)}));
    }
  }
  return found;
}

faults set_modes(const std::string& path) {
  const fs::descriptor directory(::open(path.c_str(), directory_flags));
  check(directory.is_open(), path.c_str());
  return set_modes_below({directory.get(), path});
}

bool are_same(const std::string& one, const std::string& other) {
  return contents_of(one + "/zoneinfo") == contents_of(other + "/zoneinfo") &&
         contents_of(one + "/icutz") == contents_of(other + "/icutz");
}
