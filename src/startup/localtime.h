#pragma once

/// Leaves "/var/db/timezone/localtime" in one of three states: unchanged when it points into the
/// active zoneinfo tree, rewritten when it points into the old one ("/usr/share/zoneinfo") and the
/// active tree has the zone, else pointing at America/Los_Angeles.
///
/// Prints "Correcting localtime link to %s" before a rewrite is tried and
/// "localtime link invalid; resetting to %s" before a reset. Throws `int` when even the default
/// link cannot be created.
void repair_localtime_link();
