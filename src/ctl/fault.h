#pragma once

#include <initializer_list>
#include <span>
#include <string>
#include <string_view>
#include <vector>

/// Something that is wrong.
struct fault {
  /// What `filled` makes of the format and the texts, and what to do about it; no cure where the
  /// format says enough. Each format has its entry in the manual.
  explicit fault(std::string_view format, std::initializer_list<std::string> texts = {},
                 std::string what_to_do = {});

  std::string what;
  std::string cure;
};
using faults = std::vector<fault>;

/// That not everyone can read what is at `path`.
[[nodiscard]] fault closed_to_some(const std::string& path);

/// Adds what is in `more` to `all`.
void append(faults& all, const faults& more);

/// `format` with each "%s" replaced by the next of `texts`.
[[nodiscard]] std::string filled(std::string_view format, std::span<const std::string> texts);

/// How a command ends: its exit status.
enum class outcome {
  done = 0,           // or nothing is wrong
  failed = 1,         // or something is wrong with the device
  wrong_usage = 2,    // or a text that is no version
  nothing_to_do = 3,  // the version is not newer, or withdrawn
  unusable = 4,       // the download, or the copy or the zone that was asked for
  not_now = 5,        // another command is at work, or there is no room
};

/// Why a command does not do what it was asked for.
struct refusal {
  outcome status;
  faults reasons;
};
