#include "ctl/whole.h"

#include <cstddef>
#include <cstdint>
#include <fstream>
#include <iostream>
#include <iterator>
#include <system_error>

#include "paths.h"

namespace {

/// The number in the bytes at a place, which are all there.
std::uint64_t number_at(std::string_view bytes, std::size_t place, std::size_t size, bool big) {
  std::uint64_t number = 0;
  for (std::size_t i = 0; i < size; ++i)
    number = number << 8 | static_cast<unsigned char>(bytes[place + (big ? i : size - 1 - i)]);
  return number;
}

/// Cuts a header and its data, with times of that many bytes, off the front of `zone`. False where
/// they are not whole.
bool take_block(std::string_view& zone, std::size_t time_size) {
  constexpr std::size_t header = 44;
  if (!zone.starts_with("TZif") || zone.size() < header) return false;
  const auto count = [zone](std::size_t n) { return number_at(zone, 20 + 4 * n, 4, true); };
  const std::uint64_t length = header + count(3) * (time_size + 1) + count(4) * 6 + count(5) +
                               count(2) * (time_size + 4) + count(1) + count(0);
  if (count(4) == 0 || length > zone.size()) return false;
  zone.remove_prefix(static_cast<std::size_t>(length));
  return true;
}

bool leads_out(const files::path& path) {
  return files::is_symlink(path) && files::read_symlink(path).is_absolute();
}

}  // namespace

bool is_whole_zone(std::string_view zone) {
  const bool has_one_block = zone.size() > 4 && zone[4] == '\0';
  if (!take_block(zone, 4)) return false;
  if (has_one_block) return zone.empty();
  return take_block(zone, 8) && zone.size() > 1 && zone.starts_with('\n') &&
         zone.find('\n', 1) == zone.size() - 1;
}

bool is_whole_bundle(std::string_view bundle) {
  if (bundle.size() < 16 || bundle.substr(2, 2) != "\xda\x27" || bundle.substr(12, 4) != "ResB")
    return false;
  const bool big = bundle[8] != 0;
  const auto header = static_cast<std::size_t>(number_at(bundle, 0, 2, big));
  if (bundle.size() < header + 16 + 4) return false;
  // The fifth word of the body is its length in words of 32 bits.
  const std::uint64_t length = 4 * number_at(bundle, header + 16, 4, big);
  return length > 16 && bundle.size() >= header + length;
}

std::string content_of(const files::path& path) {
  std::error_code error;
  std::ifstream file;
  if (files::is_regular_file(path, error) && files::file_size(path, error) < 64U << 20)
    file.open(path, std::ios::binary);
  return {std::istreambuf_iterator<char>(file), {}};
}

bool complain(const std::string& fault) {
  std::cerr << "kestrelctl: " << fault.substr(0, fault.find('\n')) << '\n';
  return false;
}

bool is_complete(const files::path& directory) {
  bool is_good = true;
  const files::path system = paths::system_zoneinfo;
  const files::path zoneinfo = directory / "zoneinfo";
  for (const auto& entry : files::recursive_directory_iterator(zoneinfo)) {
    if (entry.is_directory() || entry.is_symlink()) continue;
    const std::string content = content_of(entry);
    const files::path twin = system / entry.path().lexically_relative(zoneinfo);
    const bool is_zone = content.starts_with("TZif") || content_of(twin).starts_with("TZif");
    is_good &= (is_zone ? is_whole_zone(content) : !content.empty()) ||
               complain(entry.path().lexically_relative(directory).string() + " is not whole");
  }
  for (files::recursive_directory_iterator entry(system), end; entry != end; ++entry) {
    const files::path file = zoneinfo / entry->path().lexically_relative(system);
    const bool is_there = files::exists(file) && !leads_out(file) &&
                          files::is_directory(file) == entry->is_directory();
    if (is_there || leads_out(*entry)) continue;
    is_good = complain(file.lexically_relative(directory).string() + " is missing");
    entry.disable_recursion_pending();
  }
  for (const std::string name : {"zoneinfo64", "metaZones", "timezoneTypes", "windowsZones"}) {
    const files::path bundle = directory / "icutz" / (name + ".res");
    is_good &= (!leads_out(bundle) && is_whole_bundle(content_of(bundle))) ||
               complain("icutz/" + name + ".res is missing or not whole");
  }
  const std::string zone = local_zone();
  if (zone.empty() || is_whole_zone(content_of(zoneinfo / zone))) return is_good;
  return complain("zoneinfo/" + zone + ", the local zone, is missing or not whole");
}
