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

/// As root, continues as the owner of the storage, if that is another user: nothing that this owner
/// has put there leads to a file of root's then. Throws std::system_error where it cannot.
void become_storage_owner();

/// Why the caller cannot safely change the storage: it is missing or not the caller's, or, for
/// root, others than its owner can write it. To be called after `become_storage_owner`.
[[nodiscard]] faults faults_of_storage();

/// The lock that keeps two commands apart: flock(2) on tz/. The kernel frees it when the command
/// ends, however that is.
class storage_lock final {
 public:
  /// Tries to take the lock, and does not wait. Throws std::system_error where that fails
  /// otherwise.
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

/// Removes what a killed command left, so that a full disk has that room again. Whether it removed
/// a download. To be called with the lock. What cannot be removed stays: a way back needs none of
/// it.
[[nodiscard]] bool clear_leftovers();

/// Makes sure that a link to `target` is at `staged`, for `link`, before anything is changed. Not
/// so where something that is no link is at `staged`, or where there is no room but a removal makes
/// some. Throws `int` where there is no room, and std::system_error for all else.
void stage_link(const std::string& target, const char* link, const char* staged);

/// Makes `link`, which is no directory, a link to `target`, staged at `staged`: in one step or,
/// where something that is no link is at `staged`, or a removal makes room, by a removal and a
/// creation. Throws what `stage_link` does, and `int`.
void replace_link(const std::string& target, const char* link, const char* staged);

/// Writes all that the file system of `directory` holds to the disk. Throws std::system_error.
void sync_file_system(const char* directory);
