#include <filesystem>
#include <set>
#include <system_error>

#include "ctl/commands.h"
#include "ctl/device.h"
#include "ctl/diagnosis.h"
#include "ctl/files.h"
#include "ctl/print.h"
#include "paths.h"

namespace {

using std::filesystem::directory_iterator;

/// Adds the name of the entry of tz/ through which a link goes, as it is written and as it ends.
void add_linked(std::set<std::string>& names, const std::filesystem::path& link) {
  const std::filesystem::path downloads = paths::downloads;
  const std::filesystem::path target = link.parent_path() / link_target(link);
  std::error_code error;
  for (const auto& way : {target.lexically_normal(), std::filesystem::canonical(target, error)}) {
    if (const auto inside = way.lexically_relative(downloads); !inside.empty())
      names.insert(*inside.begin());
  }
}

/// The names in tz/ that a link in the storage or in tz/ leads to.
std::set<std::string> linked_names() {
  std::set<std::string> names;
  for (const char* const directory : {paths::storage, paths::downloads}) {
    for (const auto& entry : directory_iterator(directory))
      if (entry.is_symlink()) add_linked(names, entry.path());
  }
  return names;
}

/// The downloads that no link leads to.
std::set<std::string> unlinked_downloads() {
  const std::set<std::string> linked = linked_names();
  std::set<std::string> names;
  for (const auto& entry : directory_iterator(paths::downloads)) {
    const std::string name = entry.path().filename();
    const bool is_download =
        std::filesystem::is_directory(entry.symlink_status()) && version_of(name) != vela_version();
    if (is_download && !linked.contains(name)) names.insert(name);
  }
  return names;
}

/// The newest of the versions that `back` accepts; one that is withdrawn only where there is no
/// other.
std::string copy_to_keep(const device& now, const ways_back& ways,
                         const std::set<std::string>& versions) {
  std::string kept;
  std::string withdrawn;
  for (const std::string& version : ways.accepted) {  // the newest comes last
    if (!versions.contains(version)) continue;
    (now.withdrawn->contains(version) ? withdrawn : kept) = version;
  }
  return kept.empty() ? withdrawn : kept;
}

}  // namespace

outcome prune() {
  const device now = read_device();
  // Otherwise nobody knows which copies are good.
  if (!faults_of_ground(now).empty()) return refuse({outcome::failed, faults_of(now)});
  const ways_back ways = find_ways_back(now);
  std::set<std::string> superfluous = unlinked_downloads();
  superfluous.erase(copy_to_keep(now, ways, superfluous));
  for (const std::string& version : ways.unread) superfluous.erase(version);
  complain_all(ways.reasons);

  outcome end = ways.reasons.empty() ? outcome::done : outcome::failed;
  for (const std::string& version : superfluous) {
    try {
      std::filesystem::remove_all(path_of(version));
      say("removed " + path_of(version));
    } catch (const std::system_error& failure) {
      complain(fault("%s cannot be removed", {path_of(version)}, failure.code().message()));
      end = outcome::failed;
    }
  }
  return end;
}
