#pragma once

#include <string>
#include <string_view>

#include "dataset/vela_dataset_component.h"

/// A directory of ICU time-zone data, made active by "/var/db/timezone/icutz"; the system copy is
/// active when that link is absent.
class vela_icu final : public vela_dataset_component {
 public:
  /// The ICU data "icutz" in the directory `path`, or the system copy's for the empty path.
  /// Throws what `initialize` throws.
  explicit vela_icu(const std::string& path = {});

  /// Whether `other` is ICU data of the same schema. Anything but ICU data prints
  /// "vela_icu::compatible_schema: could not dynamic_cast other component".
  [[nodiscard]] bool compatible_schema(const vela_dataset_component& other) const override;

  /// For a download, puts a link to this directory in the place of "/var/db/timezone/icutz", in one
  /// step or else by a removal and a creation; for the system copy, removes it. Then removes the
  /// legacy "/var/db/icutz". The first removal that fails is the last: prints
  /// "unlink of ICU softlink failed" and goes on; throws `int` when the creation fails.
  void activate() const override;

 private:
  /// Finds the schema: the first word of the system copy's "icutzformat.txt", or, for a download,
  /// that in the name of the first data file listed in its directory: a regular file, readable by
  /// others. A download without one prints "No ICU schema found for %s", whatever the reason.
  /// Prints "tz_icu::initialize: fts_open of %s failed, %s" and throws `int` where there is no
  /// memory for reading the directory.
  void initialize();

  std::string schema;
  const std::string icu_path;
};

/// The schema in the name of an ICU data file, 44l for icutz44l.dat; empty for any other name.
[[nodiscard]] std::string_view data_file_schema(std::string_view name);
