#include "ctl/status.h"

#include <sys/stat.h>

#include <iostream>
#include <system_error>

#include "ctl/whole.h"
#include "fs/file.h"
#include "paths.h"

namespace {

/// Whether everyone can read what is at `path` and pass the directories on the way there.
bool is_public(files::path path) {
  struct stat found {};
  for (; path.has_relative_path(); path = path.parent_path()) {
    if (::stat(path.c_str(), &found) == 0 &&
        (found.st_mode & (S_ISDIR(found.st_mode) ? S_IXOTH : S_IROTH)) == 0)
      return complain("not everyone can read " + path.string());
  }
  return true;
}

bool leads_to(const char* path, const char* link) {
  const files::path target = files::path(path).parent_path() / target_of(path);
  return target.lexically_normal() == link ||
         complain(std::string(path) + " does not lead to " + link + ": make it a link to that");
}

/// What a run compares, what the next one does, and what is wrong.
struct decision {
  const copy system = examine("");
  const copy active = active_copy();
  const std::string latest = target_of(paths::latest_link);
  const copy newest = latest.empty() ? copy() : examine(latest);
  const bool no_link = latest.empty() && files::exists(files::symlink_status(paths::latest_link));
  std::string next = "keeps the active copy";

  decision() {
    const bool ends = no_link || active.ends_run || newest.ends_run || system.ends_run;
    if (!is_active("") && (ends || !active.fits || system.version > active.version))
      next = "goes back to the system copy";
    if (!ends && newest.fits && newest.version > active.version) next = "switches to " + latest;
  }

  /// Complains of each fault.
  [[nodiscard]] bool is_well() const {
    const bool is_usable = active.fault.empty();
    bool is_good = is_usable || active.path.empty() || complain("the active copy: " + active.fault);
    is_good &= !is_usable || !(system.version > active.version) ||
               complain(active.version_text + " is active, and older than the system copy");
    is_good &= !no_link || complain("tz_latest is no link: remove it");
    is_good &= next.starts_with("keeps") || complain("the next run of kestrel " + next);
    is_good &= newest.fault.empty() || complain("the newest download: " + newest.fault);
    is_good &= !is_usable || is_active(active.path) ||
               complain("icutz is of another copy: correct it by kestrelctl back" +
                        (active.path.empty() ? "" : " " + active.version_text));
    is_good &= system.fault.empty() || complain("the image has to be repaired: " + system.fault);
    is_good &= (!local_zone().empty() && is_whole_zone(content_of(paths::localtime_link))) ||
               complain("localtime leads to no whole zone: set it again");
    std::error_code error;
    is_good &= is_public(paths::localtime_link) &&
               is_public(files::canonical(paths::localtime_link, error)) &&
               is_public(files::canonical(paths::zoneinfo_link, error)) &&
               is_public(files::canonical(paths::icu_link, error));
    is_good &= leads_to("/etc/localtime", paths::localtime_link);
    return leads_to(paths::legacy_zoneinfo, paths::zoneinfo_link) && is_good;
  }
};

void print(const char* name, const std::string& value) {
  std::cout << name << ": " << (value.empty() ? "none" : value.substr(0, value.find('\n'))) << '\n';
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
  print("last switch", target_of(paths::record).empty() ? fs::read_first_word(paths::record) : "");
  return now.is_well();
}

bool confirm_active(const std::string& path) {
  const std::string version = examine(path).version_text;
  if (is_active(path)) return static_cast<bool>(std::cout << version << " is active\n");
  complain(version + " is not active");
  return decision().is_well() && is_active(path);
}
