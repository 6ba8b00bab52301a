#include "ctl/tzif.h"

#include <algorithm>
#include <cstddef>
#include <cstdint>

namespace {

/// Cuts the first bytes off the front of `rest`, which has them.
std::string_view take(std::string_view& rest, std::uint64_t size) {
  const std::string_view taken = rest.substr(0, static_cast<std::size_t>(size));
  rest.remove_prefix(taken.size());
  return taken;
}

std::size_t byte_at(std::string_view bytes, std::size_t place) {
  return static_cast<unsigned char>(bytes[place]);
}

/// Cuts a big-endian number of 32 bits off the front of `rest`, which has it.
std::uint64_t take_number(std::string_view& rest) {
  std::uint64_t number = 0;
  for (const char byte : take(rest, 4)) number = number << 8 | static_cast<unsigned char>(byte);
  return number;
}

/// Whether each type of local time has a flag that is one, and an abbreviation inside the table.
bool are_types_sound(std::string_view types, std::string_view abbreviations) {
  const std::size_t last_end = abbreviations.rfind('\0');
  if (last_end == std::string_view::npos) return false;
  for (; !types.empty(); types.remove_prefix(6))
    if (byte_at(types, 4) > 1 || byte_at(types, 5) > last_end) return false;
  return true;
}

/// Cuts a header and its data, with times of that many bytes, off the front of `rest`. False where
/// they are not whole.
bool take_block(std::string_view& rest, std::size_t time_size) {
  constexpr std::size_t header_size = 44;
  constexpr std::size_t counts_place = 20;
  if (!rest.starts_with("TZif") || rest.size() < header_size) return false;
  std::string_view counts = take(rest, header_size).substr(counts_place);
  const std::uint64_t ut_indicators = take_number(counts);
  const std::uint64_t standard_indicators = take_number(counts);
  const std::uint64_t leap_seconds = take_number(counts);
  const std::uint64_t transitions = take_number(counts);
  const std::uint64_t types = take_number(counts);
  const std::uint64_t characters = take_number(counts);
  const auto is_none_or_all = [types](std::uint64_t count) { return count == 0 || count == types; };
  const std::uint64_t tail = leap_seconds * (time_size + 4) + standard_indicators + ut_indicators;
  if (types == 0 || !is_none_or_all(ut_indicators) || !is_none_or_all(standard_indicators) ||
      rest.size() < transitions * (time_size + 1) + types * 6 + characters + tail)
    return false;
  take(rest, transitions * time_size);
  const std::string_view type_of_each = take(rest, transitions);
  const std::string_view type_table = take(rest, types * 6);
  const std::string_view abbreviations = take(rest, characters);
  take(rest, tail);
  const auto is_inside = [types](char type) { return static_cast<unsigned char>(type) < types; };
  return std::ranges::all_of(type_of_each, is_inside) && are_types_sound(type_table, abbreviations);
}

}  // namespace

bool is_whole_zone(std::string_view content) {
  std::string_view rest = content;
  if (!take_block(rest, 4)) return false;
  if (content[4] == '\0') return rest.empty();  // the first version, with one block
  return take_block(rest, 8) && rest.starts_with('\n') && rest.find('\n', 1) == rest.size() - 1;
}
