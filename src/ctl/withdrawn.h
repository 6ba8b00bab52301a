#pragma once

#include <optional>
#include <set>
#include <string>

/// The list of the versions that `back` has left, and that `publish` refuses.
inline constexpr const char* withdrawn_list = "/var/db/timezone/withdrawn";

using version_set = std::set<std::string>;

/// The versions in the list, one a line; none where there is no list. Nothing where it cannot be
/// read.
[[nodiscard]] std::optional<version_set> read_withdrawn();

/// Replaces the list in one step, on the disk as well when this returns; where the set is empty, it
/// removes the list, which has to be there. Throws std::system_error; mostly, the old list stays
/// then.
void write_withdrawn(const version_set& versions);
