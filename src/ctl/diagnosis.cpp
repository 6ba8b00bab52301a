#include "ctl/diagnosis.h"

#include <fcntl.h>
#include <unistd.h>

#include <algorithm>
#include <cerrno>
#include <filesystem>
#include <system_error>

#include "ctl/completeness.h"
#include "ctl/files.h"
#include "dataset/vela_icu.h"
#include "dataset/vela_zoneinfo.h"
#include "fs/operations.h"
#include "paths.h"
#include "startup/select_dataset.h"

namespace {

constexpr const char* repair_image = "repair the image";
constexpr const char* start_run = "start a run of kestrel";
constexpr const char* choose_zone = "kestrelctl zone NAME";

bool is_other_than_link(const char* path) {
  return is_there(path) && link_target(path).empty();
}

/// The faults, with that cure for those that have none of their own.
faults with_cure(faults all, const std::string& cure) {
  for (fault& one : all)
    if (one.cure.empty()) one.cure = cure;
  return all;
}

/// What helps where the data of the active copy is not good.
std::string cure_of_data(const device& now) {
  return now.active_path.empty() ? repair_image
                                 : "publish " + now.active_version + " again, from good data";
}

std::string way_back_to(const device& now) {
  return now.active_path.empty() ? "kestrelctl back" : "kestrelctl back " + now.active_version;
}

/// What programs and runs read, as far as it is known.
std::vector<std::string> places_of_copies(const device& now) {
  std::vector<std::string> places = {system_version_file, paths::system_schema, paths::downloads};
  for (const std::string& version : {now.active_version, now.latest_version}) {
    const std::string path = path_of(version);
    if (version_of(version) != vela_version())
      places.insert(places.end(), {zoneinfo_directory(path), icu_directory(path)});
  }
  return places;
}

bool is_closed_to_us(const std::string& place) {
  const int needed = leads_to_directory(place) ? R_OK | X_OK : R_OK;
  return ::faccessat(AT_FDCWD, place.c_str(), needed, AT_EACCESS) != 0 && errno == EACCES;
}

faults faults_of_reading(const device& now) {
  if (!now.view.is_uncertain) return {};
  return {fault("the device cannot be read", {}, "start again")};
}

faults faults_of_places(const device& now) {
  faults found = faults_of_reading(now);
  for (const std::string place : {paths::storage, paths::downloads}) {
    if (!leads_to_directory(place))
      found.push_back(fault("%s is missing or no directory", {place}, "make it one"));
  }
  for (const std::string& place : places_of_copies(now)) {
    if (const std::string closed = closed_part(place); !closed.empty()) {
      found.push_back(closed_to_some(closed));
    } else if (is_closed_to_us(place)) {
      found.push_back(closed_to_some(place));  // by an access list, for example
    }
  }
  return found;
}

faults faults_of_list(const device& now) {
  if (now.withdrawn) return {};
  return {fault("%s cannot be read", {withdrawn_list}, "remove it")};
}

faults faults_of_system_schema(const device& now) {
  const std::string& schema = now.system_schema;
  if (schema.empty())
    return {fault("%s is missing, empty or unreadable", {paths::system_schema}, repair_image)};
  if (data_file_schema("icutz" + schema + ".dat") != schema)
    return {fault("%s does not name a schema such as 44l", {paths::system_schema}, repair_image)};
  return {};
}

faults faults_of_system(const device& now) {
  faults found;
  if (!leads_to_directory(paths::system_zoneinfo)) {
    found.push_back(fault("%s is missing", {paths::system_zoneinfo}, repair_image));
  } else if (now.system_version == ".1.0") {
    found.push_back(
        fault("%s is missing, empty or unreadable", {system_version_file}, repair_image));
  } else if (version_of(now.system_version) == vela_version()) {
    found.push_back(
        fault("%s does not name a release such as 2026b", {system_version_file}, repair_image));
  }
  append(found, faults_of_system_schema(now));
  return found;
}

/// Both schemas, or the versions, where a run does not keep the copy at `path`.
faults faults_of_fitness(const device& now, const std::string& path, const vela_dataset& copy) {
  const std::string schema = schema_of(path);
  if (!now.view.system || may_stay(copy, *now.view.system)) return {};
  for (const auto& subject : {faults_of_reading, faults_of_system_schema})
    if (faults found = subject(now); !found.empty()) return found;
  const std::string file = path + "/icutz/icutz" + now.system_schema + ".dat";
  if (const std::string closed = closed_part(file); schema.empty() && !closed.empty())
    return {closed_to_some(closed)};
  if (schema.empty()) {
    return {fault("%s is missing or no file", {file},
                  "publish " + path.substr(path.rfind('/') + 1) + " again, from good data")};
  }
  if (schema != now.system_schema) {
    return {
        fault("%s has schema %s, and the system copy has %s", {path, schema, now.system_schema})};
  }
  return {fault("%s is older than the system copy, %s", {path, now.system_version})};
}

faults faults_of_active_links(const device& now) {
  const std::string zoneinfo = paths::zoneinfo_link;
  if (!is_there(zoneinfo)) return {fault("%s is missing", {zoneinfo}, start_run)};
  if (is_other_than_link(paths::zoneinfo_link)) return {};  // see faults_of_link_places
  if (!now.view.current_path)
    return {fault("%s leads to %s, which is no copy", {zoneinfo, now.zoneinfo_target}, start_run)};
  const std::string& path = now.active_path;
  if (version_of(now.active_version) == vela_version() || !is_there(zoneinfo_directory(path)))
    return {};  // see faults_of_active and faults_of_system
  if (now.zoneinfo_target != zoneinfo_directory(path)) {
    return {fault("%s leads to %s, which no program expects", {zoneinfo, now.zoneinfo_target},
                  way_back_to(now))};
  }
  if (!is_active(now, path) && !is_other_than_link(paths::icu_link))
    return {fault("%s is not that of the active copy", {paths::icu_link}, way_back_to(now))};
  return {};
}

faults faults_of_active(const device& now) {
  if (!now.view.current_path) return {};
  const std::string& path = now.active_path;
  if (!path.empty()) {
    const std::string leave = now.latest_target == path
                                  ? std::string(start_run) + ", and remove " + paths::latest_link
                                  : start_run;
    if (!leads_to_directory(path)) return {fault("%s is missing", {path}, leave)};
    if (!now.view.current || version_of(now.active_version) == vela_version())
      return {fault("%s has a name that is no version", {path}, leave)};
    const faults found = faults_of_fitness(now, path, *now.view.current);
    if (!found.empty()) return with_cure(found, leave);
  }
  const std::string shown = path.empty() ? paths::system_zoneinfo : path;
  try {
    return with_cure(faults_of_copy(path, now.active_version, shown), cure_of_data(now));
  } catch (const std::system_error& failure) {
    return {fault("%s cannot be read: %s", {shown, failure.what()}, cure_of_data(now))};
  }
}

faults faults_of_latest(const device& now) {
  const std::string latest = paths::latest_link;
  const std::string& target = now.latest_target;
  const std::string cure = "remove " + latest;
  if (target.empty() || target == now.view.current_path) return {};
  if (now.latest_version == target)
    return {fault("%s leads to %s, which is no path of a download", {latest, target}, cure)};
  if (version_of(now.latest_version) == vela_version())
    return {fault("%s names %s, which is no version", {latest, now.latest_version}, cure)};
  if (!leads_to_directory(target))
    return {fault("%s, the newest download, is missing", {target}, cure)};
  if (now.next.what == next_run::action::switches)
    return with_cure(faults_of_way_back(now, now.latest_version), cure);
  if (now.view.latest && now.view.system && !now.view.latest->compatible_schema(*now.view.system))
    return with_cure(faults_of_fitness(now, target, *now.view.latest), cure);
  return {};
}

/// A run is the cure where nothing else is wrong.
faults faults_of_next_run(const device& now, bool is_last) {
  using enum next_run::action;
  const std::string others = "see the other lines";
  if (now.next.what == keeps) return {};
  if (now.next.what != fails)
    return {fault("the next run of kestrel %s", {to_text(now.next)}, is_last ? start_run : others)};
  faults found = {fault("the next run of kestrel %s", {"fails"}, others)};
  if (!now.view.can_change_storage) {
    found.push_back(fault("%s is missing, read-only, or append-only", {paths::storage},
                          "make it a directory that can be changed"));
  }
  return found;
}

/// What a run has still to do that no other fault is about.
faults faults_of_remains(const device& now) {
  faults found;
  if (fs::is_symlink_to(icu_directory(now.active_path).c_str(), paths::new_icu_link))
    found.push_back(fault("%s is of a run that was killed", {paths::new_icu_link}, start_run));
  if (fs::exists(paths::legacy_icu_link))
    found.push_back(fault("%s is of an older system", {paths::legacy_icu_link}, "remove it"));
  std::error_code error;
  const bool is_in_use =
      std::filesystem::is_directory(std::filesystem::symlink_status(paths::legacy_icu, error)) &&
      !std::filesystem::is_empty(paths::legacy_icu, error);
  errno = error.value();
  check(!is_hard(errno), paths::legacy_icu);
  if (is_there(paths::legacy_icu) && !is_in_use)
    found.push_back(fault("%s is of an older system", {paths::legacy_icu}, "remove it"));
  return found;
}

faults faults_of_zone(const device& now) {
  const std::string localtime = paths::localtime_link;
  if (is_other_than_link(paths::localtime_link))
    return {fault("%s is no link", {localtime}, std::string("remove it, and ") + choose_zone)};
  if (now.localtime_target.empty()) return {fault("%s is missing", {localtime}, choose_zone)};
  if (now.zone.empty()) {
    return {fault("%s leads to %s, not into %s",
                  {localtime, now.localtime_target, paths::zoneinfo_link}, choose_zone)};
  }
  if (!now.view.current_path || has_zone(now.active_path, now.zone)) return {};
  const std::string tree = zoneinfo_directory(now.active_path);
  if (!is_there(tree)) return {};  // see faults_of_active
  if (const std::string closed = closed_part(tree + "/" + now.zone); !closed.empty())
    return {closed_to_some(closed)};
  return {fault("the local zone %s is not whole in the active copy", {now.zone},
                has_zone("", now.zone) ? cure_of_data(now) : choose_zone)};
}

/// Programs find the links by these, which the image sets.
faults faults_of_entrance(const std::string& entrance, const std::string& link) {
  const std::filesystem::path target =
      std::filesystem::path(entrance).parent_path() / link_target(entrance);
  if (target.lexically_normal() == link) return {};
  const std::string first = is_other_than_link(entrance.c_str()) ? "remove it, and " : "";
  return {fault("%s does not lead to %s", {entrance, link},
                first + "ln -sfn " + link + " " + entrance)};
}

}  // namespace

