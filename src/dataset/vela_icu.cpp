#include "dataset/vela_icu.h"

#include <dirent.h>
#include <fcntl.h>
#include <sys/stat.h>

#include <cerrno>
#include <cstring>
#include <memory>

#include "fs/file.h"
#include "fs/operations.h"
#include "fs/report.h"
#include "paths.h"

namespace {

/// Whether an entry is itself a regular file that everyone may read.
bool is_public_file(DIR* directory, const char* name) noexcept {
  struct stat found {};
  return ::fstatat(::dirfd(directory), name, &found, AT_SYMLINK_NOFOLLOW) == 0 &&
         S_ISREG(found.st_mode) && (found.st_mode & S_IROTH) != 0;
}

/// The schema of the first data file in a download's directory; empty where there is none.
std::string find_schema(const char* path) {
  const std::unique_ptr<DIR, int (*)(DIR*)> directory(::opendir(path), ::closedir);
  if (directory == nullptr) {
    if (errno != ENOMEM) return {};
    fs::report(ENOMEM, "tz_icu::initialize: fts_open of %s failed, %s",
               {path, std::strerror(ENOMEM)});
    throw int{ENOMEM};
  }
  while (const dirent* const entry = ::readdir(directory.get())) {
    const std::string_view schema = data_file_schema(entry->d_name);
    if (!schema.empty() && is_public_file(directory.get(), entry->d_name))
      return std::string(schema);
  }
  return {};
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

std::string icu_directory(const std::string& dataset_path) {
  return dataset_path.empty() ? paths::system_icu : dataset_path + "/icutz";
}

vela_icu::vela_icu(const std::string& path)
    : vela_dataset_component(path), icu_path(icu_directory(path)) {
  initialize();
}

void vela_icu::initialize() {
  const bool is_download = !dataset_path.empty();
  schema = is_download ? find_schema(icu_path.c_str()) : fs::read_first_word(paths::system_schema);
  if (is_download && schema.empty())
    fs::report(0, "No ICU schema found for %s", {dataset_path.c_str()});
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
  const bool is_download = !dataset_path.empty();
  const char* const data = icu_path.c_str();
  const bool replaced =
      is_download && fs::replace_symlink(data, paths::icu_link, paths::new_icu_link);
  try {
    if (!replaced) fs::remove(paths::icu_link);
    fs::remove(paths::legacy_icu_link);
  } catch (...) {
    fs::report(errno, "unlink of ICU softlink failed");
  }
  if (!is_download) fs::unstage_symlink(paths::new_icu_link);
  if (is_download && !replaced) fs::create_symlink(data, paths::icu_link);
}
