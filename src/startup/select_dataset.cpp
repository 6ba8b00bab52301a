#include "startup/select_dataset.h"

#include <cerrno>
#include <string>
#include <utility>

#include "dataset/vela_dataset.h"
#include "fs/file.h"
#include "fs/report.h"
#include "paths.h"
#include "startup/dataset_links.h"

namespace {

/// The current dataset's path; after a failure to find it, that of the system copy, now active.
std::string current_path_or_reset() {
  try {
    return current_dataset_path();
  } catch (...) {
    fs::report(errno, "Invalid current symlinks; resetting to system partition");
    reset_to_system();
    return {};
  }
}

}  // namespace

void select_dataset() {
  const vela_dataset system;
  std::string latest_path = latest_dataset_path();
  const vela_dataset current(current_path_or_reset());
  current.finish();
  const vela_dataset* baseline = &current;
  if (!current.compatible_schema(system) || system > current) {
    fs::report(0, "Symlink points at data incompatible with installed system");
    reset_to_system();
    baseline = &system;
  }

  if (latest_path.empty()) return;
  const vela_dataset latest(std::move(latest_path));
  // Against the current dataset, not the baseline: a download older than the system copy still
  // replaces an even older one.
  if (latest.compatible_schema(system) && latest > current) {
    // Made first: once the download is active, nothing may fail but the writing.
    const std::string record = baseline->get_version_string() + "_" + latest.get_version_string();
    latest.activate();
    fs::write_file(paths::record, record);
  } else {
    fs::report(0, "New update not compatible or older version: %s vs. %s",
               {latest.get_version_string().c_str(), current.get_version_string().c_str()});
  }
}
