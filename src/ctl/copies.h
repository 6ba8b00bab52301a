#pragma once

#include <filesystem>
#include <string>

#include "dataset/vela_version.h"

// The copies of the data and the links to them, as a run finds them. The path of a copy is the
// directory of a download, or the empty text for the system copy.

namespace files = std::filesystem;

/// A copy, as a run compares it, and what is wrong with it.
struct copy {
  std::string path;
  std::string version_text = {};  // the path itself where it is that of no download
  vela_version version = {};      // unknown where the text is no version
  std::string fault = {};         // empty where the copy can be used
  bool fits = false;              // whether its schema is the system copy's
  bool ends_run = false;  // whether a run that reads it goes back to the system copy at once
};

/// The copy at `path`. Prints what `vela_version::parse` and `vela_icu` print; throws what the
/// constructor of the latter throws.
[[nodiscard]] copy examine(const std::string& path);

/// The copy that the zoneinfo link names. Where it names none, path and text are "none", and the
/// version is that of the system copy, with which a run continues.
[[nodiscard]] copy active_copy();

/// Whether both the zoneinfo and the ICU link are those of the copy at `path`.
[[nodiscard]] bool is_active(const std::string& path);

/// The target of a link; empty where there is no link or it cannot be read.
[[nodiscard]] std::string target_of(const char* link);

/// The name of the local zone, such as Europe/Paris; empty where it is not reached through the
/// zoneinfo link.
[[nodiscard]] std::string local_zone();

/// The file whose first word is the system copy's schema, such as 44l.
inline constexpr const char* schema_file = "/usr/share/icu/icutzformat.txt";
