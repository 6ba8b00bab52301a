#pragma once

#include <string>

/// Prints the state of the device on standard output, a line "name: value" for each fact. Gives
/// whether all is well with it and the next run changes nothing, and complains of each fault.
[[nodiscard]] bool status();

/// Prints that the copy at `path` is active and gives true; where it is not, complains of that and
/// of the device's faults.
[[nodiscard]] bool confirm_active(const std::string& path);
