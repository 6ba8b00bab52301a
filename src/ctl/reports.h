#pragma once

#include "ctl/fault.h"

// kestrelctl decides and changes links with kestrel's own functions. In kestrel, `fs::report`
// prints a line at once. In kestrelctl it keeps the line: what was read is told in other words, and
// only the lines about a change that failed are printed.

/// The lines since the last call, without "kestrel: ".
[[nodiscard]] faults take_reports();
