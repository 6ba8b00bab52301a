#include "startup/dataset_links.h"

#include <cerrno>
#include <cstddef>
#include <string_view>

#include "dataset/vela_dataset.h"
#include "fs/operations.h"
#include "fs/report.h"
#include "paths.h"

std::string latest_dataset_path() {
  return fs::read_symlink(paths::latest_link);
}

std::string current_dataset_path() {
  return dataset_path_from_link(fs::read_symlink(paths::zoneinfo_link));
}

std::string dataset_path_from_link(const std::string& target) {
  constexpr std::string_view downloads = paths::downloads;
  if (target.starts_with(downloads)) {
    // A "/" right behind the prefix is as bad as none: it would leave no directory name.
    const std::size_t last_slash = target.rfind('/');
    if (last_slash > downloads.size()) return target.substr(0, last_slash);
  } else if (target == paths::system_zoneinfo) {
    return {};
  }
  errno = target.empty() ? ENOENT : 0;
  fs::report(errno, "Bad zoneinfo link %s", {target.c_str()});
  throw -1;
}

void reset_to_system() {
  vela_dataset().activate();
}
