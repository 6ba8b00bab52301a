#include <sys/stat.h>

#include <exception>
#include <iostream>
#include <string>
#include <vector>

#include "ctl/change.h"
#include "ctl/status.h"
#include "ctl/whole.h"

namespace {

constexpr const char* usage =
    "usage: kestrelctl status | publish VERSION DIRECTORY | back [VERSION] | prune";

using line = std::vector<std::string>;

int run(const line& words) {
  if (words == line{"status"}) return status() ? 0 : 1;
  if (words.size() == 3 && words[0] == "publish") return publish(words[1], words[2]) ? 0 : 1;
  if (words == line{"back"}) return go_back("") ? 0 : 1;
  if (words.size() == 2 && words[0] == "back" && words[1] > "") return go_back(words[1]) ? 0 : 1;
  if (words == line{"prune"}) return prune() ? 0 : 1;
  if (words == line{"--version"}) return std::cout << "kestrelctl " KESTREL_VERSION "\n" ? 0 : 1;
  if (words == line{"--help"}) return std::cout << usage << '\n' ? 0 : 1;
  return complain(usage) ? 0 : 2;
}

}  // namespace

int main(int count, char** arguments) {
  ::umask(S_IWGRP | S_IWOTH);  // a download is for everyone to read
  try {
    const int status = run({arguments + 1, arguments + count});
    return std::cout.flush() || complain("standard output cannot be written") ? status : 1;
  } catch (const std::exception& failure) {
    return complain(failure.what()) ? 0 : 1;
  } catch (int) {
    return 1;  // printed where it was thrown
  }
}
