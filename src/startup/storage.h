#pragma once

// The stages that put the storage in order before any dataset is looked at. Each prints nothing
// when all goes well, and lets no file-system failure out.

/// Gives "/var/db/timezone/" and "/var/db/timezone/tz/" the data-protection class without
/// protection, on platforms that have such classes; others refuse the request, and nothing comes of
/// it. A directory that cannot be opened is passed over.
void prepare_storage();

/// Copies the legacy link "/var/db/icutz" to "/var/db/timezone/icutz" when only the legacy one
/// exists, then removes the legacy one whatever became of the copy. A link exists when its target
/// does: one whose target is missing stays.
/// Prints "Could not migrate /var/db/icutz to /var/db/timezone/icutz" and
/// "Could not remove /var/db/icutz".
void migrate_legacy_icutz();

/// Removes the obsolete "/var/db/icu": a file, a link or an empty directory. Prints nothing.
void remove_legacy_icu();
