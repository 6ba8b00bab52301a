#include "ctl/copies.h"

#include <cstdint>
#include <stdexcept>
#include <string_view>
#include <system_error>

#include "dataset/vela_icu.h"
#include "dataset/vela_zoneinfo.h"
#include "fs/file.h"
#include "paths.h"

copy examine(const std::string& path) {
  constexpr std::string_view downloads = paths::downloads;
  const bool is_download = path.starts_with(downloads) && path.size() > downloads.size();
  copy found{.path = path, .version_text = path, .ends_run = !path.empty() && !is_download};
  if (path.empty()) found.version_text = vela_zoneinfo().get_version_text() + ".1.0";
  if (is_download) found.version_text = path.substr(downloads.size());
  try {
    if (!found.ends_run) found.version.parse(found.version_text);
  } catch (const std::out_of_range&) {
    // Nothing is newer than a system copy that ends every run.
    found.version = {path.empty() ? INT32_MAX : -1, {}, -1, -1};
    found.ends_run = true;
  }
  std::error_code error;
  found.fits =
      path.empty() || (files::exists(path, error) && vela_icu(path).compatible_schema(vela_icu()));
  if (found.ends_run || found.version == vela_version()) {
    found.fault = found.version_text + " is no version, or has a number above 2147483647";
  } else if (!files::is_directory(zoneinfo_directory(path), error)) {
    found.fault = zoneinfo_directory(path) + " is missing";
  } else if (!found.fits || fs::read_first_word(schema_file).empty()) {
    found.fault = icu_directory(path) + " has another schema than " + schema_file;
  }
  return found;
}

copy active_copy() {
  const std::string target = target_of(paths::zoneinfo_link);
  const std::string path = target.substr(0, target.rfind('/'));
  if (target == paths::system_zoneinfo) return examine("");
  copy found{"none", "none", examine("").version};
  if (path.starts_with(paths::downloads)) found = examine(path);
  if (target != found.path + "/zoneinfo")
    found.fault = std::string(paths::zoneinfo_link) + " leads to no copy";
  return found;
}

bool is_active(const std::string& path) {
  return target_of(paths::zoneinfo_link) == zoneinfo_directory(path) &&
         target_of(paths::icu_link) == (path.empty() ? "" : icu_directory(path));
}

std::string target_of(const char* link) {
  std::error_code error;
  return files::read_symlink(link, error);
}

std::string local_zone() {
  const std::string target = target_of(paths::localtime_link);
  const std::string top = paths::zoneinfo_link;
  return target.starts_with(top + "/") ? files::path(target).lexically_relative(top) : "";
}
