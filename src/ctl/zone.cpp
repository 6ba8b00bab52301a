#include "ctl/commands.h"
#include "ctl/completeness.h"
#include "ctl/device.h"
#include "ctl/diagnosis.h"
#include "ctl/files.h"
#include "ctl/print.h"
#include "ctl/workplace.h"
#include "dataset/vela_zoneinfo.h"
#include "paths.h"

outcome set_zone(const std::string& name) {
  const device now = read_device();
  const std::string localtime = paths::localtime_link;
  if (!now.view.current_path) return refuse({outcome::failed, faults_of(now)});
  const std::string& path = now.active_path;
  if (now.zoneinfo_target != zoneinfo_directory(path) || !has_zone(path, name))
    return refuse({outcome::unusable, {fault("%s is no whole zone of the active copy", {name})}});
  const std::string target = std::string(paths::zoneinfo_link) + "/" + name;
  if (const std::string closed = closed_part(target); !closed.empty())
    return refuse({outcome::unusable, {closed_to_some(closed)}});
  if (is_there(localtime) && now.localtime_target.empty())
    return refuse({outcome::failed, {fault("%s is no link", {localtime}, "remove it")}});
  replace_link(target, paths::localtime_link, paths::new_localtime_link);
  sync_file_system(paths::storage);
  say("zone: " + name);
  return outcome::done;
}
