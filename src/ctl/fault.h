#pragma once

#include <string>
#include <vector>

/// Something that is wrong.
struct fault {
  std::string what;       // begins with the thing at fault, mostly a path
  std::string cure = {};  // what to do about it; empty where `what` says enough
};
using faults = std::vector<fault>;

/// How a command ends: its exit status.
enum class outcome {
  done = 0,           // or nothing is wrong
  failed = 1,         // or something is wrong with the device
  wrong_usage = 2,    // or a text that is no version
  nothing_to_do = 3,  // the version is not newer, or withdrawn
  unusable = 4,       // the download, or the copy or the zone that was asked for
  not_now = 5,        // another command is at work, or there is no room
};

/// Why a command does not do what it was asked for.
struct refusal {
  outcome status;
  faults reasons;
};
