#include "dataset/vela_zoneinfo.h"

#include <cerrno>

#include "fs/file.h"
#include "fs/operations.h"
#include "fs/report.h"
#include "paths.h"

vela_zoneinfo::vela_zoneinfo(const std::string& path)
    : vela_dataset_component(path),
      zoneinfo_path(path.empty() ? paths::system_zoneinfo : path + "/zoneinfo"),
      version_text(fs::read_first_word((zoneinfo_path + "/+VERSION").c_str())) {}

bool vela_zoneinfo::compatible_schema(const vela_dataset_component& /*other*/) const {
  return true;
}

void vela_zoneinfo::activate() const {
  try {
    fs::remove(paths::zoneinfo_link);
  } catch (...) {
    fs::report(errno, "Unlink of zoneinfo softlink failed");
  }
  fs::create_symlink(zoneinfo_path.c_str(), paths::zoneinfo_link);
}
