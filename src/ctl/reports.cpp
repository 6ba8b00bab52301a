#include "ctl/reports.h"

#include <cerrno>
#include <cstring>
#include <new>
#include <utility>

#include "fs/report.h"

namespace {

faults& kept() {
  static faults lines;
  return lines;
}

}  // namespace

faults take_reports() {
  return std::exchange(kept(), {});
}

namespace fs {

void report(int error, std::string_view format, std::initializer_list<const char*> texts) noexcept {
  const int saved_errno = errno;
  try {
    std::string line;
    for (const char* const text : texts) {
      const std::size_t place = format.find("%s");
      line.append(format.substr(0, place)).append(text);
      format.remove_prefix(place + 2);
    }
    kept().push_back({line.append(format), std::strerror(error)});
  } catch (const std::bad_alloc&) {
    // The exception that follows the line says that something failed.
  }
  errno = saved_errno;
}

}  // namespace fs
