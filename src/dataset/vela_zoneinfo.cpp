#include "dataset/vela_zoneinfo.h"

#include <unistd.h>

#include <cerrno>

#include "fs/file.h"
#include "fs/operations.h"
#include "fs/report.h"
#include "paths.h"

vela_zoneinfo::vela_zoneinfo(const std::string& path)
    : vela_dataset_component(path),
      zoneinfo_path(path.empty() ? paths::system_zoneinfo : path + "/zoneinfo"),
      version_text(fs::read_first_word((zoneinfo_path + "/+VERSION").c_str())) {}

void vela_zoneinfo::activate() const {
  const char* const tree = zoneinfo_path.c_str();
  if (fs::replace_symlink(tree, paths::zoneinfo_link, paths::new_zoneinfo_link)) return;
  try {
    fs::remove(paths::zoneinfo_link);
  } catch (...) {
    fs::report(errno, "Unlink of zoneinfo softlink failed");
  }
  ::unlink(paths::new_icu_link);  // on a full storage, the last room
  fs::create_symlink(tree, paths::zoneinfo_link);
}
