#include "startup/localtime.h"

#include <cerrno>
#include <cstdio>
#include <cstring>
#include <string>

#include "fs/operations.h"
#include "fs/report.h"
#include "paths.h"

namespace {

/// Unlike `fs::remove`, the C library's remove(3) removes an empty directory too, and is silent.
void replace_localtime_link(const char* target) {
  if (fs::replace_symlink(target, paths::localtime_link, paths::new_localtime_link)) return;
  static_cast<void>(std::remove(paths::localtime_link));
  fs::create_symlink(target, paths::localtime_link);
}

/// Whether the link is good or has been corrected. If not, or if this throws, errno is the number
/// of the call that failed, or 0.
bool keep_or_correct() {
  const std::string target = fs::read_symlink(paths::localtime_link);
  if (target.starts_with(paths::zoneinfo_link)) return true;
  if (!target.starts_with(paths::legacy_zoneinfo)) {
    errno = target.empty() ? ENOENT : 0;
    return false;
  }
  const std::string corrected =
      paths::zoneinfo_link + target.substr(std::strlen(paths::legacy_zoneinfo));
  fs::report(0, "Correcting localtime link to %s", {corrected.c_str()});
  if (!fs::exists(corrected.c_str())) return false;
  replace_localtime_link(corrected.c_str());
  return true;
}

}  // namespace

void repair_localtime_link() {
  try {
    if (keep_or_correct()) return;
  } catch (...) {
    // Reported where it was thrown. The reset follows.
  }
  fs::report(errno, "localtime link invalid; resetting to %s", {"America/Los_Angeles"});
  replace_localtime_link(paths::default_localtime);
}
