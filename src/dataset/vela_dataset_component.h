#pragma once

#include <string>
#include <utility>

/// One kind of time-zone data of one dataset, and the link through which the system reads it. It
/// reads its files when it is constructed and never changes. A shared pointer made from a pointer
/// to its concrete class holds it: the protected destructor forbids deleting it through this one.
class vela_dataset_component {
 public:
  /// Whether `other` can serve in this component's place.
  [[nodiscard]] virtual bool compatible_schema(const vela_dataset_component& other) const = 0;

  /// Re-points this component's system link at this component's files. Throws `int` when the link
  /// cannot be created.
  virtual void activate() const = 0;

 protected:
  explicit vela_dataset_component(std::string path = {}) : dataset_path(std::move(path)) {}
  ~vela_dataset_component() = default;

  /// The directory of the download; empty for the system copy.
  const std::string dataset_path;
};
