#include "startup/storage.h"

#include <fcntl.h>

#include <cerrno>
#include <cstdio>

#include "fs/descriptor.h"
#include "fs/operations.h"
#include "fs/report.h"
#include "paths.h"

namespace {

void mark_unprotected(const char* path) noexcept {
  constexpr int set_class = 64;
  constexpr int without_protection = 4;
  const fs::descriptor directory(::open(path, O_RDONLY | O_CLOEXEC));
  if (directory.is_open()) ::fcntl(directory.get(), set_class, without_protection);
}

}  // namespace

void prepare_storage() {
  mark_unprotected(paths::storage);
  mark_unprotected(paths::downloads);
}

void migrate_legacy_icutz() {
  if (fs::exists(paths::legacy_icu_link) && !fs::exists(paths::icu_link)) {
    try {
      fs::create_symlink(fs::read_symlink(paths::legacy_icu_link).c_str(), paths::icu_link);
    } catch (...) {
      fs::report(errno, "Could not migrate /var/db/icutz to /var/db/timezone/icutz");
    }
  }
  if (fs::exists(paths::legacy_icu_link)) {
    try {
      fs::remove(paths::legacy_icu_link);
    } catch (...) {
      fs::report(errno, "Could not remove /var/db/icutz");
    }
  }
}

void remove_legacy_icu() {
  static_cast<void>(std::remove(paths::legacy_icu));
}
