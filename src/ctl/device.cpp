#include "ctl/device.h"

#include <stdexcept>

#include "ctl/files.h"
#include "dataset/vela_icu.h"
#include "dataset/vela_zoneinfo.h"
#include "fs/file.h"
#include "paths.h"

namespace {

/// The version that a path of a download holds; the path itself where it is that of no download.
std::string version_in(const std::string& path) {
  const std::string downloads = paths::downloads;
  return path.starts_with(downloads) && path.size() > downloads.size()
             ? path.substr(downloads.size())
             : path;
}

}  // namespace

device read_device() {
  device now;
  now.view = read_as_a_run();
  now.next = decide(now.view);
  now.zoneinfo_target = link_target(paths::zoneinfo_link);
  now.icutz_target = link_target(paths::icu_link);
  now.latest_target = link_target(paths::latest_link);
  now.localtime_target = link_target(paths::localtime_link);
  now.system_version = now.view.system ? now.view.system->get_version_string()
                                       : fs::read_first_word(system_version_file) + ".1.0";
  now.active_path = now.view.current_path.value_or("");
  if (now.view.current_path)
    now.active_version = now.active_path.empty() ? now.system_version : version_in(now.active_path);
  now.latest_version = version_in(now.latest_target);
  now.system_schema = fs::read_first_word(paths::system_schema);
  const std::string through = std::string(paths::zoneinfo_link) + "/";
  if (now.localtime_target.starts_with(through))
    now.zone = now.localtime_target.substr(through.size());
  now.withdrawn = read_withdrawn();
  return now;
}

bool is_active(const device& now, const std::string& path) {
  return now.zoneinfo_target == zoneinfo_directory(path) &&
         now.icutz_target == (path.empty() ? "" : icu_directory(path));
}

std::string path_of(const std::string& version) {
  return paths::downloads + version;
}

vela_version version_of(const std::string& text) {
  vela_version version;
  try {
    version.parse(text);
  } catch (const std::out_of_range&) {
    version = {};
  }
  return version;
}