faults faults_of(const device& now) {
  faults found = faults_of_places(now);
  if (is_blind(now)) return found;
  for (const auto& subject :
       {faults_of_system, faults_of_link_places, faults_of_list, faults_of_active_links,
        faults_of_active, faults_of_latest, faults_of_remains, faults_of_zone}) {
    try {
      append(found, subject(now));
    } catch (const std::system_error& failure) {
      found.push_back(fault("the device cannot be read", {}, failure.what()));
    }
  }
  append(found, faults_of_next_run(now, found.empty()));
  append(found, faults_of_entrance("/etc/localtime", paths::localtime_link));
  append(found, faults_of_entrance(paths::legacy_zoneinfo, paths::zoneinfo_link));
  return found;
}

bool is_blind(const device& now) {
  return std::ranges::any_of(places_of_copies(now), is_closed_to_us);
}

faults faults_of_link_places(const device& now) {
  const std::string zoneinfo = paths::zoneinfo_link;
  const std::string icutz = paths::icu_link;
  faults found;
  if (is_other_than_link(paths::zoneinfo_link))
    found.push_back(fault("%s is no link", {zoneinfo}, std::string("remove it, and ") + start_run));
  if (is_other_than_link(paths::icu_link))
    found.push_back(fault("%s is no link", {icutz}, "remove it, and " + way_back_to(now)));
  if (is_other_than_link(paths::latest_link))
    found.push_back(fault("%s is no link", {paths::latest_link}, "remove it"));
  return found;
}

