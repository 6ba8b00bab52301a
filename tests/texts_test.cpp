#include <gtest/gtest.h>
#include <unistd.h>

#include <filesystem>
#include <fstream>
#include <random>

#include "dataset/vela_icu.h"
#include "dataset/vela_version.h"
#include "dataset/vela_zoneinfo.h"
#include "fs/file.h"
#include "fs/operations.h"
#include "startup/dataset_links.h"

extern "C" int LLVMFuzzerTestOneInput(const std::uint8_t* data, std::size_t size);

namespace {

vela_version parsed(const std::string& text) {
  vela_version version = {1, "kept", 2, 3};
  version.parse(text);
  return version;
}

TEST(Texts, Versions) {
  EXPECT_EQ(parsed("2022"), vela_version());
  EXPECT_EQ(parsed("02147483647z.0.20"), (vela_version{2147483647, "z", 0, 20}));
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

/// What fuzz/fuzz.cpp holds against the code: the patterns that the scanners stand for, a second
/// way to see a link. On random texts of the pieces that matter.
TEST(Texts, AgreeWithTheirPatterns) {
  const std::string pieces[] = {"0", "19", "7", "a", "mz", ".", ".1", "/",     ":",
                                "`", "{",  "A", " ", "l",  "b", "e",  "icutz", ".dat"};
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

/// What random texts hardly ever are.
TEST(Texts, NearMisses) {
  for (const char* name : {"xicutz44l.dat", "icutz44lxdat", "icutz44l.dat.bak"})
    EXPECT_EQ(data_file_schema(name), "") << name;
  EXPECT_THROW(static_cast<void>(dataset_path_from_link("/usr/share/zoneinfo.default/")), int);
  ASSERT_EQ(::symlink(std::string(1500, 'x').c_str(), "/var/tmp/link"), 0);
  EXPECT_EQ(fs::read_symlink("/var/tmp/link"), std::string(1024, 'x'));
}

TEST(Texts, FirstWords) {
  const auto first_word = [](const std::string& content) {
    std::ofstream("/var/tmp/file", std::ios::binary) << content;
    return fs::read_first_word("/var/tmp/file");
  };
  const std::string long_word(300000, '7');
  EXPECT_EQ(first_word(std::string(" \t\n\v\f\ra\0b\rc", 11)), std::string("a\0b", 3));
  EXPECT_EQ(first_word(std::string(10000, '\n') + long_word + " x"), long_word);
  EXPECT_EQ(first_word(std::string(64 << 20, ' ') + "2022a "), "");
  EXPECT_EQ(fs::read_first_word("/dev/zero"), "");
}

TEST(Components, TheFirstFitFileOfADirectoryCounts) {
  const std::string all = "/var/tmp/all/icutz/";
  std::filesystem::create_directories(all);
  for (const char* name : {"a.res", "icutz44l.dat", "icutz44b.dat", "icutz44e.dat", "z.res"})
    std::ofstream(all + name);
  int place = 0;
  for (const auto& item : std::filesystem::directory_iterator(all)) {
    if (item.path().extension() != ".dat") continue;
    const std::string one = "/var/tmp" / item.path().stem();
    std::filesystem::create_directories(one + "/icutz");
    std::filesystem::copy(item, one + "/icutz");
    EXPECT_EQ(vela_icu("/var/tmp/all").compatible_schema(vela_icu(one)), place++ == 0) << one;
  }
}

TEST(Components, OnlyZoneinfoServesInAnyPlace) {
  EXPECT_TRUE(vela_zoneinfo().compatible_schema(vela_icu()));
  testing::internal::CaptureStderr();
  EXPECT_FALSE(vela_icu().compatible_schema(vela_zoneinfo()));
  const std::string said = "vela_icu::compatible_schema: could not dynamic_cast other component";
  EXPECT_EQ(testing::internal::GetCapturedStderr(), "kestrel: " + said + ": Success\n");
}

}  // namespace
