#pragma once

#include <optional>
#include <string>

#include "ctl/next_run.h"
#include "ctl/withdrawn.h"
#include "dataset/vela_version.h"

/// The file whose first word is the system copy's release, such as 2026b.
inline constexpr const char* system_version_file = "/usr/share/zoneinfo.default/+VERSION";

/// What the commands know of the links and versions of the device. Read once; they decide by it.
struct device {
  run_view view;
  next_run next{next_run::action::keeps};

  // The contents of links, empty where there is none.
  std::string zoneinfo_target;
  std::string icutz_target;
  std::string latest_target;
  std::string localtime_target;

  std::string active_path;     // of the download that is active; empty where none is
  std::string system_version;  // the version texts of the copies, as a run has them
  std::string active_version;  // empty where the zoneinfo link names no copy
  std::string latest_version;  // empty where there is no tz_latest
  std::string system_schema;
  std::string zone;  // the local zone's name; empty where it is not reached through zoneinfo
  std::optional<version_set> withdrawn;  // absent where the list cannot be read
};

/// Reads the device; prints nothing. Waits for nothing, whatever the storage holds.
[[nodiscard]] device read_device();

/// Whether both the zoneinfo and the ICU link are those of the copy at `path`.
[[nodiscard]] bool is_active(const device& now, const std::string& path);

/// The path of a download.
[[nodiscard]] std::string path_of(const std::string& version);

/// The version that a text names; the unknown one where it names none.
[[nodiscard]] vela_version version_of(const std::string& text);
