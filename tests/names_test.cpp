#include <fstream>

#include "dataset/vela_dataset.h"
#include "dataset/vela_icu.h"
#include "dataset/vela_zoneinfo.h"
#include "fs/file.h"
#include "startup/dataset_links.h"
#include "world.h"

namespace {

TEST(Names, SchemasOfDataFiles) {
  const std::pair<const char*, const char*> table[] = {
      {"icutz44l.dat", "44l"}, {"icutz044b.dat", "044b"}, {"icutz44.dat", ""},
      {"icutz44L.dat", ""},    {"icutz44lb.dat", ""},     {"xicutz44l.dat", ""},
      {"icutzl.dat", ""},      {"icutz44l.dat.bak", ""},  {"icutz44l.datx", ""},
      {"icutz.dat", ""},       {"icutz4x4e.dat", ""},     {"icutz44l_dat", ""},
  };
  for (const auto& [name, schema] : table) EXPECT_EQ(data_file_schema(name), schema) << name;
}

TEST(Names, DatasetPathsOfLinks) {
  const std::string tz = "/var/db/timezone/tz/";
  const std::pair<std::string, std::string> good[] = {
      {tz + "2022a.1.0/zoneinfo", tz + "2022a.1.0"},
      {tz + "2022a.1.0/other", tz + "2022a.1.0"},
      {tz + "a/b/zoneinfo", tz + "a/b"},
      {tz + "2022a.1.0/zoneinfo/", tz + "2022a.1.0/zoneinfo"},
      {tz + "/a/zoneinfo", tz + "/a"},
      {tz + "a/", tz + "a"},
      {"/usr/share/zoneinfo.default", ""},
  };
  for (const auto& [target, path] : good) EXPECT_EQ(dataset_path_from_link(target), path) << target;
  for (const std::string& target :
       {std::string(), tz, tz + "2022a.1.0", tz + "/zoneinfo", tz + "/",
        std::string("tz/a/zoneinfo"), std::string("/usr/share/zoneinfo"),
        std::string("/usr/share/zoneinfo.default/"),
        std::string("/var/db/timezone/tzx/a/zoneinfo")}) {
    EXPECT_THROW(static_cast<void>(dataset_path_from_link(target)), int) << target;
  }
}

TEST(Names, FirstWords) {
  const std::string long_word(300000, '7');
  const std::string blanks(10000, '\n');
  const std::pair<std::string, std::string> table[] = {
      {"", ""},
      {" \t\n\v\f\r", ""},
      {"2022a", "2022a"},
      {"\n2022a\n", "2022a"},
      {"2022a and more", "2022a"},
      {"2022a\v", "2022a"},
      {std::string("a\0b c", 5), std::string("a\0b", 3)},
      {blanks + long_word + " x", long_word},
      {std::string(4095, ' ') + "ab c", "ab"},
      {std::string(4096, 'a') + " c", std::string(4096, 'a')},
  };
  for (const auto& [content, word] : table) {
    std::ofstream("/var/tmp/file", std::ios::binary) << content;
    EXPECT_EQ(fs::read_first_word("/var/tmp/file"), word) << content.size() << " bytes";
  }
  EXPECT_EQ(fs::read_first_word("/var/tmp"), "");
  EXPECT_EQ(fs::read_first_word("/dev/zero"), "");
}

TEST(Datasets, CompareByTheirParts) {
  make_world(system_copy("2022a", "44l") + download("2022a.1.0", "44l") + download("2022b", "45l"));
  const vela_dataset system;
  const vela_dataset same("/var/db/timezone/tz/2022a.1.0");
  const vela_dataset other("/var/db/timezone/tz/2022b");
  EXPECT_EQ(system.get_version_string(), "2022a.1.0");
  EXPECT_TRUE(system == vela_dataset("") && !(system == same));
  EXPECT_TRUE(same.compatible_schema(system) && !other.compatible_schema(system));
  EXPECT_TRUE(other > same && !(same > other) && !(same > system) && !(system > same));
  EXPECT_TRUE(vela_zoneinfo().compatible_schema(vela_icu()));
  EXPECT_FALSE(vela_icu().compatible_schema(vela_zoneinfo()));
  EXPECT_THROW(vela_dataset("/var/db/timezone/tz/"), std::invalid_argument);
}

}  // namespace
