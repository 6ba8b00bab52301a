#include "ctl/change.h"

#include <sys/wait.h>
#include <unistd.h>

#include <cerrno>
#include <iostream>
#include <map>
#include <set>
#include <stdexcept>

#include "ctl/status.h"
#include "ctl/storage.h"
#include "ctl/whole.h"
#include "dataset/vela_dataset.h"
#include "dataset/vela_icu.h"
#include "fs/file.h"
#include "paths.h"

namespace {

/// Whether a run switches to `wanted`, or keeps it, and the next one does not leave it. Complains.
bool is_new(const copy& wanted) {
  if (wanted.version == vela_version()) return complain(wanted.fault);
  const copy system = examine("");
  const copy active = active_copy();
  const bool is_active_one = active.path == wanted.path;
  const copy& rival = active.version > system.version && !is_active_one ? active : system;
  if (is_active_one ? !(rival.version > wanted.version) : wanted.version > rival.version)
    return true;
  return complain(wanted.version_text + " is not newer than the copy " + rival.version_text);
}

/// All that is in a download: paths, kinds, and targets or contents.
std::map<files::path, std::string> entries_of(const files::path& directory) {
  std::map<files::path, std::string> all;
  for (const char* const part : {"zoneinfo", "icutz"}) {
    for (const auto& entry : files::recursive_directory_iterator(directory / part)) {
      std::string& what = all[entry.path().lexically_relative(directory)];
      what = entry.is_directory() ? "/" : "=" + content_of(entry);
      if (entry.is_symlink()) what = ">" + files::read_symlink(entry).string();
    }
  }
  return all;
}

/// Copies the download to a place of its own, and to the disk, before it gets its name in one step.
void add_download(const workplace& place, const files::path& directory, const std::string& path) {
  constexpr auto options = files::copy_options::recursive | files::copy_options::copy_symlinks;
  const files::path made = files::path(workplace::path) / "download";
  files::create_directory(made);
  for (const char* const part : {"zoneinfo", "icutz"})
    files::copy(files::canonical(directory / part), made / part, options);
  for (const auto& entry : files::recursive_directory_iterator(made)) {
    const auto mode = static_cast<files::perms>(entry.is_directory() ? 0755 : 0644);
    if (!entry.is_symlink()) files::permissions(entry, mode);
  }
  const std::string data_file = "icutz" + fs::read_first_word(schema_file) + ".dat";
  if (!vela_icu(made).compatible_schema(vela_icu()))
    throw std::runtime_error("icutz has to declare the system copy's schema by " + data_file);
  place.sync();
  files::rename(made, path);
}

/// Starts a run of kestrel, by the service manager where there is one, and waits for its end. Else
/// kestrel is found as this program was: beside it, or in the PATH.
void run_kestrel() {
  const std::string beside = files::path(program_invocation_name).replace_filename("kestrel");
  const pid_t run = ::fork();
  if (run == 0 && ::seteuid(::getuid()) == 0 && ::setegid(::getgid()) == 0) {
    if (files::exists("/run/systemd/system"))
      ::execlp("systemctl", "systemctl", "start", "kestrel.service", nullptr);
    ::execlp(beside.c_str(), "kestrel", nullptr);
  }
  if (run == 0) ::_exit(1);
  ::waitpid(run, nullptr, 0);
}

}  // namespace

bool publish(const std::string& version_text, const files::path& directory) {
  const workplace place;
  const std::string path = paths::downloads + version_text;
  const bool is_there = files::exists(path);
  const bool is_wanted = is_new(examine(path));
  if (!is_complete(directory) || !is_wanted) return false;
  if (is_there && entries_of(path) != entries_of(directory))
    return complain(path + " has other content: publish this under a higher version");
  if (is_active(path) && target_of(paths::latest_link) == path) return confirm_active(path);

  if (!is_there) add_download(place, directory, path);
  try {
    name_newest(path);
  } catch (int) {
    if (!is_there) files::remove_all(path);
    throw;
  }
  place.sync();
  if (::getuid() == 0) {
    run_kestrel();
    return confirm_active(path);
  }
  std::cout << version_text << " is published: the next run of kestrel switches to it\n";
  return true;
}

bool go_back(const std::string& version_text) {
  const workplace place;
  const std::string path = version_text.empty() ? "" : paths::downloads + version_text;
  const copy wanted = examine(path);
  if (!path.empty() && !wanted.fault.empty()) return complain(wanted.fault);
  if (examine("").version > wanted.version)
    return complain(version_text + " is older than the system copy: a run would leave it");
  if (!path.empty() && !is_complete(path)) return false;
  name_newest(path);  // first, so that no run in between undoes it
  vela_dataset(path).activate();
  place.sync();
  return confirm_active(path);
}

bool prune() {
  const bool was_killed = files::exists(workplace::path);
  const workplace place;
  if (was_killed) std::cout << "removed " << workplace::path << '\n';
  if (files::remove(new_latest_link)) std::cout << "removed " << new_latest_link << '\n';
  std::set<files::path> linked = {files::path(workplace::path).filename()};
  for (const auto& entry : files::directory_iterator(paths::storage)) {
    const files::path target = paths::storage / files::path(target_of(entry.path().c_str()));
    const files::path below = target.lexically_normal().lexically_relative(paths::downloads);
    if (!below.empty()) linked.insert(*below.begin());
  }
  for (const auto& entry : files::directory_iterator(paths::downloads)) {
    if (linked.contains(entry.path().filename())) continue;
    files::remove_all(entry);
    std::cout << "removed " << entry.path().string() << '\n';
  }
  return true;
}
