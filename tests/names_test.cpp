#include <fstream>

#include "dataset/vela_icu.h"
#include "fs/file.h"
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

}  // namespace
