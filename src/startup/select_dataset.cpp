#include "startup/select_dataset.h"

#include <cerrno>
#include <string>

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

bool may_stay(const vela_dataset& current, const vela_dataset& system) {
  return current.compatible_schema(system) && !(system > current);
}

bool may_replace(const vela_dataset& latest, const vela_dataset& current,
                 const vela_dataset& system) {
  return latest.compatible_schema(system) && latest > current;
}

void select_dataset() {
  const vela_dataset system;
  const std::string latest_path = latest_dataset_path();
  const vela_dataset current(current_path_or_reset());
  const bool stays = may_stay(current, system);
  if (stays) {
    current.finish();
  } else {
    fs::report(0, "Symlink points at data incompatible with installed system");
    reset_to_system();
  }

  if (latest_path.empty()) return;
  const vela_dataset latest(latest_path);
  if (may_replace(latest, current, system)) {
    // Made first: once the download is active, nothing may fail but the writing.
    const vela_dataset& baseline = stays ? current : system;
    const std::string record = baseline.get_version_string() + "_" + latest.get_version_string();
    latest.activate();
    fs::write_file(paths::record, record);
  } else {
    fs::report(0, "New update not compatible or older version: %s vs. %s",
               {latest.get_version_string().c_str(), current.get_version_string().c_str()});
  }
}
