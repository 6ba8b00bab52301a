#include "dataset/vela_icu.h"

#include <fts.h>
#include <sys/stat.h>

#include <cerrno>
#include <cstring>

#include "fs/file.h"
#include "fs/operations.h"
#include "fs/report.h"
#include "fs/walk.h"
#include "paths.h"

namespace {

/// A file directly inside the walk's root that everyone may read.
bool is_public_file(const FTSENT& entry) {
  return entry.fts_errno == 0 && entry.fts_level == 1 && entry.fts_namelen != 0 &&
         entry.fts_info == FTS_F && (entry.fts_statp->st_mode & S_IROTH) != 0;
}

/// The schema of the first data file in a download's directory; empty where there is none.
std::string find_schema(const std::string& directory) {
  const fs::walk walk = fs::open_walk(directory);
  if (!walk) {
    const int error = errno;
    fs::report(error, "tz_icu::initialize: fts_open of %s failed, %s",
               {directory.c_str(), std::strerror(error)});
    throw int{error};
  }
  std::string_view schema;
  while (schema.empty()) {
    FTSENT* const entry = ::fts_read(walk.get());
    if (entry == nullptr) break;
    if (is_public_file(*entry)) {
      schema = data_file_schema({entry->fts_name, entry->fts_namelen});
    } else if (entry->fts_info == FTS_D && entry->fts_level > 0) {
      // What lies below never counts, and going down costs with its size and depth.
      ::fts_set(walk.get(), entry, FTS_SKIP);
    }
  }
  return std::string(schema);
}

}  // namespace

// icutz([0-9]+[lbe])\.dat
std::string_view data_file_schema(std::string_view name) {
  constexpr std::string_view prefix = "icutz";
  constexpr std::string_view suffix = ".dat";
  if (!name.starts_with(prefix) || !name.ends_with(suffix)) return {};
  name.remove_prefix(prefix.size());
  name.remove_suffix(suffix.size());
  const bool matches = name.size() >= 2 &&
                       name.find_first_not_of("0123456789") == name.size() - 1 &&
                       name.find_last_of("lbe") == name.size() - 1;
  return matches ? name : std::string_view();
}

vela_icu::vela_icu(const std::string& path)
    : vela_dataset_component(path), icu_path(path.empty() ? paths::system_icu : path + "/icutz") {
  initialize();
}

void vela_icu::initialize() {
  if (dataset_path.empty()) {
    schema = fs::read_first_word((icu_path + "/icutzformat.txt").c_str());
    return;
  }
  schema = find_schema(icu_path);
  if (schema.empty()) fs::report(0, "No ICU schema found for %s", {dataset_path.c_str()});
}

bool vela_icu::compatible_schema(const vela_dataset_component& other) const {
  const auto* const other_icu = dynamic_cast<const vela_icu*>(&other);
  if (other_icu == nullptr) {
    fs::report(0, "vela_icu::compatible_schema: could not dynamic_cast other component");
    return false;
  }
  return schema == other_icu->schema;
}

void vela_icu::activate() const {
  try {
    fs::remove(paths::icu_link);
    fs::remove(paths::legacy_icu_link);
  } catch (...) {
    fs::report(errno, "unlink of ICU softlink failed");
  }
  if (!dataset_path.empty()) fs::create_symlink(icu_path.c_str(), paths::icu_link);
}