faults faults_of_ground(const device& now) {
  faults found = faults_of_places(now);
  append(found, faults_of_system(now));
  append(found, faults_of_link_places(now));
  append(found, faults_of_list(now));
  return found;
}

faults faults_of_way_back(const device& now, const std::string& version) {
  const std::string path = version.empty() ? "" : path_of(version);
  if (!now.view.system)
    return {fault("%s does not name a release such as 2026b", {system_version_file}, repair_image)};
  faults found;
  if (!path.empty()) {
    if (!leads_to_directory(path)) return {fault("%s is missing", {path})};
    const vela_dataset copy = read_or_throw(path, [&path] { return vela_dataset(path); });
    found = faults_of_fitness(now, path, copy);
    if (found.empty()) found = faults_of_copy(path, version, path);
  }
  if (found.empty() && !now.zone.empty() && !has_zone(path, now.zone))
    found.push_back(fault("%s has not the local zone, %s", {zoneinfo_directory(path), now.zone}));
  return found;
}

ways_back find_ways_back(const device& now) {
  ways_back found;
  for (const auto& entry : std::filesystem::directory_iterator(paths::downloads)) {
    const std::string version = entry.path().filename();
    if (version_of(version) == vela_version()) continue;
    try {
      if (faults_of_way_back(now, version).empty()) found.accepted.push_back(version);
    } catch (const std::system_error& failure) {
      found.unread.insert(version);
      found.reasons.push_back(
          fault("%s cannot be read: %s", {entry.path(), failure.what()},
                entry.path() == now.active_path ? cure_of_data(now) : "remove it"));
    }
  }
  std::ranges::sort(found.accepted, {}, version_of);
  return found;
}
