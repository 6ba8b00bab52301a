#include <gtest/gtest.h>
#include <unistd.h>

#include <filesystem>
#include <fstream>
#include <random>
#include <regex>
#include <sstream>

#include "ctl/bundle.h"
#include "ctl/files.h"
#include "ctl/tzif.h"
#include "dataset/vela_dataset.h"
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

class Files : public testing::Test {
 protected:
  void SetUp() override { ASSERT_NE(::mkdtemp(folder.data()), nullptr); }
  void TearDown() override { std::filesystem::remove_all(folder); }
  std::string folder = testing::TempDir() + "kestrel-XXXXXX";
};

/// Each scanner does what its pattern says, on random texts of the pieces that matter.
TEST(Texts, ScannersFollowTheirPatterns) {
  const std::regex version(R"(([0-9]+)([a-z]+)(?:\.([0-9]+))?(?:\.([0-9]+))?)");
  const std::regex data_file(R"(icutz([0-9]+[lbe])\.dat)");
  const std::regex link(R"((/var/db/timezone/tz/[^]+)/[^/]*|/usr/share/zoneinfo\.default)");
  const std::string pieces[] = {"0", "19", "7", "a", "mz", ".", ".1", "/",     ":",
                                "`", "{",  "A", " ", "l",  "b", "e",  "icutz", ".dat"};
  std::mt19937 random(2022);
  std::smatch match;
  for (int round = 0; round < 20000; ++round) {
    std::string text;
    for (auto count = random() % 5; count > 0; --count)
      text += pieces[random() % std::size(pieces)];
    if (random() % 4 == 0)
      text.insert(random() % (text.size() + 1), 1, static_cast<char>(random() % 128));
    EXPECT_EQ(parsed(text) != vela_version(), std::regex_match(text, version)) << text;
    const std::string name = "icutz" + text + ".dat";
    EXPECT_EQ(data_file_schema(name), std::regex_match(name, match, data_file) ? match.str(1) : "");
    const std::string target = "/var/db/timezone/tz/" + text;
    if (std::regex_match(target, match, link)) {
      EXPECT_EQ(dataset_path_from_link(target), match.str(1));
    } else {
      EXPECT_THROW(static_cast<void>(dataset_path_from_link(target)), int) << target;
    }
  }
}

/// What random texts hardly ever are.
TEST(Texts, NearMisses) {
  EXPECT_EQ(parsed("02147483647z.020"), (vela_version{2147483647, "z", 20, -1}));
  vela_version version;
  EXPECT_EQ(version, (vela_version{-1, "", -1, -1}));
  EXPECT_THROW(version.parse("2147483648a"), std::out_of_range);
  EXPECT_THROW(version.parse("2022b.7.4294967296"), std::out_of_range);
  EXPECT_EQ(version, (vela_version{2022, "b", 7, -1}));
  for (const char* name : {"xicutz44l.dat", "other44l.dat", "icutz44lxdat", "icutz44l.dat.bak"})
    EXPECT_EQ(data_file_schema(name), "") << name;
  EXPECT_THROW(static_cast<void>(dataset_path_from_link("/usr/share/zoneinfo.default/")), int);
}

TEST(Texts, VersionOrder) {
  const char* const ascending[] = {"none",    "999z",      "2022a",     "2022a.0", "2022a.0.0",
                                   "2022a.1", "2022a.1.0", "2022a.1.1", "2022a.9", "2022a.10",
                                   "2022ab",  "2022z",     "2022za",    "2022zz",  "2023a"};
  for (const auto& a : ascending)
    for (const auto& b : ascending) EXPECT_EQ(parsed(a) > parsed(b), &a > &b) << a << " > " << b;
}

TEST(Texts, DatasetsAreTheSameByTheirPath) {
  const std::string path = "/var/db/timezone/tz/none";
  EXPECT_TRUE(vela_dataset(path) == vela_dataset(path));
  EXPECT_FALSE(vela_dataset(path) == vela_dataset(path + "/"));
}

TEST_F(Files, AndLinksAreReadUpToALimit) {
  const std::string path = folder + "/text";
  const auto first_word_of = [&path](const std::string& content) {
    std::ofstream(path, std::ios::binary) << content;
    return fs::read_first_word(path.c_str());
  };
  const std::string word(300000, '7');
  EXPECT_EQ(first_word_of(std::string(" \t\n\v\f\ra\0b\rc", 11)), std::string("a\0b", 3));
  EXPECT_EQ(first_word_of(std::string(10000, '\n') + word + std::string(9000, ' ') + "x"), word);
  EXPECT_EQ(first_word_of(std::string(4096, '7') + " x"), std::string(4096, '7'));
  EXPECT_EQ(first_word_of(std::string((64 << 20) - 6, ' ') + "2022a "), "2022a");
  EXPECT_EQ(first_word_of(std::string(64 << 20, ' ') + "2022a "), "");
  ASSERT_EQ(::symlink(std::string(1500, 'x').c_str(), (folder + "/link").c_str()), 0);
  EXPECT_EQ(fs::read_symlink((folder + "/link").c_str()), std::string(1024, 'x'));
}

