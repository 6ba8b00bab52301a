#pragma once

#include <optional>
#include <string>

#include "dataset/vela_dataset.h"

/// What a run reads before it decides.
struct run_view {
  // Absent where the run that reads it throws.
  std::optional<vela_dataset> system;
  std::optional<vela_dataset> current;      // the system copy, where its path is absent
  std::optional<vela_dataset> latest;       // the system copy, where its path is absent or empty
  std::optional<std::string> current_path;  // absent where the zoneinfo link names no copy
  std::optional<std::string> latest_path;   // empty where there is no tz_latest

  // Whether the disk or the system failed to read some of it.
  bool is_uncertain = false;

  // What decides whether the links can be changed.
  bool can_change_storage = false;
  bool is_zoneinfo_directory = false;
  bool is_icutz_directory = false;
  bool is_system_active = false;  // zoneinfo names the system copy, and there is no icutz to remove
  bool has_to_finish = false;     // a killed run left the ICU link of the current download undone
};

/// What a run does with the links to the active copy.
struct next_run {
  enum class action { keeps, goes_back, switches, fails };
  action what;
  std::string path = {};  // of the download that the run switches to
};

/// Reads the device as a run does. Prints nothing.
[[nodiscard]] run_view read_as_a_run();

/// What a run that reads this does. It has the decisions of `select_dataset`, in its order.
[[nodiscard]] next_run decide(const run_view& view);

/// "keeps the active copy", "goes back to the system copy", "switches to PATH" or
/// "fails: it leaves the links as they are".
[[nodiscard]] std::string to_text(const next_run& run);
