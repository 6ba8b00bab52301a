#pragma once

#include <string_view>

/// Whether the content of a zone's file (TZif, RFC 9636) is whole: as long as the counts in its
/// headers say, with every type, abbreviation and indicator inside its table, and with a footer
/// where its version has one. Of any other content libc makes UTC.
[[nodiscard]] bool is_whole_zone(std::string_view content);