TEST_F(Files, TheFirstFitFileOfADirectoryCounts) {
  std::string first;
  std::filesystem::create_directories(folder + "/all/icutz");
  std::filesystem::create_directories(folder + "/one/icutz");
  for (const char* name : {"a.res", "icutz44l.dat", "icutz44b.dat", "icutz44e.dat", "z.res"})
    std::ofstream(folder + "/all/icutz/" + name) << name;
  for (const auto& item : std::filesystem::directory_iterator(folder + "/all/icutz"))
    if (first.empty()) first = data_file_schema(item.path().filename().c_str());
  std::ofstream(folder + "/one/icutz/icutz" + first + ".dat") << first;
  EXPECT_TRUE(vela_icu(folder + "/all").compatible_schema(vela_icu(folder + "/one"))) << first;
  EXPECT_FALSE(vela_icu(folder + "/one").compatible_schema(vela_zoneinfo(folder + "/one")));
}

/// No part of a zone is whole, nor one with more behind it or without the start of its footer.
TEST(Whole, Zones) {
  std::string zone = read_file("/usr/share/zoneinfo/Asia/Tokyo").value_or("");
  EXPECT_TRUE(is_whole_zone(zone));
  EXPECT_FALSE(is_whole_zone(zone + "\n"));
  for (std::size_t size = 0; size < zone.size(); ++size)
    EXPECT_FALSE(is_whole_zone(zone.substr(0, size))) << size;
  EXPECT_FALSE(is_whole_zone("x" + zone.substr(1)));
  const std::size_t footer = zone.rfind('\n', zone.size() - 2);
  EXPECT_FALSE(is_whole_zone(std::string(zone).replace(footer, 1, "x")));
  EXPECT_TRUE(is_whole_zone(zone.substr(0, footer) + "\n\n")) << "an empty footer";
  // A first block that says that it is longer than all, where the second one should be.
  zone.erase(44, zone.find("TZif", 1) - 44).replace(32, 1, "\x7f");
  EXPECT_FALSE(is_whole_zone(zone));
}

/// A zone with one transition, two types, the abbreviations "A" and "UTC", and these bytes.
std::string zone_of(char type_of_transition, char flag, char abbreviation, char indicators) {
  const std::string counts = {0, 0, 0, indicators, 0, 0, 0, 0, 0, 0, 0, 1,
                              0, 0, 0, 1,          0, 0, 0, 2, 0, 0, 0, 6};
  const std::string times_and_types = {0, 0, 0, 9, type_of_transition, 0, 0, 0, 0, 0, 0};
  const std::string last_type_and_names = {0,   0, 0,   1,   flag, abbreviation,
                                           'A', 0, 'U', 'T', 'C',  0};
  return "TZif" + std::string(16, '\0') + counts + times_and_types + last_type_and_names +
         std::string(8 + static_cast<std::size_t>(indicators), '\0');
}

TEST(Whole, TablesOfAZone) {
  EXPECT_TRUE(is_whole_zone(zone_of(1, 1, 5, 2)));
  EXPECT_TRUE(is_whole_zone(zone_of(1, 1, 5, 2).replace(42, 1, "\1") + std::string(256, '\0')));
  EXPECT_FALSE(is_whole_zone(zone_of(1, 1, 5, 2).substr(0, 76))) << "an indicator too few";
  EXPECT_FALSE(is_whole_zone(zone_of(2, 1, 5, 2))) << "a transition to a third type";
  EXPECT_FALSE(is_whole_zone(zone_of(1, 2, 5, 2))) << "neither standard nor daylight time";
  EXPECT_FALSE(is_whole_zone(zone_of(1, 1, 6, 2))) << "an abbreviation behind the table";
  EXPECT_FALSE(is_whole_zone(zone_of(1, 1, 5, 1))) << "an indicator for one of two types";
  EXPECT_FALSE(is_whole_zone(zone_of(1, 1, 5, 0).replace(27, 1, "\1") + "x"))
      << "a standard-time indicator for one of two types";
  EXPECT_FALSE(is_whole_zone(zone_of(1, 1, 5, 0).replace(43, 1, "\5"))) << "a name without an end";
  EXPECT_FALSE(is_whole_zone(zone_of(1, 1, 0, 2).replace(61, 6, "names!"))) << "no end at all";
  EXPECT_FALSE(is_whole_zone("TZif" + std::string(39, '\0') + std::string("\1\0", 2))) << "no type";
  const std::string second = zone_of(1, 1, 5, 2).replace(4, 1, "2") + "\nUTC0\n";
  EXPECT_FALSE(is_whole_zone(second)) << "a footer without a second block";
}

TEST(Whole, Bundles) {
  for (const bool big : {false, true}) {
    std::string bundle(256 + 4 * 5, '\0');
    bundle.replace(big ? 0 : 1, 1, "\1").replace(2, 2, "\xda\x27").replace(12, 4, "ResB");
    bundle[8] = big ? '\1' : '\0';
    bundle[big ? 256 + 19 : 256 + 16] = '\5';
    EXPECT_TRUE(is_whole_bundle(bundle)) << big;
    EXPECT_FALSE(is_whole_bundle(std::string(bundle).replace(2, 1, "x"))) << big;
    EXPECT_FALSE(is_whole_bundle(std::string(bundle).replace(12, 1, "x"))) << big;
    EXPECT_FALSE(is_whole_bundle(std::string(bundle).replace(big ? 275 : 272, 1, "\4"))) << big;
    EXPECT_EQ(has_byte_order_of("44l", bundle), !big);
    EXPECT_EQ(has_byte_order_of("44e", bundle), big);
    for (std::size_t size = 0; size < bundle.size(); ++size)
      EXPECT_FALSE(is_whole_bundle(bundle.substr(0, size))) << big << ' ' << size;
  }
}

}  // namespace
