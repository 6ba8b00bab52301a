#pragma once

#include <string>

#include "ctl/fault.h"

/// Copies "zoneinfo" and "icutz" of the download in the directory `from` into the directory `to`,
/// which is not there yet. Directories get mode 0755, files 0644, both less the umask. Gives what
/// may not be copied:
/// - a directory that is owned by another than root or the caller, or that others than its owner
///   can write: they could put a link to somebody else's file there meanwhile;
/// - what is neither a file, nor a directory, nor a link.
/// No link of the download is followed. Throws std::system_error on every other failure. What was
/// copied until then stays.
[[nodiscard]] faults copy_download(const std::string& from, const std::string& to);

/// Whether nobody but root and the caller can change what is below the directory at `path`. Throws
/// std::system_error.
[[nodiscard]] bool is_safe_from_others(const std::string& path);

/// Whether both directories hold the same: names, links and contents. Only regular files are read.
/// Throws std::system_error.
[[nodiscard]] bool are_same(const std::string& one, const std::string& other);
