#pragma once

#include <string>

#include "ctl/fault.h"

/// What makes a copy of the data unfit for its readers. `path` is the directory of a download,
/// empty for the system copy; `version` is its version text; `shown` is how the lines call `path`.
///
/// Looked at is every entry of the tree: that each file with a zone's name is a whole zone and no
/// other one is empty, that everyone can read it, and that each link leads to such a file or to a
/// directory, inside of the tree. An absolute link that the image has too is the image's own, and
/// "localtime" may lead to /etc/localtime. Also the release in "+VERSION" and "tzdata.zi". In a
/// download also: the schema, the four bundles with their byte order, that no link in "icutz" leads
/// out of the download, and that nothing is missing that the system copy has.
///
/// A fault has a cure of its own where other modes are enough; otherwise the data has to come anew.
/// Throws std::system_error where the disk or the system fails.
[[nodiscard]] faults faults_of_copy(const std::string& path, const std::string& version,
                                    const std::string& shown);

/// Whether the copy at `path` has the zone `name`, such as Europe/Paris, in its tree, and that is
/// whole. A name that leads there by a detour is none, nor is one that leads out, as "localtime"
/// may.
[[nodiscard]] bool has_zone(const std::string& path, const std::string& name);

/// The schema of the copy at `path`; empty where it has none. Throws std::system_error where the
/// disk or the system fails.
[[nodiscard]] std::string schema_of(const std::string& path);

/// The release of a version: 2026b for 2026b.1.0.
[[nodiscard]] std::string release_of(const std::string& version);
