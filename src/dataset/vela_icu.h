#pragma once

#include <string>
#include <string_view>

#include "dataset/vela_dataset_component.h"

/// A directory of ICU time-zone data, made active by "/var/db/timezone/icutz"; the system copy is
/// active when that link is absent.
class vela_icu final : public vela_dataset_component {
 public:
  /// The data of the dataset at `path`, the system copy's for "". Throws what `initialize` throws.
  explicit vela_icu(const std::string& path = {});

  /// Empty where none was found.
  [[nodiscard]] const std::string& get_schema() const { return schema; }

  /// Whether `other` is ICU data of the same schema. Anything but ICU data prints
  /// "vela_icu::compatible_schema: could not dynamic_cast other component".
  [[nodiscard]] bool compatible_schema(const vela_dataset_component& other) const override;

  /// For a download, replaces "/var/db/timezone/icutz" by a link to this directory, in one step or
  /// by a removal and a creation; for the system copy, removes it. Then removes the legacy
  /// "/var/db/icutz", unless a removal failed: prints "unlink of ICU softlink failed" after either.
  /// Throws `int` when the link cannot be created. "icutz.new" stays only without room.
  void activate() const override;

 private:
  /// Finds the schema: the first word of the system copy's "icutzformat.txt"; in a download, that
  /// in the name of the first listed data file that is regular and readable by others. A download
  /// without one prints "No ICU schema found for %s". Without memory for reading the directory,
  /// prints "tz_icu::initialize: fts_open of %s failed, %s" and throws `int`.
  void initialize();

  std::string schema;
  const std::string icu_path;
};

/// The ICU data of the dataset at `dataset_path`, the system copy's for the empty path.
[[nodiscard]] std::string icu_directory(const std::string& dataset_path);

/// The schema in the name of an ICU data file, 44l for icutz44l.dat; empty for any other name.
[[nodiscard]] std::string_view data_file_schema(std::string_view name);
