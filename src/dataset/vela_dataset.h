#pragma once

#include <memory>
#include <string>
#include <vector>

#include "dataset/vela_dataset_component.h"
#include "dataset/vela_version.h"

/// One complete copy of the time-zone data: the system copy, or a download in a directory named by
/// its version under "/var/db/timezone/tz/". Built whole by its constructor and never changed.
class vela_dataset {
 public:
  /// The download in the directory `dataset_path`, or the system copy for the empty path. A path
  /// that does not begin with "/var/db/timezone/tz/" and at least one byte more prints
  /// "vela_dataset::create_components: bad path %s" and throws std::invalid_argument (errno 0).
  /// Prints and throws also what parsing the version and constructing the components do.
  explicit vela_dataset(std::string dataset_path = {});

  /// Whether both have the same path.
  bool operator==(const vela_dataset& other) const { return path == other.path; }

  /// Whether this one's version is strictly newer.
  bool operator>(const vela_dataset& other) const { return version > other.version; }

  /// Whether each component can serve in the place of the other dataset's in the same position.
  /// Not symmetric: this dataset's components are asked.
  [[nodiscard]] bool compatible_schema(const vela_dataset& other) const;

  /// Makes this copy the active one: zoneinfo first, then ICU. Where it can be made, a link to the
  /// ICU data is at "/var/db/timezone/icutz.new" meanwhile. What a component throws ends it.
  void activate() const;

  /// Completes a killed activation of this dataset, which the zoneinfo link names: activates the
  /// ICU component if "/var/db/timezone/icutz.new" is a link to its data. Throws what that throws.
  void finish() const;

  /// The text that the version was parsed from: what follows "/var/db/timezone/tz/" in a download's
  /// path, or the first word of the system copy's "+VERSION" followed by ".1.0".
  [[nodiscard]] const std::string& get_version_string() const { return version_string; }

 private:
  void create_components();

  vela_version version;
  std::string version_string;
  std::string path;
  std::vector<std::shared_ptr<vela_dataset_component>> components;  // zoneinfo, ICU
};
