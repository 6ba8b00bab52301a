#include <gtest/gtest.h>
#include <sys/stat.h>
#include <unistd.h>

#include <algorithm>
#include <cstdlib>
#include <filesystem>
#include <fstream>
#include <iostream>
#include <map>
#include <regex>
#include <sstream>

namespace files = std::filesystem;

namespace {

/// A scene of worlds.txt, definitions filled in.
struct scene {
  std::string name, before, changes, says;
};

void PrintTo(const scene& told, std::ostream* out) {
  *out << told.name;
}

std::vector<scene> read_scenes() {
  std::map<std::string, std::string> definitions;
  std::vector<scene> scenes;
  std::ifstream file(WORLDS);
  for (std::string line; std::getline(file, line);) {
    if (line.starts_with('#')) continue;
    for (std::smatch use; std::regex_search(line, use, std::regex(R"(\$(\w+))"));) {
      line.replace(use[0].first, use[0].second, definitions.at(use[1]));
    }
    std::smatch part;
    if (std::regex_match(line, part, std::regex("(\\w+) = (.*)"))) {
      definitions[part[1]] = part[2];
    } else if (std::regex_match(line, part,
                                std::regex(R"((\w+): (.*?)(?: => (.*?))?(?: \| (.*))?)"))) {
      std::string says = std::regex_replace(part.str(4), std::regex(" / "), "\nkestrel: ");
      if (!says.empty()) says.insert(0, "kestrel: ").append("\n");
      scenes.push_back({part[1], part[2], part[3], says});
    } else if (!line.empty()) {
      std::cerr << "worlds.txt: " << line << '\n';
      std::exit(1);
    }
  }
  return scenes;
}

/// What stands at a path: the sign of its kind and its content, ">/usr" for a link.
using entry = std::pair<std::string, std::string>;

std::vector<entry> entries_of(const std::string& told) {
  std::vector<entry> entries;
  std::istringstream words(told);
  for (std::string word; words >> word;) {
    if (word.starts_with('!')) continue;
    const std::size_t sign = std::min(word.find_first_of(">=|%"), word.size() - 1);
    const bool gone = word.starts_with('-');
    std::string path = gone ? word.substr(1) : word.substr(0, sign);
    std::string what = gone ? "-" : word.substr(sign);
    if (!path.starts_with('/')) path.insert(0, "/var/db/timezone/");
    if (what.starts_with(">~")) what.replace(1, 1, "/var/db/timezone");
    entries.emplace_back(path, what);
  }
  return entries;
}

void make_world(const std::string& told) {
  for (const char* top : {"/var/db", "/usr/share"}) {
    for (const auto& item : files::directory_iterator(top)) files::remove_all(item.path());
  }
  for (const auto& [path, what] : entries_of(told)) {
    const std::string content = what.substr(1);
    files::create_directories(what == "/" ? files::path(path) : files::path(path).parent_path());
    if (what[0] == '>') files::create_symlink(content, path);
    if (what[0] == '=') std::ofstream(path) << content;
    if (what[0] == '|') ::mkfifo(path.c_str(), 0600);
    if (what[0] == '%') files::permissions(path, files::perms(std::stoi(content, nullptr, 8)));
  }
}

std::string content_of(const files::path& path) {
  std::ifstream file(path, std::ios::binary);
  return {std::istreambuf_iterator<char>(file), {}};
}

/// All entries with their content, a file's mode too, and their inode.
std::map<std::string, std::string> snapshot() {
  std::map<std::string, std::string> all;
  for (const char* top : {"/var/db", "/usr/share"}) {
    for (const auto& item : files::recursive_directory_iterator(top)) {
      struct stat status {};
      ::lstat(item.path().c_str(), &status);
      std::string what = item.is_directory() ? "/" : "|";
      if (item.is_symlink()) what = ">" + std::string(files::read_symlink(item));
      if (S_ISREG(status.st_mode))
        what = "=" + content_of(item) + std::to_string(status.st_mode & 07777);
      all[item.path()] = what + " inode " + std::to_string(status.st_ino);
    }
  }
  return all;
}

class Worlds : public testing::TestWithParam<scene> {};

TEST_P(Worlds, SaysAndLeaves) {
  const auto& [name, before, changes, says] = GetParam();
  make_world(before);
  auto expected = snapshot();
  const bool powerless = before.find('%') != std::string::npos && ::geteuid() == 0;
  std::string command = powerless ? "setpriv --bounding-set=-all " : "";
  const char* const named = std::getenv("KESTREL_COMMAND");  // in scripts/cross, and installed
  command.append(named != nullptr ? named : "'" KESTREL "'").append(" 2>/var/tmp/said");
  std::smatch shell;
  if (std::regex_search(before, shell, std::regex(R"(!(\S+))"))) {
    const std::string line = std::regex_replace(shell.str(1), std::regex(","), " ");
    command = std::regex_replace(line, std::regex("K"), command);
  }
  EXPECT_EQ(std::system(command.c_str()), 0);
  EXPECT_EQ(content_of("/var/tmp/said"), says);
  auto after = snapshot();
  for (const auto& [path, what] : entries_of(changes)) {
    expected.erase(path);
    if (what == "-") continue;
    expected[path] = what.starts_with('=') ? what + std::to_string(0666) : what;
    std::string& found = after[path];
    found.resize(std::min(found.find(" inode "), found.size()));
  }
  EXPECT_EQ(after, expected);
}

INSTANTIATE_TEST_SUITE_P(Told, Worlds, testing::ValuesIn(read_scenes()),
                         [](const auto& tested) { return tested.param.name; });

}  // namespace

/// Without arguments runs the tests; with a scene's name, for scripts/faults, makes its world.
int main(int count, char** arguments) {
  if (!files::exists("/var/private-world")) {
    std::cerr << "These tests rewrite /var/db and /usr/share: run scripts/test.\n";
    return 1;
  }
  ::umask(0);
  testing::InitGoogleTest(&count, arguments);
  if (count == 1) return RUN_ALL_TESTS();
  for (const scene& told : read_scenes()) {
    if (told.name != arguments[1]) continue;
    make_world(told.before);
    return 0;
  }
  return 1;
}
