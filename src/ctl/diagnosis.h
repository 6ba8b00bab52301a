#pragma once

#include <string>
#include <vector>

#include "ctl/device.h"
#include "ctl/fault.h"

/// What is wrong with the device. Empty only where every program reads whole data through libc and
/// ICU, and the next run changes nothing. Where `is_blind`, only what not everyone can read.
[[nodiscard]] faults faults_of(const device& now);

/// Whether the caller cannot read the copies, so that what was read of the device is not true.
[[nodiscard]] bool is_blind(const device& now);

/// What is in the place of a link to a copy and is no link, or keeps the list of withdrawn versions
/// from being read: no command changes the links then.
[[nodiscard]] faults faults_of_link_places(const device& now);

/// Why the download `version`, or the system copy for the empty text, is no copy to go back to.
/// Throws std::system_error where the disk or the system fails.
[[nodiscard]] faults faults_of_way_back(const device& now, const std::string& version);

/// The versions in tz/ that `back` accepts, oldest first. Throws std::system_error where the disk
/// or the system fails, so that nobody takes a copy for a bad one.
[[nodiscard]] std::vector<std::string> downloads_to_go_back_to(const device& now);
