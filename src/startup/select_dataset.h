#pragma once

#include "dataset/vela_dataset.h"

/// Whether `current` may stay active: it has the system copy's schema and is not older.
[[nodiscard]] bool may_stay(const vela_dataset& current, const vela_dataset& system);

/// Whether a run switches to `latest`: it has the system copy's schema and is newer than `current`,
/// even where that may not stay and the system copy takes its place.
[[nodiscard]] bool may_replace(const vela_dataset& latest, const vela_dataset& current,
                               const vela_dataset& system);

/// Decides which dataset is active. Keeps the current one if it `may_stay`, and finishes a killed
/// activation of it; else resets to the system copy. Then switches to the newest download if that
/// `may_replace` the current one, and records that in "/var/db/timezone/TZVersionDiffRecord".
/// Resets where the current link cannot be read or understood, and ignores a record that cannot be
/// written; throws on every other failure.
/// Prints "Invalid current symlinks; resetting to system partition",
/// "Symlink points at data incompatible with installed system" and
/// "New update not compatible or older version: %s vs. %s" (latest, current).
void select_dataset();
