#pragma once

/// Leaves "/var/db/timezone/localtime" in one of three states: unchanged when its content begins
/// with "/var/db/timezone/zoneinfo", whether or not the zone exists; with that in the place of a
/// leading "/usr/share/zoneinfo" when what it then names exists; else pointing at
/// America/Los_Angeles.
///
/// Prints "Correcting localtime link to %s" before a rewrite is tried and
/// "localtime link invalid; resetting to %s" before a reset. Throws `int` when even the default
/// link cannot be created.
void repair_localtime_link();
