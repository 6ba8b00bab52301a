#include <fcntl.h>
#include <sys/syscall.h>
#include <sys/wait.h>
#include <unistd.h>

#include <algorithm>
#include <cerrno>
#include <cstdio>
#include <cstring>
#include <filesystem>
#include <optional>
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

/// Whether tz_latest names a download other than the one at `path` that runs can use.
bool another_waits(const device& now, const std::string& path) {
  return now.latest_target != path && now.view.latest &&
         now.view.latest->compatible_schema(*now.view.system);
}

/// Why the version is not to be published: a run would not switch to it, or leave it again.
std::optional<refusal> judge_version(const device& now, const candidate& wanted) {
  using enum outcome;
  const vela_version version = version_of(wanted.version);
  const auto is_wanted = [&](const std::string& other) { return version_of(other) == version; };
  if (now.view.current_path != wanted.path && std::ranges::any_of(*now.withdrawn, is_wanted)) {
    return refusal{nothing_to_do,
                   {fault("%s is withdrawn", {wanted.version}, "publish a higher version")}};
  }
  const auto is_in_the_way = [&](const std::string& rival, const std::string& path) {
    return path != wanted.path && !(version > version_of(rival));
  };
  const auto refuse_for = [&](const std::string& rival, const char* what) {
    return refusal{nothing_to_do,
                   {fault("%s is not newer than %s, %s", {wanted.version, what, rival})}};
  };
  if (is_in_the_way(now.system_version, ""))
    return refuse_for(now.system_version, "the system copy");
  const run_view& view = now.view;
  if (view.current_path == wanted.path) return {};
  if (view.current && may_stay(*view.current, *view.system) &&
      is_in_the_way(now.active_version, now.active_path))
    return refuse_for(now.active_version, "the active copy");
  if (another_waits(now, wanted.path) && is_in_the_way(now.latest_version, now.latest_target))
    return refuse_for(now.latest_version, "the newest download");
  return {};
}

/// Why a download that is there is not fit to be named; empty where it is.
faults faults_of_download(const device& now, const std::string& path, const candidate& wanted) {
  faults found = faults_of_copy(path, wanted.version, wanted.directory);
  if (!now.zone.empty() && !has_zone(path, now.zone)) {
    found.push_back(
        fault("%s has not the local zone, %s", {wanted.directory + "/zoneinfo", now.zone}));
  }
  return found;
}

/// Has two entries change places. Not every C library has renameat2(2).
bool exchange(const char* one, const char* other) {
  constexpr unsigned exchange_flag = 2;
  return ::syscall(SYS_renameat2, AT_FDCWD, one, AT_FDCWD, other, exchange_flag) == 0;
}

/// Gives the download its name in one step; where a damaged one has it, the two change places.
std::optional<refusal> name_download(const std::string& path) {
  if (!is_there(path)) {
    check(::rename(new_download, path.c_str()) == 0, path);
  } else if (!exchange(new_download, path.c_str())) {
    check(errno == EINVAL || errno == ENOSYS, path);
    return refusal{outcome::failed,
                   {fault("this file system cannot replace %s in one step", {path},
                          "publish the data under a higher version")}};
  }
  return {};
}

/// Copies the download to a place of its own, checks the copy there, writes it to the disk, and
/// only then gives it its name.
std::optional<refusal> add_download(const device& now, const candidate& wanted) {
  const workshop made;
  faults found = copy_download(wanted.directory, new_download);
  if (found.empty()) found = faults_of_download(now, new_download, wanted);
  if (!found.empty()) return refusal{outcome::unusable, found};
  sync_file_system(paths::downloads);
  return name_download(wanted.path);
}

/// Whether a whole download is at the path already. One that cannot be read is as good as none.
bool is_whole_there(const device& now, const candidate& wanted) {
  try {
    return link_target(wanted.path).empty() && faults_of_download(now, wanted.path, wanted).empty();
  } catch (const std::system_error&) {
    return false;
  }
}

/// Sees to it that the download is at its path. One that is there and whole stays, unless others
/// can change it: a copy with the same content takes its place then.
std::optional<refusal> place_download(const device& now, const candidate& wanted) {
  if (!leads_to_directory(wanted.directory)) {
    return refusal{outcome::unusable, {fault("%s is missing or no directory", {wanted.directory})}};
  }
  if (!is_whole_there(now, wanted)) return add_download(now, wanted);
  if (!are_same(wanted.directory, wanted.path)) {
    return refusal{
        outcome::unusable,
        {fault("%s has other content", {wanted.path}, "publish this under a higher version")}};
  }
  if (!is_safe_from_others(wanted.path)) return add_download(now, wanted);
  return {};
}

/// Makes tz_latest name the download, unless it is the active one and a newer one waits. What is
/// named is on the disk before the name is.
void name_for_runs(const device& now, const candidate& wanted) {
  if (another_waits(now, wanted.path) &&
      version_of(now.latest_version) > version_of(wanted.version))
    return;
  sync_file_system(paths::downloads);
  replace_link(wanted.path, paths::latest_link, new_latest_link);
  sync_file_system(paths::storage);
}

/// Starts a run of kestrel, by the service manager where there is one, and waits for its end. Else
/// kestrel is found as this program was: beside it, or in the PATH. Empty where it was started.
faults run_kestrel() {
  constexpr int not_found = 127;
  const std::string beside =
      std::filesystem::path(program_invocation_name).replace_filename("kestrel");
  const bool has_manager = is_there("/run/systemd/system");
  const pid_t child = ::fork();
  if (child == -1) return {fault("no process can be started", {}, std::strerror(errno))};
  if (child == 0 && ::seteuid(::getuid()) == 0 && ::setegid(::getgid()) == 0) {
    if (has_manager) ::execlp("systemctl", "systemctl", "start", "kestrel.service", nullptr);
    ::execlp(beside.c_str(), beside.c_str(), nullptr);
  }
  if (child == 0) ::_exit(not_found);
  int status = 0;
  ::waitpid(child, &status, 0);
  if (WEXITSTATUS(status) != not_found) return {};
  return {fault("kestrel is neither beside kestrelctl nor in the PATH", {}, "install it")};
}

/// Has runs switch to the download: two where the first one has to go back to the system copy.
outcome activate(const candidate& wanted) {
  device now = read_device();
  for (int runs = 0; runs < 2 && !is_active(now, wanted.path); ++runs) {
    if (const faults found = run_kestrel(); !found.empty()) {
      complain_all(found);
      break;
    }
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
  if (const faults found = faults_of_ground(now); !found.empty())
    return refuse({outcome::failed, found});
  if (const auto no = judge_version(now, wanted)) return refuse(*no);
  if (const auto no = place_download(now, wanted)) return refuse(*no);
  name_for_runs(now, wanted);
  if (::getuid() == 0) return activate(wanted);
  say(version +
      (is_active(now, wanted.path) ? " is active" : " waits for the next run of kestrel"));
  return outcome::done;
}
