#include "ctl/fault.h"

#include <cstddef>
#include <utility>

fault::fault(std::string_view format, std::initializer_list<std::string> texts,
             std::string what_to_do)
    : what(filled(format, texts)), cure(std::move(what_to_do)) {}

fault closed_to_some(const std::string& path) {
  return fault("not everyone can read %s", {path}, "chmod a+rX it");
}

void append(faults& all, const faults& more) {
  all.insert(all.end(), more.begin(), more.end());
}

std::string filled(std::string_view format, std::span<const std::string> texts) {
  std::string line;
  for (const std::string& text : texts) {
    const std::size_t place = format.find("%s");
    line.append(format.substr(0, place)).append(text);
    format.remove_prefix(place + 2);
  }
  return line.append(format);
}
