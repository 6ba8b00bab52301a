#include <system_error>

#include "ctl/commands.h"
#include "ctl/device.h"
#include "ctl/diagnosis.h"
#include "ctl/files.h"
#include "ctl/print.h"
#include "ctl/reports.h"
#include "ctl/withdrawn.h"
#include "ctl/workplace.h"
#include "dataset/vela_dataset.h"
#include "dataset/vela_icu.h"
#include "dataset/vela_zoneinfo.h"
#include "fs/operations.h"
#include "paths.h"

namespace {

/// The list after the way back to `version`, "" for the system copy: with the higher versions that
/// it leaves, and without `version`.
version_set withdrawn_after(const device& now, const std::string& version) {
  const vela_version target = version_of(version.empty() ? now.system_version : version);
  version_set withdrawn = now.withdrawn.value_or(version_set());
  for (const std::string& left : {now.active_version, now.latest_version})
    if (version_of(left) > target) withdrawn.insert(left);
  withdrawn.erase(version);
  return withdrawn;
}

/// The way back has priority: where the list cannot be written, it goes on.
void withdraw(const device& now, const version_set& withdrawn) {
  if (!now.withdrawn) return complain(fault("%s cannot be read", {withdrawn_list}, "remove it"));
  if (withdrawn == *now.withdrawn) return;
  try {
    write_withdrawn(withdrawn);
  } catch (const std::system_error& failure) {
    for (const std::string& version : withdrawn) {
      if (!now.withdrawn->contains(version)) {
        complain(fault("%s is not withdrawn, and a downloader may publish it again", {version},
                       failure.what()));
      }
    }
    for (const std::string& version : *now.withdrawn) {
      if (!withdrawn.contains(version))
        complain(fault("%s is still withdrawn", {version}, failure.what()));
    }
  }
}

void name_newest(const std::string& path) {
  if (path.empty()) {
    fs::remove(paths::latest_link);
  } else {
    replace_link(path, paths::latest_link, new_latest_link);
  }
}

}  // namespace

outcome go_back(const std::string& version) {
  const device now = read_device();
  const std::string path = version.empty() ? "" : path_of(version);
  if (is_blind(now)) return refuse({outcome::failed, faults_of(now)});
  if (const faults found = faults_of_link_places(now); !found.empty())
    return refuse({outcome::failed, found});
  if (const faults found = faults_of_way_back(now, version); !found.empty())
    return refuse({outcome::unusable, found});
  // Both new links are staged before anything is changed: what fails then changes nothing.
  const bool is_done = is_active(now, path) && !is_there(paths::new_icu_link);
  if (!is_done) {
    stage_link(zoneinfo_directory(path), paths::zoneinfo_link, paths::new_zoneinfo_link);
    if (!path.empty()) stage_link(icu_directory(path), paths::icu_link, paths::new_icu_link);
  }
  withdraw(now, withdrawn_after(now, version));
  name_newest(path);  // before the rest, so that no run in between undoes that
  if (!is_done) vela_dataset(path).activate();
  const faults failed_calls = reports();
  sync_file_system(paths::storage);

  const device then = read_device();
  const std::string name = path.empty() ? then.system_version : version;
  if (is_active(then, path)) {
    say(name + " is active");
    return outcome::done;
  }
  complain(fault("%s is not active", {name}, "see the next lines"));
  complain_all(failed_calls);
  complain_all(faults_of(then));
  return outcome::failed;
}
