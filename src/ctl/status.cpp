#include "ctl/status.h"

#include <sys/stat.h>

#include <iostream>
#include <system_error>
#include <vector>

#include "ctl/whole.h"
#include "fs/file.h"
#include "paths.h"

namespace {

using namespace std::string_literals;

/// What a run reads, what the next run does, and what is wrong with that.
struct decision {
  const copy system = examine("");
  const copy active = active_copy();
  const std::string latest = target_of(paths::latest_link);
  const copy newest = latest.empty() ? copy() : examine(latest);
  std::string next = "keeps the active copy";
  std::vector<std::string> faults;

  decision() {
    if (!active.fault.empty() && !active.path.empty()) {
      faults.push_back("the active copy: " + active.fault);
    } else if (system.version > active.version) {
      faults.push_back(active.version_text + " is active, and older than the system copy");
    }
    if (latest.empty() && files::exists(files::symlink_status(paths::latest_link)))
      faults.push_back(paths::latest_link + " is no link: remove it"s);
    if (!faults.empty() || newest.ends_run) next = "goes back to the system copy";
    if (newest.version > active.version && newest.fault.empty()) next = "switches to " + latest;
    if (!next.starts_with("keeps")) faults.push_back("the next run of kestrel " + next);
    if (!newest.fault.empty()) faults.push_back("the newest download: " + newest.fault);
    if (active.fault.empty() && !is_active(active.path))
      faults.push_back(paths::icu_link + " is of another copy: mend it by kestrelctl back"s);
    if (!system.fault.empty()) faults.push_back("the image has to be repaired: " + system.fault);
  }
};

/// Whether everyone can read what is at `link` and pass the directories on the way there.
bool is_public(const char* link) {
  std::error_code error;
  for (files::path place : {files::path(link), files::canonical(link, error)}) {
    for (; place.has_relative_path(); place = place.parent_path()) {
      const files::file_status found = files::status(place, error);
      const auto mask = static_cast<files::perms>(files::is_directory(found) ? S_IXOTH : S_IROTH);
      if (files::exists(found) && (found.permissions() & mask) == files::perms::none)
        return complain("not everyone can read " + place.string());
    }
  }
  return true;
}

bool leads_to(const char* path, const char* link) {
  std::error_code error;
  return files::equivalent(path, link, error) ||
         complain(path + " does not lead to "s + link + ": make it a link to that");
}

void print(const char* name, const std::string& value) {
  std::cout << name << ": " << (value.empty() ? "none" : value) << '\n';
}

bool is_well(const decision& now) {
  bool is_good = now.faults.empty();
  for (const std::string& fault : now.faults) complain(fault);
  if (!is_whole_zone(content_of(paths::localtime_link)))
    is_good = complain(paths::localtime_link + " leads to no whole zone: set it again"s);
  is_good = is_public(paths::zoneinfo_link) && is_public(paths::icu_link) &&
            is_public(paths::localtime_link) && is_good;
  is_good = leads_to("/etc/localtime", paths::localtime_link) && is_good;
  return leads_to(paths::legacy_zoneinfo, paths::zoneinfo_link) && is_good;
}

}  // namespace

bool status() {
  const decision now;
  print("active", now.active.version_text);
  print("zoneinfo", target_of(paths::zoneinfo_link));
  print("system", now.system.version_text);
  print("schema", fs::read_first_word(schema_file));
  print("newest", now.newest.version_text);
  print("next run", now.next);
  print("zone", local_zone());
  print("last switch", fs::read_first_word(paths::record));
  return is_well(now);
}

bool confirm_active(const std::string& path) {
  const std::string version = examine(path).version_text;
  if (!is_active(path)) return !is_well({}) && complain(version + " is not active");
  std::cout << version << " is active\n";
  return true;
}
