#pragma once

/// Leaves "/var/db/timezone/localtime" as it is when its content begins with
/// "/var/db/timezone/zoneinfo", whether or not the zone exists. Puts that in the place of a leading
/// "/usr/share/zoneinfo" when the result exists. Otherwise sets it to America/Los_Angeles.
/// Prints "Correcting localtime link to %s" before a rewrite is tried and
/// "localtime link invalid; resetting to %s" before a reset. Throws `int` when even the default
/// link cannot be created.
void repair_localtime_link();
