#include "ctl/copies.h"

#include <regex>
#include <stdexcept>
#include <string_view>
#include <system_error>

#include "dataset/vela_icu.h"
#include "dataset/vela_zoneinfo.h"
#include "paths.h"

using namespace std::string_literals;

copy examine(const std::string& path) {
  static const std::regex pattern(R"([0-9]+[a-z]+(\.[0-9]+){0,2})");
  constexpr std::string_view downloads = paths::downloads;
  copy found{.path = path, .version_text = path};
  if (path.empty()) {
    found.version_text = vela_zoneinfo().get_version_text() + ".1.0";
  } else if (path.starts_with(downloads) && path.size() > downloads.size()) {
    found.version_text = path.substr(downloads.size());
  } else {
    found.ends_run = true;
  }
  try {
    if (std::regex_match(found.version_text, pattern)) found.version.parse(found.version_text);
  } catch (const std::out_of_range&) {
    found.version = {};
    found.ends_run = true;
  }
  std::error_code error;
  if (found.version == vela_version()) {
    found.fault = found.version_text + " is no version, or has a number above 2147483647";
  } else if (!files::is_directory(zoneinfo_directory(path), error)) {
    found.fault = zoneinfo_directory(path) + " is missing";
  } else if (!path.empty() && !vela_icu(path).compatible_schema(vela_icu())) {
    found.fault = icu_directory(path) + " declares another schema than " + schema_file;
  }
  return found;
}

copy active_copy() {
  const std::string target = target_of(paths::zoneinfo_link);
  const std::string path = target.substr(0, target.rfind('/'));
  if (target == paths::system_zoneinfo) return examine("");
  if (path.starts_with(paths::downloads) && target == path + "/zoneinfo") return examine(path);
  return {"none", "none", examine("").version, paths::zoneinfo_link + " leads to no copy"s};
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
  const std::string top = paths::zoneinfo_link + "/"s;
  return target.starts_with(top) ? target.substr(top.size()) : "";
}
