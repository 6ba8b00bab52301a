#pragma once

#include <string>

#include "ctl/fault.h"
#include "fs/descriptor.h"

// The ground on which the commands that change something work.

/// Where `publish` makes a download. Below tz/, so that one rename gives it its name.
inline constexpr const char* workshop_path = "/var/db/timezone/tz/.kestrelctl";
inline constexpr const char* new_download = "/var/db/timezone/tz/.kestrelctl/download";

/// The names under which a new tz_latest and a new list of withdrawn versions are made.
inline constexpr const char* new_latest_link = "/var/db/timezone/tz_latest.new";
inline constexpr const char* new_withdrawn_list = "/var/db/timezone/withdrawn.new";

/// Throws std::system_error with the number in errno and the path, where `done` is false.
void check(bool done, const char* path);

/// As root, continues as the owner of the storage: nothing that this owner has put there leads to a
/// file of root's then. Does nothing for other users. Throws std::system_error where it cannot.
void become_storage_owner();

/// Why the caller cannot safely change the storage: it is missing or not the caller's, or, for
/// root, others than its owner can write it. To be called after `become_storage_owner`.
[[nodiscard]] faults faults_of_storage();

/// The lock that keeps two commands apart: flock(2) on tz/. The kernel frees it when the command
/// ends, however that is.
class storage_lock final {
 public:
  /// Tries to take the lock, and does not wait. Throws std::system_error where tz/ cannot be
  /// opened.
  storage_lock();

  /// Whether this command has the lock; if not, another one is at work.
  [[nodiscard]] bool is_held() const { return held; }

 private:
  fs::descriptor directory;
  bool held;
};

/// The directory at `workshop_path`, while it is needed.
class workshop final {
 public:
  /// Makes it. Throws std::system_error on failure.
  workshop();

  /// Removes it with all that is in it.
  ~workshop();

  workshop(const workshop&) = delete;
  workshop& operator=(const workshop&) = delete;
};

/// Removes what a killed command left, so that a full disk has that room again. Prints each path on
/// standard output. To be called with the lock. Throws std::system_error on failure.
void clear_leftovers();

/// Removes what is at `path`, with all that is in it, and prints "removed PATH" on standard output;
/// does nothing where there is nothing. Throws std::system_error on failure.
void remove_and_say(const std::string& path);

/// Replaces `link` by a link to `target`, staged at `staged`: in one step, or by a removal and a
/// creation. Throws `int` where that fails.
void replace_link(const std::string& target, const char* link, const char* staged);

/// Whether the storage and tz/ are on one file system.
[[nodiscard]] bool is_one_file_system();

/// Writes all that the file system of `directory` holds to the disk. Throws std::system_error.
void sync_file_system(const char* directory);
