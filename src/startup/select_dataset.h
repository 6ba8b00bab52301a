#pragma once

/// Decides which dataset is active. Finishes an activation of the current dataset that was killed.
/// Keeps the current dataset while its schema is the system copy's and it is not older than the
/// system copy, else resets to the system copy. Then switches to the newest download if that has
/// the system copy's schema and is newer than the current dataset, and records the switch in
/// "/var/db/timezone/TZVersionDiffRecord".
/// Handles a current link that cannot be read or understood (by a reset) and a record that cannot
/// be written (by going on without it); throws on every other failure.
/// Prints "Invalid current symlinks; resetting to system partition",
/// "Symlink points at data incompatible with installed system" and
/// "New update not compatible or older version: %s vs. %s" (latest, current).
void select_dataset();
