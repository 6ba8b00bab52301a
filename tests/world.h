#pragma once

#include <gtest/gtest.h>

#include <ostream>
#include <string>
#include <vector>

/// One run of the built binary over one world.
///
/// Worlds are told entry by entry, separated by blanks; the directories above an entry come by
/// themselves. A path that does not begin with "/" lies in /var/db/timezone, which "~" stands for
/// in a link's content:
///
///     PATH>CONTENT  a link      PATH/  a directory    PATH%MODE  the mode of what stands there
///     PATH=CONTENT  a file      PATH|  a FIFO         -PATH      nothing (after the run)
struct scene {
  const char* name;
  std::string before;
  std::vector<std::string> says;  // standard error, line by line, without "kestrel: "
  std::string changes;            // all else is the same entry as before, by inode and content
  bool powerless = false;         // run without root's power over modes
};

/// The entries of a system copy and of a download that are sound.
std::string system_copy(const std::string& version, const std::string& schema);
std::string download(const std::string& version, const std::string& schema);

/// Makes the world consist of `entries`.
void make_world(const std::string& entries);

class Run : public testing::TestWithParam<scene> {};

/// How scenes are named in the names of their tests and in failures.
std::string scene_name(const testing::TestParamInfo<scene>& tested);
void PrintTo(const scene& tested, std::ostream* out);
