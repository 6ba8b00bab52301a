#pragma once

#include <string>

#include "ctl/copies.h"

// The commands that change something. Each prints what it has done on standard output, and gives
// false where it refuses or fails, with the reasons on standard error. It throws `int` for a failed
// change of a link, which the library has printed, and std::exception for all else.

/// Publishes the download in `directory` as `version_text` and has kestrel switch to it. Refuses,
/// before anything is changed, a version that a run would not switch to or would leave again, what
/// is not complete, and other content under the name of a download that is there.
[[nodiscard]] bool publish(const std::string& version_text, const files::path& directory);

/// Makes the download `version_text` the active copy, or the system copy for the empty text, so
/// that the next run keeps it. Refuses a download that a run would leave again or that is not
/// complete.
[[nodiscard]] bool go_back(const std::string& version_text);

/// Removes from tz/ what no link in the storage names, and what a killed command left.
[[nodiscard]] bool prune();
