#pragma once

/// The fixed paths of a run. The names inside a copy of the data are in the code that reads them.
namespace paths {

// The system copy, shipped read-only with the operating system.
inline constexpr const char* system_zoneinfo = "/usr/share/zoneinfo.default";
inline constexpr const char* system_icu = "/usr/share/icu";
inline constexpr const char* system_schema = "/usr/share/icu/icutzformat.txt";

// The storage. The path of a download is `downloads` followed by its version text.
inline constexpr const char* storage = "/var/db/timezone/";
inline constexpr const char* downloads = "/var/db/timezone/tz/";

// The active copy: what libc's zoneinfo readers and ICU follow. There is no ICU link while the
// system copy is active.
inline constexpr const char* zoneinfo_link = "/var/db/timezone/zoneinfo";
inline constexpr const char* icu_link = "/var/db/timezone/icutz";

// Names the newest download; set by the downloader.
inline constexpr const char* latest_link = "/var/db/timezone/tz_latest";

// Names the local zone's file, reached through `zoneinfo_link`; and its target after a reset.
inline constexpr const char* localtime_link = "/var/db/timezone/localtime";
inline constexpr const char* default_localtime = "/var/db/timezone/zoneinfo/America/Los_Angeles";

// The names under which new links are staged before they are renamed over the old ones. The staged
// ICU link also shows the next run that this one was killed between the zoneinfo and the ICU link.
inline constexpr const char* new_zoneinfo_link = "/var/db/timezone/zoneinfo.new";
inline constexpr const char* new_icu_link = "/var/db/timezone/icutz.new";
inline constexpr const char* new_localtime_link = "/var/db/timezone/localtime.new";

// Holds the versions before and after the last switch.
inline constexpr const char* record = "/var/db/timezone/TZVersionDiffRecord";

// From earlier systems: an ICU link in another place, an obsolete entry, and the tree that
// `localtime_link` used to point into.
inline constexpr const char* legacy_icu_link = "/var/db/icutz";
inline constexpr const char* legacy_icu = "/var/db/icu";
inline constexpr const char* legacy_zoneinfo = "/usr/share/zoneinfo";

}  // namespace paths
