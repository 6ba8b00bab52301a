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
  /// The download in the directory `dataset_path`, or the system copy for the empty path. A version
  /// text that does not parse gives the unknown version (and `vela_version::parse`'s messages).
  /// A path that does not begin with "/var/db/timezone/tz/" and at least one byte more prints
  /// "vela_dataset::create_components: bad path %s" and throws std::invalid_argument (errno 0).
  /// Throws also what parsing the version and constructing the components throw.
  explicit vela_dataset(std::string dataset_path = {});

  /// Whether both lie in the same place.
  bool operator==(const vela_dataset& other) const { return path == other.path; }

  /// Whether this one's version is strictly newer.
  bool operator>(const vela_dataset& other) const { return version > other.version; }

  /// Whether each component can stand in for the other dataset's in the same position. Not
  /// symmetric: it is this dataset's components that are asked.
  [[nodiscard]] bool compatible_schema(const vela_dataset& other) const;

  /// Makes this copy the active one, component by component: zoneinfo, then ICU. What a component
  /// throws ends it; those before it stay active. Meanwhile "/var/db/timezone/.switching" stands,
  /// until a link takes two steps: the mark makes room for that one.
  void activate() const;

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
