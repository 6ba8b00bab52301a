#include "dataset/vela_dataset.h"

#include <algorithm>
#include <cerrno>
#include <stdexcept>
#include <string_view>
#include <utility>

#include "dataset/vela_icu.h"
#include "dataset/vela_zoneinfo.h"
#include "fs/operations.h"
#include "fs/report.h"
#include "paths.h"

vela_dataset::vela_dataset(std::string dataset_path) : path(std::move(dataset_path)) {
  create_components();
}

void vela_dataset::create_components() {
  constexpr std::string_view downloads = paths::downloads;
  const std::shared_ptr<vela_zoneinfo> zoneinfo(new vela_zoneinfo(path));
  if (path.empty()) {
    version_string = zoneinfo->get_version_text() + ".1.0";
  } else if (path.size() > downloads.size() && path.starts_with(downloads)) {
    version_string = path.substr(downloads.size());
  } else {
    errno = 0;
    fs::report(errno, "vela_dataset::create_components: bad path %s", {path.c_str()});
    throw std::invalid_argument("badpath");
  }
  version.parse(version_string);
  components = {zoneinfo, std::shared_ptr<vela_dataset_component>(new vela_icu(path))};
}

bool vela_dataset::compatible_schema(const vela_dataset& other) const {
  return std::ranges::equal(components, other.components, [](const auto& mine, const auto& theirs) {
    return mine->compatible_schema(*theirs);
  });
}

void vela_dataset::activate() const {
  const std::string tree = zoneinfo_directory(path);
  const std::string icu = icu_directory(path);
  // Both are staged before either link changes. The ICU link is staged for the system copy as well,
  // which has none: if this run is killed in between, the next one sees by it what to finish.
  if (!fs::stage_symlink(tree.c_str(), paths::new_zoneinfo_link))
    fs::require_room(tree.c_str(), paths::zoneinfo_link);
  if (!fs::stage_symlink(icu.c_str(), paths::new_icu_link) && !path.empty())
    fs::require_room(icu.c_str(), paths::icu_link);
  try {
    for (const auto& component : components) component->activate();
  } catch (...) {
    // Without room, the staged link may be the only sign of what is not finished.
    if (errno != ENOSPC && errno != EDQUOT) fs::unstage_symlink(paths::new_icu_link);
    throw;
  }
}

void vela_dataset::finish() const {
  if (fs::is_symlink_to(icu_directory(path).c_str(), paths::new_icu_link))
    components.back()->activate();
}
