#include "ctl/change.h"

#include <sys/wait.h>
#include <unistd.h>

#include <cerrno>
#include <functional>
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
  if (wanted.version == vela_version() || (files::exists(wanted.path) && !wanted.fault.empty()))
    return complain(wanted.fault);
  const copy system = examine("");
  const copy active = active_copy();
  const copy& rival = active.version > system.version ? active : system;
  const bool is_active_one = active.path == wanted.path && wanted.version == rival.version;
  if (wanted.version > rival.version || is_active_one) return true;
  return complain(wanted.version_text + " is not newer than the copy " + rival.version_text);
}

/// All that is in a tree, with the targets of links and a hash of the contents of files.
std::map<files::path, std::string> entries_of(const files::path& tree) {
  std::map<files::path, std::string> all;
  for (const auto& entry : files::recursive_directory_iterator(tree)) {
    std::string& what = all[entry.path().lexically_relative(tree)];
    what = std::to_string(std::hash<std::string>()(content_of(entry)));
    if (entry.is_symlink()) what = files::read_symlink(entry);
  }
  return all;
}

/// Copies the download to a place of its own and, if the copy is complete, to the disk, before it
/// gets its name in one step. What a link of the download leads to may be missing in the copy.
bool add_download(const workplace& place, const files::path& directory, const std::string& path) {
  constexpr auto options = files::copy_options::recursive | files::copy_options::copy_symlinks;
  const files::path made = files::path(workplace::path) / "download";
  files::create_directory(made);
  for (const char* const part : {"zoneinfo", "icutz"})
    files::copy(files::canonical(directory / part), made / part, options);
  for (const auto& entry : files::recursive_directory_iterator(made)) {
    const auto mode = static_cast<files::perms>(entry.is_directory() ? 0755 : 0644);
    if (!entry.is_symlink()) files::permissions(entry, mode);
  }
  if (!vela_icu(made).compatible_schema(vela_icu()))
    return complain("no schema by icutz/icutz" + fs::read_first_word(schema_file) + ".dat");
  if (!is_complete(made)) return false;
  place.sync();
  files::rename(made, path);
  return true;
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
  if (!is_new(examine(path))) return false;
  if (is_there && (entries_of(path + "/zoneinfo") != entries_of(directory / "zoneinfo") ||
                   entries_of(path + "/icutz") != entries_of(directory / "icutz")))
    return complain(path + " has other content: publish this under a higher version");

  if (is_there ? !is_complete(path) : !add_download(place, directory, path)) return false;
  try {
    name_newest(path);
  } catch (int) {
    if (!is_there) files::remove_all(path);
    throw;
  }
  place.sync();
  if (::getuid() != 0)
    return static_cast<bool>(std::cout << version_text << " waits for the next run of kestrel\n");
  run_kestrel();
  return confirm_active(path);
}

bool go_back(const std::string& version_text) {
  const workplace place;
  const std::string path = version_text.empty() ? "" : paths::downloads + version_text;
  const copy wanted = examine(path);
  const files::path zone = paths::system_zoneinfo / files::path(local_zone());
  if (wanted.ends_run || (!path.empty() && !wanted.fault.empty())) return complain(wanted.fault);
  if (path.empty() && zone.has_filename() && !is_whole_zone(content_of(zone)))
    return complain(zone.string() + ", the local zone, is missing or not whole");
  if (examine("").version > wanted.version)
    return complain(version_text + " is older than the system copy: a run would leave it");
  if (!path.empty() && !is_complete(path)) return false;
  name_newest(path);  // first, so that no run in between undoes it
  vela_dataset(path).activate();
  place.sync();
  return confirm_active(path);
}

bool prune() {
  const workplace place;
  std::set<files::path> linked = {files::path(workplace::path).filename()};
  for (const auto& entry : files::directory_iterator(paths::storage)) {
    const files::path target = paths::storage / files::path(target_of(entry.path().c_str()));
    linked.insert(*target.lexically_normal().lexically_relative(paths::downloads).begin());
    linked.insert(*files::relative(target, paths::downloads).begin());
  }
  for (const auto& entry : files::directory_iterator(paths::downloads))
    if (!linked.contains(entry.path().filename())) remove_and_say(entry);
  return true;
}
