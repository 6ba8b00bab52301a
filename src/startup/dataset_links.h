#pragma once

#include <string>

// The links that name datasets. A dataset path is the directory of a download, or the empty text
// for the system copy.

/// The target of "/var/db/timezone/tz_latest", not examined; empty when there is no such link.
/// Throws what `fs::read_symlink` throws.
[[nodiscard]] std::string latest_dataset_path();

/// What "/var/db/timezone/zoneinfo" names; a missing link is a bad one. Throws what
/// `fs::read_symlink` and `dataset_path_from_link` throw.
[[nodiscard]] std::string current_dataset_path();

/// The dataset path that the zoneinfo link's content `target` names: what comes before its
/// last "/" for a tree in a download, empty for exactly the system copy's tree.
/// Anything else prints "Bad zoneinfo link %s" and throws the `int` -1; errno is then ENOENT for
/// an empty target, that of a missing link, and otherwise 0.
[[nodiscard]] std::string dataset_path_from_link(const std::string& target);

/// Makes the system copy, read afresh, the active one. Throws what its `activate` throws.
void reset_to_system();
