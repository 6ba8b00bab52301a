#include <gtest/gtest.h>

#include <random>
#include <regex>
#include <stdexcept>

#include "dataset/vela_icu.h"
#include "dataset/vela_version.h"

namespace {

vela_version parsed(const std::string& text) {
  vela_version version;
  version.parse(text);
  return version;
}

TEST(Version, Accepted) {
  const std::pair<const char*, vela_version> table[] = {
      {"2022a", {2022, "a", -1, -1}},
      {"2022a.1", {2022, "a", 1, -1}},
      {"2022a.1.0", {2022, "a", 1, 0}},
      {"02022ab.010.20", {2022, "ab", 10, 20}},
      {"2147483647z.2147483647.2147483647", {2147483647, "z", 2147483647, 2147483647}},
  };
  for (const auto& [text, version] : table) EXPECT_EQ(parsed(text), version) << text;
}

TEST(Version, RefusedTextsLeaveTheUnknownVersion) {
  for (const std::string text :
       {"", ".1.0", "2022", "a", "2022A", "2022a.", "2022a..1", "2022a.1.0.1", "2022a.b", "2022a/",
        " 2022a", "2022a\n", "-2022a"}) {
    vela_version version = {2022, "a", 1, 0};
    version.parse(text);
    EXPECT_EQ(version, vela_version()) << text;
  }
}

TEST(Version, NumbersBeyondTheRangeKeepTheFieldsBefore) {
  vela_version version;
  EXPECT_THROW(version.parse("2147483648a"), std::out_of_range);
  EXPECT_EQ(version, vela_version());
  EXPECT_THROW(version.parse("2022b.7.4294967296"), std::out_of_range);
  EXPECT_EQ(version, (vela_version{2022, "b", 7, -1}));
}

TEST(Version, Order) {
  const char* const ascending[] = {"unknown", "999z",      "2022a",     "2022a.0", "2022a.0.0",
                                   "2022a.1", "2022a.1.0", "2022a.1.1", "2022a.9", "2022a.10",
                                   "2022ab",  "2022z",     "2022za",    "2022zz",  "2023a"};
  for (const auto& a : ascending) {
    for (const auto& b : ascending) EXPECT_EQ(parsed(a) > parsed(b), &a > &b) << a << " > " << b;
  }
  EXPECT_EQ(parsed("02022a.01.00"), parsed("2022a.1.0"));
}

/// The patterns that the scanners stand for decide about random texts of the bytes that matter.
TEST(Scanners, AgreeWithTheirPatterns) {
  const std::regex version_pattern(R"(([0-9]+)([a-z]+)(?:\.([0-9]+))?(?:\.([0-9]+))?)");
  const std::regex data_file_pattern(R"(icutz([0-9]+[lbe])\.dat)");
  std::mt19937 random(2022);
  const auto text_of = [&random](const std::string& alphabet) {
    std::string text(random() % 9, '\0');
    for (char& byte : text) byte = alphabet[random() % alphabet.size()];
    return text;
  };
  for (int round = 0; round < 30000; ++round) {
    const std::string text = text_of("0199az.././:`{");
    std::smatch match;
    const bool accepted = std::regex_match(text, match, version_pattern);
    const vela_version version = parsed(text);
    ASSERT_EQ(version.year >= 0, accepted) << text;
    ASSERT_EQ(version.letters, match.str(2)) << text;
    ASSERT_EQ(version.major, match[3].matched ? std::stoi(match.str(3)) : -1) << text;
    ASSERT_EQ(version.minor, match[4].matched ? std::stoi(match.str(4)) : -1) << text;

    const std::string name = "icutz" + text_of("0199lbe/:.d") + (round % 8 != 0 ? ".dat" : "");
    const bool named = std::regex_match(name, match, data_file_pattern);
    ASSERT_EQ(data_file_schema(name), named ? match.str(1) : "") << name;
  }
}

}  // namespace
