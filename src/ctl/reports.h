#pragma once

#include "ctl/fault.h"

// kestrelctl decides and changes links with kestrel's own functions. In kestrel, `fs::report`
// prints a line at once. In kestrelctl it keeps the lines about calls that failed, and only those
// about a change of a link are printed.

/// The lines that are kept, without "kestrel: ".
[[nodiscard]] faults reports();

/// Keeps none of the lines so far. `stage_link` calls it, before a link is changed.
void forget_reports();
