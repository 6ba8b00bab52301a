#include "ctl/print.h"

#include <algorithm>
#include <cstddef>
#include <iostream>

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
  const std::size_t shown = std::min(all.size(), limit);
  for (std::size_t i = 0; i < shown; ++i) complain(all[i]);
  if (shown < all.size())
    complain(fault("%s more lines like these", {std::to_string(all.size() - shown)}));
}

outcome refuse(const refusal& why) {
  complain_all(why.reasons);
  return why.status;
}
