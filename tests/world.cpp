#include "world.h"

#include <sys/stat.h>
#include <sys/statfs.h>
#include <unistd.h>

#include <cstdlib>
#include <filesystem>
#include <fstream>
#include <iostream>
#include <map>
#include <sstream>

namespace files = std::filesystem;

namespace {

const std::string storage = "/var/db/timezone";

std::string absolute(const std::string& path) {
  return path.starts_with('/') ? path : storage + "/" + path;
}

std::string content_of(const std::string& path) {
  std::ifstream file(path, std::ios::binary);
  return {std::istreambuf_iterator<char>(file), {}};
}

/// An entry as it is told: its path, the sign of its kind, what follows the sign.
struct entry {
  std::string path;
  char kind;
  std::string text;

  explicit entry(const std::string& token) {
    const bool removed = token.starts_with('-');
    const auto sign = removed ? token.size() : token.find_first_of(">=|%");
    const bool directory = sign == std::string::npos;
    path =
        absolute(removed ? token.substr(1) : token.substr(0, directory ? token.size() - 1 : sign));
    kind = removed ? '-' : directory ? '/' : token[sign];
    if (!removed && !directory) text = token.substr(sign + 1);
    if (kind == '>' && text.starts_with('~')) text = storage + text.substr(1);
  }
};

std::vector<entry> parse(const std::string& entries) {
  std::istringstream tokens(entries);
  std::vector<entry> parsed;
  for (std::string token; tokens >> token;) parsed.emplace_back(token);
  return parsed;
}

/// What stands at a path: kind and text as in `entry`, and the inode.
struct found {
  std::string what;
  ino_t inode;
  bool operator==(const found&) const = default;
};

std::map<std::string, found> snapshot() {
  std::map<std::string, found> all;
  for (const char* top : {"/var/db", "/usr/share"}) {
    for (const auto& item : files::recursive_directory_iterator(top)) {
      const std::string path = item.path();
      const auto status = item.symlink_status();
      struct stat details {};
      ::lstat(path.c_str(), &details);
      all[path] = {files::is_symlink(status) ? std::string(">").append(files::read_symlink(path))
                   : files::is_regular_file(status) ? std::string("=").append(content_of(path))
                   : files::is_directory(status)    ? "/"
                                                    : "|",
                   details.st_ino};
    }
  }
  return all;
}

std::vector<std::string> run_binary(bool powerless) {
  const std::string said = "/var/tmp/said";
  const std::string prefix = powerless && ::geteuid() == 0 ? "setpriv --bounding-set=-all " : "";
  EXPECT_EQ(std::system((prefix + KESTREL_BINARY + " 2>" + said).c_str()), 0);
  std::ifstream file(said);
  std::vector<std::string> lines;
  for (std::string line; std::getline(file, line);) {
    EXPECT_TRUE(line.starts_with("kestrel: ")) << line;
    lines.push_back(line.substr(std::min<std::size_t>(line.size(), 9)));
  }
  return lines;
}

}  // namespace

std::string system_copy(const std::string& version, const std::string& schema) {
  return "/usr/share/zoneinfo.default/+VERSION=" + version +
         " /usr/share/zoneinfo.default/Asia/Tokyo=TZif /usr/share/icu/icutzformat.txt=" + schema +
         " ";
}

std::string download(const std::string& version, const std::string& schema) {
  return "tz/" + version + "/zoneinfo/Asia/Tokyo=TZif tz/" + version + "/icutz/icutz" + schema +
         ".dat= ";
}

void make_world(const std::string& entries) {
  for (const char* top : {"/var/db", "/usr/share"}) {
    for (const auto& item : files::directory_iterator(top)) files::remove_all(item.path());
  }
  for (const auto& [path, kind, text] : parse(entries)) {
    files::create_directories(files::path(path).parent_path());
    switch (kind) {
      case '>':
        files::create_symlink(text, path);
        break;
      case '=':
        std::ofstream(path) << text;
        break;
      case '/':
        files::create_directories(path);
        break;
      case '|':
        ASSERT_EQ(::mkfifo(path.c_str(), 0600), 0);
        break;
      default:
        ASSERT_EQ(::chmod(path.c_str(), static_cast<mode_t>(std::stoul(text, nullptr, 8))), 0);
    }
  }
}

std::string scene_name(const testing::TestParamInfo<scene>& tested) {
  return tested.param.name;
}

void PrintTo(const scene& tested, std::ostream* out) {
  *out << tested.name;
}

TEST_P(Run, SaysAndLeaves) {
  const scene& told = GetParam();
  make_world(told.before);
  auto expected = snapshot();
  EXPECT_EQ(run_binary(told.powerless), told.says);
  auto after = snapshot();
  for (const auto& [path, kind, text] : parse(told.changes)) {
    if (kind == '-') {
      EXPECT_EQ(expected.erase(path), 1U) << path;
    } else {
      expected[path] = {kind + text, after.contains(path) ? after[path].inode : 0};
    }
  }
  for (const auto& [path, what] : expected) {
    EXPECT_EQ(after[path], what) << path << ": " << after[path].what << " not " << what.what;
    after.erase(path);
  }
  for (const auto& [path, what] : after) ADD_FAILURE() << path << " appeared: " << what.what;
}

int main(int count, char** arguments) {
  struct statfs var {};
  constexpr auto in_memory = 0x01021994;
  if (!files::exists("/var/private-world") || ::statfs("/var", &var) != 0 ||
      var.f_type != in_memory) {
    std::cerr << "These tests rewrite /var/db and /usr/share: run scripts/test.\n";
    return 1;
  }
  testing::InitGoogleTest(&count, arguments);
  return RUN_ALL_TESTS();
}
