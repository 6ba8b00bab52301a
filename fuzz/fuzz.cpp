#include <cstdint>
#include <cstdlib>
#include <filesystem>
#include <fstream>
#include <optional>
#include <regex>
#include <sstream>
#include <stdexcept>
#include <string>

#include "dataset/vela_icu.h"
#include "dataset/vela_version.h"
#include "fs/file.h"
#include "startup/dataset_links.h"

namespace {

void require(bool holds) {
  if (!holds) std::abort();  // the fuzzer shows the stack, and so the check
}

void check_version(const std::string& text) {
  static const std::regex pattern(R"(([0-9]+)([a-z]+)(?:\.([0-9]+))?(?:\.([0-9]+))?)");
  vela_version version;
  std::optional<vela_version> expected = version;
  std::smatch match;
  try {
    const auto number = [](const std::ssub_match& group) {
      return group.matched ? std::stoi(group) : -1;
    };
    if (std::regex_match(text, match, pattern))
      expected = vela_version{number(match[1]), match[2], number(match[3]), number(match[4])};
  } catch (const std::out_of_range&) {
    expected.reset();
  }
  try {
    version.parse(text);
    require(version == expected);
  } catch (const std::out_of_range&) {
    require(!expected);
  }
}

void check_data_file(const std::string& name) {
  static const std::regex pattern(R"(icutz([0-9]+[lbe])\.dat)");
  std::smatch match;
  const bool named = std::regex_match(name, match, pattern);
  require(data_file_schema(name) == (named ? match.str(1) : ""));
}

void check_link(const std::string& target) {
  static const std::regex pattern(
      R"((/var/db/timezone/tz/[^]+)/[^/]*|/usr/share/zoneinfo\.default)");
  std::smatch match;
  const bool good = std::regex_match(target, match, pattern);
  try {
    require(dataset_path_from_link(target) == match.str(1) && good);
  } catch (int) {
    require(!good);
  }
}

/// Blanks put the text astride the end of the first block that is read.
void check_first_word(const std::string& text) {
  const std::string content = std::string(4096 - text.size() / 2 % 4096, ' ') + text;
  std::ofstream("/var/tmp/text", std::ios::binary) << content;
  std::string expected;
  std::istringstream(content) >> expected;
  require(fs::read_first_word("/var/tmp/text") == expected);
}

}  // namespace

extern "C" int LLVMFuzzerTestOneInput(const std::uint8_t* data, std::size_t size) {
  require(std::filesystem::exists("/var/private-world"));  // it writes into /var
  const std::string text(data, data + size);
  check_first_word(text);
  if (size > 200) return 0;  // std::regex recurses once per character
  check_data_file(text);
  check_data_file("icutz" + text + ".dat");
  check_link(text);
  check_link("/var/db/timezone/tz/" + text);
  check_version(text);
  return 0;
}
