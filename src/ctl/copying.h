#pragma once

#include <string>

#include "ctl/fault.h"

/// Copies "zoneinfo" and "icutz" of the download in the directory `from` into the directory `to`,
/// which is not there yet. Directories get mode 0755, files 0644, links their content. Gives what
/// may not be copied:
/// - a directory that is owned by another than root, the caller or the storage's owner, or that
///   others than its owner can write: they could put a link to somebody else's file there
///   meanwhile;
/// - what is neither a file, nor a directory, nor a link.
/// No link of the download is followed. Throws std::system_error on every other failure. What was
/// copied until then stays.
[[nodiscard]] faults copy_download(const std::string& from, const std::string& to);

/// Gives the directories and files of the download at `path`, which lies in the storage, the modes
/// of a copy. No link is followed. Gives and throws what `copy_download` does.
[[nodiscard]] faults set_modes(const std::string& path);

/// Whether both directories hold the same: names, links and contents. Only regular files are read.
[[nodiscard]] bool are_same(const std::string& one, const std::string& other);
