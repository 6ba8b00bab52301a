#pragma once

// The stages before any dataset is read. None prints when nothing is wrong, or throws `int`.

/// Gives "/var/db/timezone/" and "/var/db/timezone/tz/" the data-protection class without
/// protection, where the platform has such classes. Skips a directory that cannot be opened.
void prepare_storage();

/// Copies the legacy link "/var/db/icutz" to "/var/db/timezone/icutz" when only the legacy one
/// exists, then removes it even if that failed. A link exists when its target does.
/// Prints "Could not migrate /var/db/icutz to /var/db/timezone/icutz" and
/// "Could not remove /var/db/icutz".
void migrate_legacy_icutz();

/// Removes the obsolete "/var/db/icu": a file, a link or an empty directory. Prints nothing.
void remove_legacy_icu();
