#include "ctl/bundle.h"

#include <cstddef>
#include <cstdint>

namespace {

constexpr std::size_t byte_order_place = 8;

bool is_big_endian(std::string_view content) {
  return content[byte_order_place] != 0;
}

/// The number in the bytes at a place, which are all there.
std::uint64_t number_at(std::string_view content, std::size_t place, std::size_t size) {
  std::uint64_t number = 0;
  for (std::size_t i = 0; i < size; ++i) {
    const std::size_t next = is_big_endian(content) ? i : size - 1 - i;
    number = number << 8 | static_cast<unsigned char>(content[place + next]);
  }
  return number;
}

}  // namespace

bool is_whole_bundle(std::string_view content) {
  if (content.find("\xda\x27", 2) != 2 || content.find("ResB", 12) != 12) return false;
  // The fifth word of the body is the body's length in words of 32 bits.
  const auto body = static_cast<std::size_t>(number_at(content, 0, 2));
  if (content.size() < body + 16 + 4) return false;
  const std::uint64_t length = 4 * number_at(content, body + 16, 4);
  return length > 16 && content.size() >= body + length;
}

bool has_byte_order_of(std::string_view schema, std::string_view content) {
  return is_big_endian(content) != schema.ends_with('l');
}
