#include "dataset/vela_zoneinfo.h"

#include <cerrno>

#include "fs/file.h"
#include "fs/operations.h"
#include "fs/report.h"
#include "paths.h"

std::string zoneinfo_directory(const std::string& dataset_path) {
  return dataset_path.empty() ? paths::system_zoneinfo : dataset_path + "/zoneinfo";
}

vela_zoneinfo::vela_zoneinfo(const std::string& path)
    : vela_dataset_component(path),
      zoneinfo_path(zoneinfo_directory(path)),
      version_text(fs::read_first_word((zoneinfo_path + "/+VERSION").c_str())) {}

void vela_zoneinfo::activate() const {
  const char* const tree = zoneinfo_path.c_str();
  if (fs::replace_symlink(tree, paths::zoneinfo_link, paths::new_zoneinfo_link)) return;
  try {
    fs::remove(paths::zoneinfo_link);
  } catch (...) {
    fs::report(errno, "Unlink of zoneinfo softlink failed");
  }
  fs::create_symlink(tree, paths::zoneinfo_link);
}
