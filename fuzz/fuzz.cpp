#include <cstdint>
#include <cstdlib>
#include <fstream>
#include <regex>
#include <sstream>
#include <stdexcept>
#include <string>
#include <utility>

#include "dataset/vela_icu.h"
#include "dataset/vela_version.h"
#include "fs/file.h"
#include "startup/dataset_links.h"

namespace {

void require(bool holds) {
  if (!holds) std::abort();  // the fuzzer shows the stack, and so the check
}

vela_version parsed_by_pattern(const std::string& text) {
  static const std::regex pattern(R"(([0-9]+)([a-z]+)(?:\.([0-9]+))?(?:\.([0-9]+))?)");
  std::smatch match;
  if (!std::regex_match(text, match, pattern)) return {};
  const auto number = [&](int group) {
    return match[group].matched ? std::stoi(match[group]) : -1;
  };
  return {number(1), match[2], number(3), number(4)};
}

/// The version that a parser makes of a text, and whether a number was out of range.
template <typename Parser>
std::pair<vela_version, bool> outcome(Parser parse) {
  try {
    return {parse(), false};
  } catch (const std::out_of_range&) {
    return {{}, true};
  }
}

vela_version parsed(const std::string& text) {
  vela_version version;
  version.parse(text);
  return version;
}

void check_data_file(const std::string& name) {
  static const std::regex pattern(R"(icutz([0-9]+[lbe])\.dat)");
  std::smatch match;
  const bool named = std::regex_match(name, match, pattern);
  require(data_file_schema(name) == (named ? match.str(1) : ""));
}

/// Exactly one of newer, older and equal holds, and newer is transitive.
void check_order(std::istringstream words) {
  std::string word;
  vela_version versions[3];
  for (auto& version : versions) {
    if (words >> word) version = outcome([&] { return parsed(word); }).first;
  }
  for (const auto& a : versions) {
    for (const auto& b : versions) {
      require(a == b ? !(a > b) : (a > b) != (b > a));
      for (const auto& c : versions) require(!(a > b && b > c) || a > c);
    }
  }
}

void check_link(const std::string& target) {
  const std::string downloads = "/var/db/timezone/tz/";
  bool good = target == "/usr/share/zoneinfo.default";
  std::string expected;
  for (auto end = downloads.size() + 1; end < target.size(); ++end) {
    if (target[end] != '/' || !target.starts_with(downloads)) continue;
    good = true;
    expected = target.substr(0, end);
  }
  try {
    require(dataset_path_from_link(target) == expected && good);
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
  const std::string text(data, data + size);
  // std::regex recurses once per character, and is slow.
  if (size < 200) {
    require(outcome([&] { return parsed(text); }) ==
            outcome([&] { return parsed_by_pattern(text); }));
    check_data_file(text);
    check_data_file("icutz" + text + ".dat");
  }
  check_order(std::istringstream(text));
  check_link(text);
  check_link("/var/db/timezone/tz/" + text);
  check_first_word(text);
  return 0;
}
