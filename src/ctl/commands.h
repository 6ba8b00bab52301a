#pragma once

#include <string>

#include "ctl/fault.h"

// The commands. Each finds out first, then acts, and prints what it has done or why it has not. It
// throws `int` for a change of a link that failed (see `reports`) and std::system_error for
// every other system call that failed.

/// Prints the state of the device, a line "name: value" for each fact, and what is wrong. `done`
/// means that nothing is.
[[nodiscard]] outcome print_status();

/// Publishes the download in `directory` as `version` and has kestrel switch to it.
[[nodiscard]] outcome publish(const std::string& version, const std::string& directory);

/// Makes the download `version` the active copy, or the system copy for the empty text, so that the
/// next run keeps it. Withdraws the higher versions that it leaves.
[[nodiscard]] outcome go_back(const std::string& version);

/// Removes the downloads that no link names, but for the newest that `go_back` accepts.
[[nodiscard]] outcome prune();

/// Makes `name`, such as Europe/Paris, the local zone.
[[nodiscard]] outcome set_zone(const std::string& name);
