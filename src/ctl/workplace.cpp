#include "ctl/workplace.h"

#include <fcntl.h>
#include <grp.h>
#include <sys/file.h>
#include <sys/stat.h>
#include <unistd.h>

#include <cerrno>
#include <cstring>
#include <filesystem>
#include <system_error>

#include "ctl/files.h"
#include "ctl/reports.h"
#include "fs/operations.h"
#include "paths.h"

namespace {

/// Whether a link that cannot be made or replaced in one step, with this number, may be made after
/// a removal: something that is no link is in the way, or the removal makes room.
bool may_remove_first(int error) {
  return error == EEXIST || error == ENOSPC || error == EDQUOT;
}

}  // namespace

void become_storage_owner() {
  struct stat storage {};
  if (::geteuid() != 0 || ::stat(paths::storage, &storage) != 0 || storage.st_uid == 0) return;
  check(::setgroups(0, nullptr) == 0 && ::setegid(storage.st_gid) == 0 &&
            ::seteuid(storage.st_uid) == 0,
        paths::storage);
}

faults faults_of_storage() {
  const bool is_root = ::getuid() == 0;
  faults found;
  for (const std::string path : {paths::storage, paths::downloads}) {
    struct stat directory {};
    const bool is_there = ::stat(path.c_str(), &directory) == 0;
    if (!is_there || ::faccessat(AT_FDCWD, path.c_str(), W_OK | X_OK, AT_EACCESS) != 0) {
      found.push_back(fault("%s cannot be changed", {path}, std::strerror(errno)));
    } else if (is_root && directory.st_uid != ::geteuid()) {
      found.push_back(fault("%s has another owner than %s", {path, paths::storage}, "chown it"));
    } else if (is_root && (directory.st_mode & (S_IWGRP | S_IWOTH)) != 0) {
      found.push_back(fault("others than its owner can write %s", {path}, "chmod go-w it"));
    }
  }
  return found;
}

storage_lock::storage_lock()
    : directory(::open(paths::downloads, O_RDONLY | O_CLOEXEC)),
      held(directory.is_open() && ::flock(directory.get(), LOCK_EX | LOCK_NB) == 0) {
  check(held || (directory.is_open() && errno == EWOULDBLOCK), paths::downloads);
}

workshop::workshop() {
  check(::mkdir(workshop_path, 0755) == 0, workshop_path);
}

workshop::~workshop() {
  std::error_code ignored;
  std::filesystem::remove_all(workshop_path, ignored);
}

bool clear_leftovers() {
  std::error_code ignored;
  fs::unstage_symlink(new_latest_link);
  std::filesystem::remove(new_withdrawn_list, ignored);
  const auto removed = std::filesystem::remove_all(workshop_path, ignored);
  return !ignored && removed > 0;
}

void stage_link(const std::string& target, const char* link, const char* staged) {
  forget_reports();  // what was read is told in other words
  if (fs::stage_symlink(target.c_str(), staged)) return;
  const int error = errno;
  fs::require_room(target.c_str(), link);
  errno = error;
  check(may_remove_first(error), staged);
}

void replace_link(const std::string& target, const char* link, const char* staged) {
  if (fs::is_symlink_to(target.c_str(), link)) return;
  stage_link(target, link, staged);
  if (fs::replace_symlink(target.c_str(), link, staged)) return;
  check(may_remove_first(errno), link);
  fs::remove(link);
  fs::create_symlink(target.c_str(), link);
}

void sync_file_system(const char* directory) {
  const fs::descriptor opened(::open(directory, O_RDONLY | O_CLOEXEC));
  check(opened.is_open() && ::syncfs(opened.get()) == 0, directory);
}
