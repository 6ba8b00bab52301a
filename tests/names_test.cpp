#include <fstream>

#include "fs/file.h"
#include "world.h"

namespace {

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
