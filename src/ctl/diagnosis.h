#pragma once

#include <set>
#include <string>
#include <vector>

#include "ctl/device.h"
#include "ctl/fault.h"

/// What is wrong with the device. Empty only where every program reads whole data through libc and
/// ICU, and the next run changes nothing. Where `is_blind`, only what not everyone
/// can read, and places that are missing.
[[nodiscard]] faults faults_of(const device& now);

/// Whether the caller cannot read the copies, so that what was read of the device is not true.
[[nodiscard]] bool is_blind(const device& now);

/// What is in the place of a link to a copy and is no link.
[[nodiscard]] faults faults_of_link_places(const device& now);

/// What keeps every download from being published: places that not everyone can read, the system
/// copy, what is in the place of a link, and a list of withdrawn versions that cannot be read.
[[nodiscard]] faults faults_of_ground(const device& now);

/// Why the download `version`, or the system copy for the empty text, is no copy to go back to.
/// Throws std::system_error where the disk or the system fails.
[[nodiscard]] faults faults_of_way_back(const device& now, const std::string& version);

/// The downloads in tz/, as `back` sees them.
struct ways_back {
  std::vector<std::string> accepted;  // versions, oldest first
  std::set<std::string> unread;       // versions of which nobody knows, as reading them failed
  faults reasons;                     // why it failed
};
[[nodiscard]] ways_back find_ways_back(const device& now);
