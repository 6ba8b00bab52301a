#include "dataset/vela_version.h"

#include <cerrno>
#include <charconv>
#include <stdexcept>
#include <string_view>
#include <system_error>

#include "fs/report.h"

namespace {

/// Cuts the longest run of bytes that are among `allowed` off the front of `rest`; may be empty.
std::string_view take_run(std::string_view& rest, std::string_view allowed = "0123456789") {
  const std::string_view run = rest.substr(0, rest.find_first_not_of(allowed));
  rest.remove_prefix(run.size());
  return run;
}

/// Cuts a dot and digits off the front of `rest` and gives the digits; neither if one is missing.
std::string_view take_dotted_number(std::string_view& rest) {
  std::string_view behind_dot = rest.substr(rest.starts_with('.') ? 1 : rest.size());
  const std::string_view number = take_run(behind_dot);
  if (!number.empty()) rest = behind_dot;
  return number;
}

/// The value of a run of digits, -1 for an empty one.
std::int32_t to_number(std::string_view number) {
  std::int32_t value = -1;
  const auto result = std::from_chars(number.data(), number.data() + number.size(), value);
  if (result.ec == std::errc::result_out_of_range) {
    errno = ERANGE;
    throw std::out_of_range("version number");
  }
  return value;
}

}  // namespace

// ([0-9]+)([a-z]+)(?:\.([0-9]+))?(?:\.([0-9]+))?
void vela_version::parse(const std::string& text) {
  std::string_view rest = text;
  const std::string_view year_digits = take_run(rest);
  const std::string_view letter_run = take_run(rest, "abcdefghijklmnopqrstuvwxyz");
  const std::string_view major_digits = take_dotted_number(rest);
  const std::string_view minor_digits = take_dotted_number(rest);
  if (year_digits.empty() || letter_run.empty() || !rest.empty()) {
    fs::report(0, "Cannot parse version string %s, results.size() = 0", {text.c_str()});
    fs::report(0, "Cannot parse version string %s", {text.c_str()});
    *this = {};
    return;
  }
  year = to_number(year_digits);
  letters = letter_run;
  major = to_number(major_digits);
  minor = to_number(minor_digits);
}
