#include <system_error>

#include "ctl/commands.h"
#include "ctl/device.h"
#include "ctl/diagnosis.h"
#include "ctl/files.h"
#include "ctl/print.h"
#include "fs/file.h"
#include "paths.h"

namespace {

void print(const char* name, const std::string& value) {
  say(std::string(name) + ": " + (value.empty() ? "none" : value));
}

template <typename Versions>
std::string joined(const Versions& versions) {
  std::string text;
  for (const std::string& version : versions) text += (text.empty() ? "" : " ") + version;
  return text;
}

std::string last_switch() {
  return link_target(paths::record).empty() ? fs::read_first_word(paths::record) : "";
}

}  // namespace

outcome print_status() {
  const device now = read_device();
  print("active", now.active_version);
  print("zoneinfo", now.zoneinfo_target);
  print("system", now.system_version);
  print("schema", now.system_schema);
  print("newest", now.latest_version);
  if (!is_blind(now)) print("next run", to_text(now.next));
  print("zone", now.zone);
  print("last switch", last_switch());
  faults found;
  try {
    if (!is_blind(now)) print("downloads", joined(downloads_to_go_back_to(now)));
  } catch (const std::system_error& failure) {
    found.push_back(fault("the downloads cannot be read: %s", {failure.what()}));
  }
  print("withdrawn", joined(now.withdrawn.value_or(version_set())));
  append(found, faults_of(now));
  complain_all(found);
  return found.empty() ? outcome::done : outcome::failed;
}
