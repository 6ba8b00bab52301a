#pragma once

#include <string_view>

/// Whether the content of an ICU resource bundle is whole: at least as long as its index says. ICU
/// answers offset 0 for every zone where it is not.
[[nodiscard]] bool is_whole_bundle(std::string_view content);

/// Whether a whole bundle has the byte order of the schema: little-endian for a schema that ends
/// with "l", such as 44l, else big-endian. ICU reads a bundle of its own order only.
[[nodiscard]] bool has_byte_order_of(std::string_view schema, std::string_view content);
