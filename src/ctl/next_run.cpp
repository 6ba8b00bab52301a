#include "ctl/next_run.h"

#include <fcntl.h>
#include <sys/stat.h>
#include <sys/statvfs.h>

#include <cerrno>

#include "ctl/files.h"
#include "dataset/vela_icu.h"
#include "paths.h"
#include "startup/dataset_links.h"
#include "startup/select_dataset.h"

namespace {

/// What `read` returns; nothing where it throws.
template <typename Read>
auto attempt(run_view& view, Read read) -> std::optional<decltype(read())> {
  errno = 0;
  std::optional<decltype(read())> result;
  try {
    result = read();
  } catch (...) {
    // A run would end here, or go back.
  }
  view.is_uncertain |= is_hard(errno);
  return result;
}

bool is_real_directory(const char* path) {
  struct stat found {};
  return ::lstat(path, &found) == 0 && S_ISDIR(found.st_mode);
}

/// Whether root can change entries of the storage, if there is room.
bool can_change_storage() {
  // STATX_ATTR_IMMUTABLE and STATX_ATTR_APPEND, which not every C library names.
  constexpr unsigned fixed = 0x10U | 0x20U;
  struct statvfs mount {};
  struct statx directory {};
  static_cast<void>(::statx(AT_FDCWD, paths::storage, 0, 0, &directory));
  return ::statvfs(paths::storage, &mount) == 0 && (mount.f_flag & ST_RDONLY) == 0 &&
         (directory.stx_attributes & fixed) == 0;
}

/// The path of the copy that a run makes active; nothing where it keeps the current one.
std::optional<std::string> chosen_path(const run_view& view) {
  const std::string system;
  if (!view.latest_path || !view.current || !view.latest) return system;
  // A run that cannot finish ends on the system copy, whatever the latest dataset is.
  const bool can_finish = view.can_change_storage && !view.is_icutz_directory;
  if (view.has_to_finish && !can_finish) return system;
  if (may_replace(*view.latest, *view.current, *view.system)) return view.latest_path;
  const bool stays = view.current_path && may_stay(*view.current, *view.system);
  return stays ? std::optional<std::string>() : system;
}

}  // namespace

run_view read_as_a_run() {
  run_view view;
  view.system = attempt(view, [] { return vela_dataset(); });
  view.latest_path = attempt(view, latest_dataset_path);
  view.current_path = attempt(view, current_dataset_path);
  view.current = attempt(view, [&view] { return vela_dataset(view.current_path.value_or("")); });
  view.latest = attempt(view, [&view] { return vela_dataset(view.latest_path.value_or("")); });
  view.can_change_storage = can_change_storage();
  view.is_zoneinfo_directory = is_real_directory(paths::zoneinfo_link);
  view.is_icutz_directory = is_real_directory(paths::icu_link);
  view.is_system_active = link_target(paths::zoneinfo_link) == paths::system_zoneinfo &&
                          (view.is_icutz_directory || !is_there(paths::icu_link));
  const std::string path = view.current_path.value_or("");
  view.has_to_finish = !path.empty() && link_target(paths::new_icu_link) == icu_directory(path);
  return view;
}

next_run decide(const run_view& view) {
  using enum next_run::action;
  if (!view.system) return {fails};
  const std::optional<std::string> chosen = chosen_path(view);
  if (!chosen) return {keeps};
  if (!view.can_change_storage || view.is_zoneinfo_directory) return {fails};
  if (!chosen->empty() && !view.is_icutz_directory) return {switches, *chosen};
  return {view.is_system_active ? keeps : goes_back};
}

std::string to_text(const next_run& run) {
  switch (run.what) {
    case next_run::action::keeps:
      return "keeps the active copy";
    case next_run::action::goes_back:
      return "goes back to the system copy";
    case next_run::action::switches:
      return "switches to " + run.path;
    case next_run::action::fails:
      break;
  }
  return "fails: it leaves the links as they are";
}
