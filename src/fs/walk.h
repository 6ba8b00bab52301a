#pragma once

#include <fts.h>

#include <memory>
#include <string>

namespace fs {

/// An fts(3) walk that closes itself at the end of its scope.
using walk = std::unique_ptr<FTS, decltype(&::fts_close)>;

/// Opens a walk over the tree at `root`: followed if it is a link itself, not beyond other links,
/// not into other file systems, each directory in the order in which it is listed. Empty where
/// the walk cannot be opened, with the reason in errno; prints nothing.
[[nodiscard]] walk open_walk(std::string root);

}  // namespace fs
