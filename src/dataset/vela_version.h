#pragma once

#include <compare>
#include <cstdint>
#include <string>

/// The parsed form of a dataset's version text, such as 2022a or 2022a.1.0: a year, lower-case
/// letters and up to two further numbers. A default-constructed record is the unknown version,
/// older than every version that was parsed.
struct vela_version {
  std::int32_t year = -1;
  std::string letters;
  std::int32_t major = -1;  // -1 when absent, so older than a present 0
  std::int32_t minor = -1;

  /// Overwrites the record with the version that `text` names. A text of another form prints
  /// "Cannot parse version string %s, results.size() = 0" and "Cannot parse version string %s", and
  /// leaves the unknown version. Throws std::out_of_range (errno ERANGE) when a number is above
  /// 2147483647; the fields before it keep their new values.
  void parse(const std::string& text);

  /// Older and newer, field by field in the order above: numbers by value, letters by bytes.
  auto operator<=>(const vela_version& other) const = default;
};
