#pragma once

#include <string>
#include <string_view>

#include "ctl/copies.h"

/// Whether the content of a zone's file (TZif, RFC 9636) is whole: as long as the counts in its
/// headers say, with a type of local time, and with a footer where its version has one.
[[nodiscard]] bool is_whole_zone(std::string_view zone);

/// Whether the content of an ICU resource bundle is whole: at least as long as its index says.
[[nodiscard]] bool is_whole_bundle(std::string_view bundle);

/// The content of the regular file at `path`, links followed; empty where it cannot be read.
[[nodiscard]] std::string content_of(const files::path& path);

/// Prints "kestrelctl: FAULT" on standard error as a line and gives false.
bool complain(const std::string& fault);

/// Whether the download in `directory` has ICU's four bundles, the local zone and the files that
/// the system copy has, all whole. Complains of each that is not, by its path in the download.
/// Throws std::system_error where a directory cannot be read.
[[nodiscard]] bool is_complete(const files::path& directory);
