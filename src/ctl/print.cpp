#include "ctl/print.h"

#include <algorithm>
#include <cstddef>
#include <iostream>
#include <set>

namespace {

std::string printable(std::string text) {
  std::ranges::replace_if(
      text, [](char byte) { return byte < ' ' || byte > '~'; }, '?');
  return text;
}

}  // namespace

void say(const std::string& text) {
  std::cout << printable(text) << '\n';
}

void complain(const fault& one) {
  const std::string cure = one.cure.empty() ? "" : ": " + one.cure;
  std::cerr << printable("kestrelctl: " + one.what + cure) + "\n";
}

void complain_all(const faults& all) {
  constexpr std::size_t limit = 20;
  std::set<std::string> told;
  for (const fault& one : all)
    if (told.insert(one.what).second && told.size() <= limit) complain(one);
  if (told.size() > limit)
    complain(fault("%s more lines like these", {std::to_string(told.size() - limit)}));
}

outcome refuse(const refusal& why) {
  complain_all(why.reasons);
  return why.status;
}
