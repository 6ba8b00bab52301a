#pragma once

/// Decides which dataset is active. Keeps the current one while its schema is the system copy's
/// and it is not older than the system copy, else resets to the system copy; then switches to the
/// newest download if that has the system copy's schema and is newer than the current dataset,
/// and records the switch in "/var/db/timezone/TZVersionDiffRecord".
///
/// Where a run was killed while it activated a dataset, first activates the current one again,
/// without a word of its own: the zoneinfo link, changed first, tells how far that run got.
///
/// Handles a current link that cannot be read or understood (by a reset) and a record that cannot
/// be written (by going on without); throws on every other failure.
/// Prints "Invalid current symlinks; resetting to system partition",
/// "Symlink points at data incompatible with installed system" and
/// "New update not compatible or older version: %s vs. %s" (latest, current).
void select_dataset();
