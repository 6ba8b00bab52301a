#pragma once

#include <string>

#include "ctl/copies.h"
#include "fs/descriptor.h"

/// The directory below tz/ in which a download is made, and the lock that keeps two commands apart.
/// Only who may write the storage can open it, and the kernel frees the lock of a killed command.
class workplace final {
 public:
  static constexpr const char* path = "/var/db/timezone/tz/.kestrelctl";

  /// Takes the lock, and removes and prints what a killed command left. As root, the program
  /// continues as the owner of the storage: then nothing that this owner has put there leads to a
  /// file of root's, and the owner can remove what is made. Throws std::runtime_error where another
  /// command has the lock, and std::system_error where the directory cannot be made or used.
  workplace();

  /// Removes the directory with all that is in it.
  ~workplace();

  /// Writes all that its file system holds to the disk. Throws std::system_error on failure.
  void sync() const;

  workplace(const workplace&) = delete;
  workplace& operator=(const workplace&) = delete;

 private:
  fs::descriptor directory;
};

/// The name under which a new tz_latest is staged.
inline constexpr const char* new_latest_link = "/var/db/timezone/tz/.kestrelctl/tz_latest";

/// Removes what is at `path`, with all that is in it, and prints its path on standard output; does
/// nothing where there is nothing. Throws std::system_error on failure.
void remove_and_say(const files::path& path);

/// Makes tz_latest name the download at `path`, in one step or by a removal and a creation; removes
/// it for the empty path. Throws `int` where that fails; the library has printed it.
void name_newest(const std::string& path);
