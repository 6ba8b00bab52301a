#include <gtest/gtest.h>

#include <fstream>
#include <random>

#include "dataset/vela_icu.h"
#include "dataset/vela_version.h"
#include "dataset/vela_zoneinfo.h"
#include "fs/file.h"
#include "startup/dataset_links.h"

extern "C" int LLVMFuzzerTestOneInput(const std::uint8_t* data, std::size_t size);

namespace {

vela_version parsed(const std::string& text) {
  vela_version version = {1, "kept", 2, 3};
  version.parse(text);
  return version;
}

TEST(Texts, Versions) {
  EXPECT_EQ(parsed("2022a"), (vela_version{2022, "a", -1, -1}));
  EXPECT_EQ(parsed("02022ab.010"), (vela_version{2022, "ab", 10, -1}));
  EXPECT_EQ(parsed("2147483647z.0.20"), (vela_version{2147483647, "z", 0, 20}));
  for (const std::string text : {"", ".1.0", "2022", "a", "2022A", "2022a.", "2022a..1", "2022a/",
                                 "2022a.1.0.1", "2022a.b", " 2022a", "2022a\n", "-2022a"}) {
    EXPECT_EQ(parsed(text), vela_version()) << text;
  }
  vela_version version;
  EXPECT_THROW(version.parse("2147483648a"), std::out_of_range);
  EXPECT_THROW(version.parse("2022b.7.4294967296"), std::out_of_range);
  EXPECT_EQ(version, (vela_version{2022, "b", 7, -1}));
}

TEST(Texts, VersionOrder) {
  const char* const ascending[] = {"none",    "999z",      "2022a",     "2022a.0", "2022a.0.0",
                                   "2022a.1", "2022a.1.0", "2022a.1.1", "2022a.9", "2022a.10",
                                   "2022ab",  "2022z",     "2022za",    "2022zz",  "2023a"};
  for (const auto& a : ascending) {
    for (const auto& b : ascending) EXPECT_EQ(parsed(a) > parsed(b), &a > &b) << a << " > " << b;
  }
}

/// What fuzz/fuzz.cpp holds against the code: the patterns that the scanners stand for, the laws of
/// the order, a second way to see a link. On random texts of the pieces that matter.
TEST(Texts, AgreeWithTheirPatterns) {
  const std::string pieces[] = {"0", "19", "7", "a", "mz", ".", ".1",    "/",   ":",
                                "`", "A",  " ", "l", "b",  "e", "icutz", ".dat"};
  std::mt19937 random(2022);
  testing::internal::CaptureStderr();
  for (int round = 0; round < 20000; ++round) {
    std::string text;
    for (auto count = random() % 6; count > 0; --count)
      text += pieces[random() % std::size(pieces)];
    LLVMFuzzerTestOneInput(reinterpret_cast<const std::uint8_t*>(text.data()), text.size());
  }
  testing::internal::GetCapturedStderr();
}

TEST(Texts, SchemasOfDataFiles) {
  EXPECT_EQ(data_file_schema("icutz44l.dat"), "44l");
  EXPECT_EQ(data_file_schema("icutz044b.dat"), "044b");
  for (const char* name : {"icutz44.dat", "icutz44L.dat", "icutz44lb.dat", "xicutz44l.dat",
                           "icutzl.dat", "icutz44l.dat.bak", "icutz44l.datx", "icutz.dat"})
    EXPECT_EQ(data_file_schema(name), "") << name;
}

TEST(Texts, DatasetPathsOfLinks) {
  const std::string tz = "/var/db/timezone/tz/";
  EXPECT_EQ(dataset_path_from_link("/usr/share/zoneinfo.default"), "");
  EXPECT_EQ(dataset_path_from_link(tz + "2022a.1.0/zoneinfo"), tz + "2022a.1.0");
  EXPECT_EQ(dataset_path_from_link(tz + "a/b/other/"), tz + "a/b/other");
  EXPECT_EQ(dataset_path_from_link(tz + "/a/zoneinfo"), tz + "/a");
  for (const std::string& bad : {std::string(), tz, tz + "2022a", tz + "/zoneinfo", tz + "/",
                                 tz.substr(1) + "a/zoneinfo", "/usr/share/zoneinfo.default" + tz}) {
    EXPECT_THROW(static_cast<void>(dataset_path_from_link(bad)), int) << bad;
  }
}

TEST(Texts, FirstWords) {
  const auto first_word = [](const std::string& content) {
    std::ofstream("/var/tmp/file", std::ios::binary) << content;
    return fs::read_first_word("/var/tmp/file");
  };
  const std::string long_word(300000, '7');
  EXPECT_EQ(first_word(" \t\n\v\f\r"), "");
  EXPECT_EQ(first_word("\n2022a and more"), "2022a");
  EXPECT_EQ(first_word(std::string("a\0b\vc", 5)), std::string("a\0b", 3));
  EXPECT_EQ(first_word(std::string(10000, '\n') + long_word + " x"), long_word);
  EXPECT_EQ(first_word(std::string(65 << 20, ' ') + "2022a"), "");
  EXPECT_EQ(fs::read_first_word("/dev/zero"), "");
}

TEST(Components, OnlyZoneinfoServesInAnyPlace) {
  EXPECT_TRUE(vela_zoneinfo().compatible_schema(vela_icu()));
  testing::internal::CaptureStderr();
  EXPECT_FALSE(vela_icu().compatible_schema(vela_zoneinfo()));
  const std::string said = "vela_icu::compatible_schema: could not dynamic_cast other component";
  EXPECT_EQ(testing::internal::GetCapturedStderr(), "kestrel: " + said + ": Success\n");
}

}  // namespace
