#pragma once

#include <string>

#include "dataset/vela_dataset_component.h"

/// A zoneinfo tree, made active by "/var/db/timezone/zoneinfo".
class vela_zoneinfo final : public vela_dataset_component {
 public:
  /// The tree "zoneinfo" in the directory `path`, or the system copy's for the empty path. Reads
  /// the version text from the tree's "+VERSION"; a file that cannot be read gives an empty one.
  explicit vela_zoneinfo(const std::string& path = {});

  /// The first word of "+VERSION", of whatever form.
  [[nodiscard]] const std::string& get_version_text() const { return version_text; }

  /// Always true: any tree can serve in the place of any other.
  [[nodiscard]] bool compatible_schema(const vela_dataset_component& /*other*/) const override {
    return true;
  }

  /// Replaces "/var/db/timezone/zoneinfo" by a link to this tree, which need not exist, in one step
  /// or by a removal and a creation; prints "Unlink of zoneinfo softlink failed" after a removal
  /// that fails, and continues. Throws `int` when the link cannot be created.
  void activate() const override;

 private:
  const std::string zoneinfo_path;
  const std::string version_text;
};

/// The tree of the dataset in the directory `dataset_path`, the system copy's for the empty one.
[[nodiscard]] std::string zoneinfo_directory(const std::string& dataset_path);
