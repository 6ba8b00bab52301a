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
  if (!link_target(paths::record).empty()) return {};
  return read_or_throw(paths::record, [] { return fs::read_first_word(paths::record); });
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
  if (!is_blind(now) && leads_to_directory(paths::downloads)) {
    const ways_back ways = find_ways_back(now);
    print("downloads", joined(ways.accepted));
    found = ways.reasons;
  }
  if (now.withdrawn) print("withdrawn", joined(*now.withdrawn));
  append(found, faults_of(now));
  complain_all(found);
  return found.empty() ? outcome::done : outcome::failed;
}
