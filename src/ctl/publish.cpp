#include <fcntl.h>
#include <sys/wait.h>
#include <unistd.h>

#include <cerrno>
#include <cstdio>
#include <filesystem>
#include <system_error>

#include "ctl/commands.h"
#include "ctl/completeness.h"
#include "ctl/copying.h"
#include "ctl/device.h"
#include "ctl/diagnosis.h"
#include "ctl/files.h"
#include "ctl/print.h"
#include "ctl/workplace.h"
#include "paths.h"
#include "startup/select_dataset.h"

namespace {

/// A download that is to be published.
struct candidate {
  std::string version;
  std::string directory;                // where it was fetched to
  std::string path = path_of(version);  // where it will be
};

bool is_same_directory(const std::string& one, const std::string& other) {
  std::error_code error;
  return std::filesystem::equivalent(one, other, error);
}

/// Whether tz_latest names a download other than the one at `path` that runs can use.
bool another_waits(const device& now, const std::string& path) {
  return now.latest_target != path && now.view.latest &&
         now.view.latest->compatible_schema(*now.view.system);
}

/// Why the version is not to be published: a run would not switch to it, or leave it again.
refusal judge_version(const device& now, const candidate& wanted) {
  using enum outcome;
  const vela_version version = version_of(wanted.version);
  if (now.withdrawn.contains(wanted.version))
    return {nothing_to_do,
            {fault("%s is withdrawn", {wanted.version}, "publish a higher version")}};
  const auto is_in_the_way = [&](const std::string& rival, const std::string& path) {
    return path != wanted.path && !(version > version_of(rival));
  };
  const auto refuse_for = [&](const std::string& rival, const char* what) -> refusal {
    return {nothing_to_do, {fault("%s is not newer than %s, %s", {wanted.version, what, rival})}};
  };
  if (is_in_the_way(now.system_version, ""))
    return refuse_for(now.system_version, "the system copy");
  const run_view& view = now.view;
  if (view.current_path == wanted.path) return {done, {}};
  if (view.current_path && view.current && may_stay(*view.current, *view.system) &&
      is_in_the_way(now.active_version, *view.current_path))
    return refuse_for(now.active_version, "the active copy");
  if (another_waits(now, wanted.path) && is_in_the_way(now.latest_version, now.latest_target))
    return refuse_for(now.latest_version, "the newest download");
  return {done, {}};
}

/// Why a download that is there is not fit to be named; empty where it is.
faults faults_of_download(const device& now, const std::string& path, const candidate& wanted) {
  faults found = faults_of_copy(path, wanted.version, wanted.directory);
  if (!now.zone.empty() && !has_zone(path, now.zone))
    found.push_back(
        fault("%s has not the local zone, %s", {wanted.directory + "/zoneinfo", now.zone}));
  return found;
}

/// Gives the download its name in one step; where a damaged one has it, the two change places.
refusal name_download(const std::string& path) {
  if (!is_there(path)) {
    check(::rename(new_download, path.c_str()) == 0, path.c_str());
  } else if (::renameat2(AT_FDCWD, new_download, AT_FDCWD, path.c_str(), RENAME_EXCHANGE) != 0) {
    check(errno == EINVAL || errno == ENOSYS, path.c_str());
    return {outcome::failed,
            {fault("%s is damaged, and this file system cannot replace it in one step", {path},
                   "kestrelctl back, remove it, and publish again")}};
  }
  return {outcome::done, {}};
}

/// Copies the download to a place of its own, checks the copy there, writes it to the disk, and
/// only then gives it its name.
refusal add_download(const device& now, const candidate& wanted) {
  const workshop made;
  faults found = copy_download(wanted.directory, new_download);
  if (found.empty()) found = faults_of_download(now, new_download, wanted);
  if (!found.empty()) return {outcome::unusable, found};
  sync_file_system(paths::downloads);
  return name_download(wanted.path);
}

/// Sees to it that the download is at its path, whole: it is there already, or it is copied there.
refusal place_download(const device& now, const candidate& wanted) {
  std::error_code error;
  if (!std::filesystem::is_directory(wanted.directory, error))
    return {outcome::unusable, {fault("%s is missing or no directory", {wanted.directory})}};
  if (is_same_directory(wanted.directory, wanted.path)) {
    faults found = set_modes(wanted.path);
    if (found.empty()) found = faults_of_download(now, wanted.path, wanted);
    if (!found.empty()) return {outcome::unusable, found};
  } else if (!is_there(wanted.path) || !faults_of_download(now, wanted.path, wanted).empty()) {
    return add_download(now, wanted);
  } else if (!are_same(wanted.directory, wanted.path)) {
    return {outcome::unusable,
            {fault("%s has other content", {wanted.path}, "publish this under a higher version")}};
  }
  return {outcome::done, {}};
}

/// Makes tz_latest name the download, unless it is the active one and a newer one waits. What is
/// named is on the disk before the name is.
void name_for_runs(const device& now, const candidate& wanted) {
  if (another_waits(now, wanted.path) &&
      version_of(now.latest_version) > version_of(wanted.version))
    return;
  if (!is_one_file_system()) sync_file_system(paths::downloads);
  replace_link(wanted.path, paths::latest_link, new_latest_link);
  sync_file_system(paths::storage);
}

/// Starts a run of kestrel, by the service manager where there is one, and waits for its end. Else
/// kestrel is found as this program was: beside it, or in the PATH.
void run_kestrel() {
  const std::string beside =
      std::filesystem::path(program_invocation_name).replace_filename("kestrel");
  const pid_t run = ::fork();
  if (run == 0 && ::seteuid(::getuid()) == 0 && ::setegid(::getgid()) == 0) {
    if (is_there("/run/systemd/system"))
      ::execlp("systemctl", "systemctl", "start", "kestrel.service", nullptr);
    ::execlp(beside.c_str(), "kestrel", nullptr);
  }
  if (run == 0) {
    complain(fault("kestrel is neither beside kestrelctl nor in the PATH", {}, "install it"));
    ::_exit(1);
  }
  ::waitpid(run, nullptr, 0);
}

/// Has runs switch to the download: two where the first one has to go back to the system copy.
outcome activate(const candidate& wanted) {
  device now = read_device();
  for (int runs = 0; runs < 2 && !is_active(now, wanted.path); ++runs) {
    run_kestrel();
    now = read_device();
  }
  if (is_active(now, wanted.path)) {
    say(wanted.version + " is active");
    return outcome::done;
  }
  complain(fault("%s is not active", {wanted.version}, "see the next lines"));
  complain_all(faults_of(now));
  return outcome::failed;
}

}  // namespace

outcome publish(const std::string& version, const std::string& directory) {
  const device now = read_device();
  const candidate wanted{version, directory};
  if (!now.view.system || !faults_of_link_places(now).empty()) {
    complain_all(faults_of(now));
    return outcome::failed;
  }
  if (const refusal no = judge_version(now, wanted); !no.reasons.empty()) return refuse(no);
  if (const refusal no = place_download(now, wanted); !no.reasons.empty()) return refuse(no);
  name_for_runs(now, wanted);
  if (::getuid() == 0) return activate(wanted);
  say(version +
      (is_active(now, wanted.path) ? " is active" : " waits for the next run of kestrel"));
  return outcome::done;
}
