#pragma once

#include <string>

#include "ctl/fault.h"

// Every line that kestrelctl prints. A byte that is no printable ASCII becomes "?": names come from
// whoever made a download, and must not reach a terminal as control characters.

/// Prints "TEXT" on standard output as a line.
void say(const std::string& text);

/// Prints "kestrelctl: WHAT" or "kestrelctl: WHAT: CURE" on standard error as a line.
void complain(const fault& one);

/// Prints the first twenty, none of them twice, and how many more there are.
void complain_all(const faults& all);

/// Prints the reasons and gives the status.
[[nodiscard]] outcome refuse(const refusal& why);
