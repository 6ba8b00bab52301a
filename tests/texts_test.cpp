#include <gtest/gtest.h>
#include <unistd.h>

#include <filesystem>
#include <fstream>
#include <random>
#include <regex>
#include <sstream>

#include "dataset/vela_icu.h"
#include "dataset/vela_version.h"
#include "dataset/vela_zoneinfo.h"
#include "fs/file.h"
#include "fs/operations.h"
#include "startup/dataset_links.h"

namespace {

vela_version parsed(const std::string& text) {
  vela_version version = {1, "kept", 2, 3};
  version.parse(text);
  return version;
}

std::string path_from(const std::string& link) {
  try {
    return dataset_path_from_link(link);
  } catch (int) {
    return "bad";
  }
}

class Files : public testing::Test {
 protected:
  Files() { EXPECT_NE(::mkdtemp(folder.data()), nullptr); }
  ~Files() override { std::filesystem::remove_all(folder); }
  std::string folder = testing::TempDir() + "kestrel-XXXXXX";
};

/// Each scanner does what its pattern says, on random texts of the pieces that matter.
TEST(Texts, ScannersFollowTheirPatterns) {
  const std::regex version(R"(([0-9]+)([a-z]+)(?:\.([0-9]+))?(?:\.([0-9]+))?)");
  const std::regex data_file(R"(icutz([0-9]+[lbe])\.dat)");
  const std::regex link(R"((/var/db/timezone/tz/[^]+)/[^/]*|/usr/share/zoneinfo\.default)");
  const auto number = [](const std::string& group) {
    return group.empty() ? -1 : std::stoi(group);
  };
  const std::string pieces[] = {"0", "19", "7", "a", "mz", ".", ".1", "/",     ":",
                                "`", "{",  "A", " ", "l",  "b", "e",  "icutz", ".dat"};
  std::mt19937 random(2022);
  std::smatch match;
  testing::internal::CaptureStderr();
  for (int round = 0; round < 20000; ++round) {
    std::string text;
    for (auto count = random() % 5; count > 0; --count)
      text += pieces[random() % std::size(pieces)];
    const vela_version expected =
        std::regex_match(text, match, version)
            ? vela_version{number(match[1]), match[2], number(match[3]), number(match[4])}
            : vela_version();
    EXPECT_EQ(parsed(text), expected) << text;
    const std::string name = "icutz" + text + ".dat";
    EXPECT_EQ(data_file_schema(name), std::regex_match(name, match, data_file) ? match.str(1) : "");
    const std::string target = "/var/db/timezone/tz/" + text;
    EXPECT_EQ(path_from(target), std::regex_match(target, match, link) ? match.str(1) : "bad");
  }
  testing::internal::GetCapturedStderr();
}

/// What random texts hardly ever are.
TEST(Texts, NearMisses) {
  EXPECT_EQ(parsed("02147483647z.0.20"), (vela_version{2147483647, "z", 0, 20}));
  vela_version version;
  EXPECT_EQ(version, (vela_version{-1, "", -1, -1}));
  EXPECT_THROW(version.parse("2147483648a"), std::out_of_range);
  EXPECT_THROW(version.parse("2022b.7.4294967296"), std::out_of_range);
  EXPECT_EQ(version, (vela_version{2022, "b", 7, -1}));
  for (const char* name : {"xicutz44l.dat", "icutz44lxdat", "icutz44l.dat.bak"})
    EXPECT_EQ(data_file_schema(name), "") << name;
  EXPECT_EQ(path_from("/usr/share/zoneinfo.default/"), "bad");
}

TEST(Texts, VersionOrder) {
  const char* const ascending[] = {"none",    "999z",      "2022a",     "2022a.0", "2022a.0.0",
                                   "2022a.1", "2022a.1.0", "2022a.1.1", "2022a.9", "2022a.10",
                                   "2022ab",  "2022z",     "2022za",    "2022zz",  "2023a"};
  for (const auto& a : ascending) {
    for (const auto& b : ascending) EXPECT_EQ(parsed(a) > parsed(b), &a > &b) << a << " > " << b;
  }
}

TEST_F(Files, FirstWords) {
  const std::string path = folder + "/text";
  const auto first_word_of = [&path](const std::string& content) {
    std::ofstream(path, std::ios::binary) << content;
    return fs::read_first_word(path.c_str());
  };
  const std::string word(300000, '7');
  EXPECT_EQ(first_word_of(std::string(" \t\n\v\f\ra\0b\rc", 11)), std::string("a\0b", 3));
  EXPECT_EQ(first_word_of(std::string(10000, '\n') + word + std::string(9000, ' ') + "x"), word);
  EXPECT_EQ(first_word_of(std::string(64 << 20, ' ') + "2022a "), "");
  EXPECT_EQ(fs::read_first_word("/dev/zero"), "");
}

TEST_F(Files, LinksAreReadUpToALimit) {
  const std::string link = folder + "/link";
  ASSERT_EQ(::symlink(std::string(1500, 'x').c_str(), link.c_str()), 0);
  EXPECT_EQ(fs::read_symlink(link.c_str()), std::string(1024, 'x'));
}

TEST_F(Files, TheFirstFitFileOfADirectoryCounts) {
  std::string first;
  std::filesystem::create_directories(folder + "/all/icutz");
  std::filesystem::create_directories(folder + "/one/icutz");
  for (const char* name : {"a.res", "icutz44l.dat", "icutz44b.dat", "icutz44e.dat", "z.res"})
    std::ofstream(folder + "/all/icutz/" + name);
  for (const auto& item : std::filesystem::directory_iterator(folder + "/all/icutz"))
    if (first.empty()) first = data_file_schema(item.path().filename().c_str());
  std::ofstream(folder + "/one/icutz/icutz" + first + ".dat");
  EXPECT_TRUE(vela_icu(folder + "/all").compatible_schema(vela_icu(folder + "/one"))) << first;
}

TEST(Components, OnlyZoneinfoServesInAnyPlace) {
  EXPECT_TRUE(vela_zoneinfo().compatible_schema(vela_icu()));
  testing::internal::CaptureStderr();
  EXPECT_FALSE(vela_icu().compatible_schema(vela_zoneinfo()));
  EXPECT_EQ(
      testing::internal::GetCapturedStderr(),
      "kestrel: vela_icu::compatible_schema: could not dynamic_cast other component: Success\n");
}

}  // namespace
