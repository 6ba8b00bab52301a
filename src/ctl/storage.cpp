#include "ctl/storage.h"

#include <fcntl.h>
#include <grp.h>
#include <sys/file.h>
#include <sys/stat.h>
#include <unistd.h>

#include <cerrno>
#include <iostream>
#include <stdexcept>
#include <system_error>

#include "fs/operations.h"
#include "paths.h"

namespace {

void check(bool done, const char* path) {
  if (!done) throw std::system_error(errno, std::generic_category(), path);
}

int open_workplace() {
  struct stat owned {};
  static_cast<void>(::setgroups(0, nullptr));  // only root can, and only root has to
  for (const char* const place : {paths::storage, paths::downloads}) {
    check(::stat(place, &owned) == 0, place);
    if (::geteuid() == 0)
      check(::setegid(owned.st_gid) == 0 && ::seteuid(owned.st_uid) == 0, place);
  }
  check(::mkdir(workplace::path, S_IRWXU) == 0 || errno == EEXIST, workplace::path);
  return ::open(workplace::path, O_RDONLY | O_DIRECTORY | O_NOFOLLOW | O_CLOEXEC);
}

}  // namespace

workplace::workplace() : directory(open_workplace()) {
  check(directory.is_open(), path);
  struct stat locked {};
  // Another command may have locked and removed the directory since it was opened.
  if (::flock(directory.get(), LOCK_EX | LOCK_NB) != 0 || ::fstat(directory.get(), &locked) != 0 ||
      locked.st_nlink == 0)
    throw std::runtime_error("another kestrelctl is at work: start again when it has ended");
  for (const auto& entry : files::directory_iterator(path)) remove_and_say(entry);
}

workplace::~workplace() {
  std::error_code ignored;
  files::remove_all(path, ignored);
}

void workplace::sync() const {
  check(::syncfs(directory.get()) == 0, path);
}

void remove_and_say(const files::path& path) {
  if (files::remove_all(path) > 0) std::cout << "removed " << path.string() << '\n';
}

void name_newest(const std::string& path) {
  if (path.empty()) return fs::remove(paths::latest_link);
  if (fs::replace_symlink(path.c_str(), paths::latest_link, new_latest_link)) return;
  fs::remove(paths::latest_link);
  fs::create_symlink(path.c_str(), paths::latest_link);
}
